#include "linux/files/PackageTypes.h"

#include <algorithm>
#include <array>

#include "foundation/AsciiCase.h"

namespace mirabel {
namespace {

struct PackageSuffix {
  std::string_view suffix;  // lower case
  std::string_view type;
};

constexpr std::array<PackageSuffix, 6> packageSuffixes{{
    {"quill", "com.norvane.quillsuite.document"},
    {"quillsheet", "com.norvane.quillsuite.spreadsheet"},
    {"quilldeck", "com.norvane.quillsuite.presentation"},
    {"lumenbeat", "com.norvane.lumenbeat.project"},
    {"lumenband", "com.norvane.lumenbeat.band"},
    {"package", "com.norvane.package"},
}};

bool equalsLowered(std::string_view text, std::string_view lowerCase) {
  return std::ranges::equal(text, lowerCase, {}, asciiLower);
}

}  // namespace

std::string_view PackageTypes::typeOf(std::string_view name) {
  const std::size_t dot = name.rfind('.');
  if (dot == std::string_view::npos || dot == 0) return {};
  const std::string_view suffix = name.substr(dot + 1);
  const auto found = std::ranges::find_if(packageSuffixes, [&](const PackageSuffix& entry) {
    return equalsLowered(suffix, entry.suffix);
  });
  return found == packageSuffixes.end() ? std::string_view() : found->type;
}

}  // namespace mirabel
