#include "linux/operations/ItemNames.h"

#include <algorithm>
#include <cerrno>
#include <climits>

namespace mirabel {
namespace {

// What is longer is no extension but a name with a full stop in it.
constexpr std::size_t longestExtension = 32;

bool isContinuation(char byte) {
  return (static_cast<unsigned char>(byte) & 0xC0) == 0x80;
}

std::string_view cutTo(std::string_view text, std::size_t length) {
  if (text.size() <= length) return text;
  while (length > 0 && isContinuation(text[length]))
    --length;
  return text.substr(0, length);
}

}  // namespace

std::optional<Error> whyNoName(std::string_view name) {
  if (name.empty() || name == "." || name == "..") {
    return Error::posix(EINVAL, "\"" + std::string(name) + "\" is no name");
  }
  if (name.find('/') != std::string_view::npos) {
    return Error::posix(EINVAL, "a name can't hold \"/\"");
  }
  if (name.find('\0') != std::string_view::npos) {
    return Error::posix(EINVAL, "a name can't hold a NUL byte");
  }
  if (name.size() > NAME_MAX) return Error::posix(ENAMETOOLONG);
  return {};
}

NameParts partsOf(std::string_view name, NameOf kind) {
  if (kind == NameOf::plainFolder) return {name, {}};
  std::size_t dot = name.rfind('.');
  if (dot == std::string_view::npos || dot == 0 || name.size() - dot > longestExtension) {
    return {name, {}};
  }
  constexpr std::string_view archive = ".tar";
  if (dot > archive.size() && name.substr(0, dot).ends_with(archive)) dot -= archive.size();
  // Leading dots hide a file and begin no extension.
  if (name.substr(0, dot).find_first_not_of('.') == std::string_view::npos) return {name, {}};
  return {name.substr(0, dot), name.substr(dot)};
}

std::string numberedName(std::string_view name, std::uint64_t number, NameOf kind) {
  const NameParts parts = partsOf(name, kind);
  std::string end = " " + std::to_string(number);
  end += parts.extension;
  std::string result(cutTo(parts.stem, NAME_MAX - std::min<std::size_t>(end.size(), NAME_MAX)));
  return result += end;
}

}  // namespace mirabel
