#include "linux/apps/ApplicationIdentifier.h"

#include <algorithm>
#include <cstddef>

namespace mirabel {
namespace {

constexpr std::size_t longestIdentifier = 255;

// By hand: what the locale takes for a letter must not decide.
bool isAllowed(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
         std::string_view("-_.+@").find(c) != std::string_view::npos;
}

}  // namespace

bool isApplicationIdentifier(std::string_view text) {
  return !text.empty() && text.size() <= longestIdentifier && !text.starts_with('.') &&
         std::ranges::all_of(text, isAllowed);
}

std::optional<std::string> identifierOfEntry(std::string_view relativePath) {
  if (!relativePath.ends_with(desktopEntrySuffix)) return std::nullopt;
  relativePath.remove_suffix(desktopEntrySuffix.size());
  std::string identifier(relativePath);
  std::ranges::replace(identifier, '/', '-');
  return identifier;
}

}  // namespace mirabel
