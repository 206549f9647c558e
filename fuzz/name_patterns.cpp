// Lines: the beginnings of two names, the ending of both, and patterns of a type database. Where
// the ending is said to decide, no pattern tells the two names apart.

#include <algorithm>
#include <cctype>
#include <fnmatch.h>
#include <string>
#include <vector>

#include "ByteSource.h"
#include "Require.h"
#include "linux/files/NamePatterns.h"

using namespace mirabel;

namespace {

std::string lowered(std::string text) {
  std::ranges::transform(text, text.begin(), [](char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
  });
  return text;
}

bool matches(const std::string& pattern, const std::string& name) {
  return ::fnmatch(pattern.c_str(), name.c_str(), 0) == 0 ||
         ::fnmatch(lowered(pattern).c_str(), lowered(name).c_str(), 0) == 0;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::size_t longest = 1024;
  if (size > longest) return 0;
  std::string_view rest(reinterpret_cast<const char*>(data), size);
  const std::string one(takeUpTo(rest, '\n'));
  const std::string other(takeUpTo(rest, '\n'));
  const std::string ending(takeUpTo(rest, '\n'));
  std::vector<std::string> patterns;
  NamePatterns known;
  while (!rest.empty()) {
    patterns.emplace_back(takeUpTo(rest, '\n'));
    known.add(patterns.back());
  }
  const std::string a = one + ending;
  const std::string b = other + ending;
  // Neither names nor patterns hold a NUL, and no name a slash.
  if (std::string_view(a + b).find_first_of(std::string_view("/\0", 2)) != std::string::npos)
    return 0;
  if (NamePatterns::endingOf(a) != NamePatterns::endingOf(b)) return 0;
  if (known.needsWholeName(a) || known.needsWholeName(b)) return 0;
  if (known.isAmbiguousEnding(NamePatterns::endingOf(a))) return 0;
  for (const std::string& pattern : patterns)
    require(pattern.find('\0') != std::string::npos || matches(pattern, a) == matches(pattern, b));
  return 0;
}
