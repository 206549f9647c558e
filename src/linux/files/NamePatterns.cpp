#include "linux/files/NamePatterns.h"

#include <algorithm>
#include <fstream>

#include "foundation/AsciiCase.h"

namespace mirabel {
namespace {

// All strings kept are in lower case, and names are lowered before they are compared: that takes
// a few names too many for special and never one too few.
constexpr std::string_view wildcards = "*?[\\";

std::string loweredText(std::string_view text) {
  std::string result(text);
  std::ranges::transform(result, result.begin(), asciiLower);
  return result;
}

bool hasWildcard(std::string_view text) {
  return text.find_first_of(wildcards) != std::string_view::npos;
}

bool beginsLowered(std::string_view name, std::string_view beginning) {
  return name.size() >= beginning.size() &&
         std::ranges::equal(name.substr(0, beginning.size()), beginning, {}, asciiLower);
}

bool endsLowered(std::string_view name, std::string_view ending) {
  return name.size() >= ending.size() &&
         beginsLowered(name.substr(name.size() - ending.size()), ending);
}

bool isLetter(char c) {
  return c >= 'a' && c <= 'z';
}

bool isDigit(char c) {
  return c >= '0' && c <= '9';
}

bool containsLowered(std::string_view name, std::string_view part) {
  if (part.empty() || isLetter(part[0])) {
    return !std::ranges::search(name, part, {}, asciiLower).empty();
  }
  // What starts with a dot, as most do, is found by its dots.
  for (std::size_t at = name.find(part[0]); at != name.npos; at = name.find(part[0], at + 1)) {
    if (beginsLowered(name.substr(at), part)) return true;
  }
  return false;
}

// Calls `visit` with the byte in both cases.
template <class Visit>
void forBothCases(char lowerCase, const Visit& visit) {
  visit(static_cast<unsigned char>(lowerCase));
  if (isLetter(lowerCase)) visit(static_cast<unsigned char>(lowerCase - 'a' + 'A'));
}

constexpr std::size_t longestCounted = 63;

std::uint64_t lengthBit(std::size_t length) {
  return std::uint64_t{1} << std::min(length, longestCounted);
}

// Of what comes before a bracket: where one ends is another program's art.
std::string_view longestLiteral(std::string_view pattern) {
  pattern = pattern.substr(0, pattern.find('['));
  std::string_view longest;
  while (!pattern.empty()) {
    const std::string_view run = pattern.substr(0, pattern.find_first_of(wildcards));
    if (run.size() > longest.size()) longest = run;
    pattern.remove_prefix(std::min(pattern.size(), run.size() + 1));
  }
  return longest;
}

// Whether brackets in it may stand for a dot: those that say what they are not, and ranges of
// anything but digits or letters.
bool mayHoldFurtherDots(std::string_view ending) {
  if (ending.find("[!") != ending.npos || ending.find("[^") != ending.npos) return true;
  for (std::size_t i = 1; i + 1 < ending.size(); ++i) {
    const char from = ending[i - 1], to = ending[i + 1];
    const bool isPlain = (isDigit(from) && isDigit(to)) || (isLetter(from) && isLetter(to));
    if (ending[i] == '-' && !isPlain) return true;
  }
  return false;
}

}  // namespace

void NamePatterns::read(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  for (std::string line; std::getline(file, line);) {
    if (line.empty() || line[0] == '#') continue;
    const std::size_t type = line.find(':');
    const std::size_t pattern = type == line.npos ? type : line.find(':', type + 1);
    if (pattern == line.npos) continue;
    const std::size_t flags = line.find(':', pattern + 1);
    add(std::string_view(line).substr(pattern + 1, flags - pattern - 1));
  }
}

void NamePatterns::add(std::string_view given) {
  if (given.empty()) return;
  const std::string pattern = loweredText(given);
  if (!hasWildcard(pattern)) return addWholeName(pattern);
  if (pattern[0] != '*' || hasWildcard(std::string_view(pattern).substr(1))) {
    return addWithWildcards(pattern);
  }
  const std::size_t dot = pattern.rfind('.');
  if (dot == 1) return;  // "*.txt": the ending decides
  if (dot == pattern.npos) {
    forBothCases(pattern.back(), [this](unsigned char byte) { mayEnd_[byte] = true; });
    endsWithoutDot_.push_back(pattern.substr(1));
  } else {
    ambiguousEndings_.insert(pattern.substr(dot));
  }
}

void NamePatterns::addWithWildcards(std::string_view pattern) {
  const std::size_t dot = pattern.rfind('.');
  const std::string_view ending = dot == pattern.npos ? std::string_view() : pattern.substr(dot);
  const bool anythingBefore = dot == 1 && pattern[0] == '*';
  // "*.[1-9]": the ending decides, as long as nothing in it can stand for a dot.
  if (anythingBefore && ending.find_first_of("*?\\") == ending.npos &&
      !mayHoldFurtherDots(ending)) {
    return;
  }
  // A dot before a "]" may be one of several bytes in brackets.
  if (!ending.empty() && !hasWildcard(ending) && ending.find(']') == ending.npos) {
    ambiguousEndings_.emplace(ending);
    return;
  }
  const std::string_view beginning = pattern.substr(0, pattern.find_first_of(wildcards));
  if (!beginning.empty()) return addBeginning(std::string(beginning));
  const std::string_view inside = longestLiteral(pattern);
  alwaysWhole_ = alwaysWhole_ || inside.empty();
  insides_.emplace_back(inside);
}

void NamePatterns::addWholeName(std::string name) {
  const std::uint64_t bit = lengthBit(name.size());
  forBothCases(name[0], [&](unsigned char byte) { lengthsByFirstByte_[byte] |= bit; });
  wholeNames_.insert(std::move(name));
}

void NamePatterns::addBeginning(std::string beginning) {
  forBothCases(beginning[0], [this](unsigned char byte) { mayBegin_[byte] = true; });
  beginnings_.push_back(std::move(beginning));
}

std::string_view NamePatterns::endingOf(std::string_view name) {
  const std::size_t dot = name.rfind('.');
  return dot == name.npos ? std::string_view() : name.substr(dot);
}

bool NamePatterns::needsWholeName(std::string_view name) const {
  if (alwaysWhole_ || name.empty()) return true;
  const auto first = static_cast<unsigned char>(name.front());
  const auto last = static_cast<unsigned char>(name.back());
  if ((lengthsByFirstByte_[first] & lengthBit(name.size())) != 0 &&
      wholeNames_.contains(loweredText(name))) {
    return true;
  }
  const auto begins = [name](const std::string& text) { return beginsLowered(name, text); };
  if (mayBegin_[first] && std::ranges::any_of(beginnings_, begins)) return true;
  const auto ends = [name](const std::string& text) { return endsLowered(name, text); };
  if (mayEnd_[last] && std::ranges::any_of(endsWithoutDot_, ends)) return true;
  const auto contains = [name](const std::string& text) { return containsLowered(name, text); };
  return std::ranges::any_of(insides_, contains);
}

bool NamePatterns::isAmbiguousEnding(std::string_view ending) const {
  return ambiguousEndings_.contains(loweredText(ending));
}

}  // namespace mirabel
