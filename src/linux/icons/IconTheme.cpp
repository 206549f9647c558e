#include "linux/icons/IconTheme.h"

#include <algorithm>
#include <cstdlib>
#include <optional>
#include <string_view>
#include <utility>

#include "linux/icons/KeyFile.h"

namespace mirabel {
namespace {

constexpr std::size_t largestIndex = 1u << 20;
constexpr std::size_t mostDirectories = 2'000;
constexpr std::size_t mostInherited = 16;
constexpr int largestSize = 4096;
constexpr int largestScale = 16;
constexpr const char* themeGroup = "Icon Theme";

using Type = IconThemeDirectory::Type;

bool staysBelow(std::string_view path) {
  if (path.starts_with('/')) return false;
  while (!path.empty()) {
    const std::string_view component = path.substr(0, path.find('/'));
    if (component == "..") return false;
    path.remove_prefix(std::min(path.size(), component.size() + 1));
  }
  return true;
}

Type typeFrom(const std::optional<std::string>& text) {
  if (text == "Fixed") return Type::fixed;
  if (text == "Scalable") return Type::scalable;
  return Type::threshold;
}

std::optional<IconThemeDirectory> directoryIn(const KeyFile& index, std::string path) {
  IconThemeDirectory directory;
  directory.type = typeFrom(index.text(path, "Type"));
  directory.size = index.number(path, "Size").value_or(0);
  directory.scale = index.number(path, "Scale").value_or(1);
  directory.minSize = index.number(path, "MinSize").value_or(directory.size);
  directory.maxSize = index.number(path, "MaxSize").value_or(directory.size);
  directory.threshold = index.number(path, "Threshold").value_or(2);
  const auto isBeyond = [](int size) { return size < 1 || size > largestSize; };
  const bool isUsable = !isBeyond(directory.size) && !isBeyond(directory.minSize) &&
                        !isBeyond(directory.maxSize) && directory.scale >= 1 &&
                        directory.scale <= largestScale && directory.threshold >= 0 &&
                        directory.threshold <= largestSize && staysBelow(path);
  if (!isUsable) return {};
  directory.path = std::move(path);
  return directory;
}

void addDirectories(const KeyFile& index, const char* key, IconTheme& theme) {
  for (std::string& path : index.list(themeGroup, key, mostDirectories)) {
    auto directory = directoryIn(index, std::move(path));
    if (directory) theme.directories.push_back(*std::move(directory));
  }
}

IconTheme themeOf(const KeyFile& index) {
  IconTheme theme;
  addDirectories(index, "Directories", theme);
  addDirectories(index, "ScaledDirectories", theme);
  theme.inherits = index.list(themeGroup, "Inherits", mostInherited);
  return theme;
}

}  // namespace

bool IconThemeDirectory::matches(const IconSize& wanted) const {
  if (wanted.scale != scale) return false;
  switch (type) {
    case Type::fixed:
      return wanted.size == size;
    case Type::scalable:
      return minSize <= wanted.size && wanted.size <= maxSize;
    case Type::threshold:
      return std::abs(wanted.size - size) <= threshold;
  }
  return false;
}

std::int64_t IconThemeDirectory::distance(const IconSize& wanted) const {
  const std::int64_t pixels = std::int64_t{wanted.size} * wanted.scale;
  const auto beyond = [&](std::int64_t least, std::int64_t most) {
    if (pixels < least * scale) return least * scale - pixels;
    return std::max<std::int64_t>(pixels - most * scale, 0);
  };
  switch (type) {
    case Type::fixed:
      return beyond(size, size);
    case Type::scalable:
      return beyond(minSize, maxSize);
    case Type::threshold:
      return beyond(std::int64_t{size} - threshold, std::int64_t{size} + threshold);
  }
  return 0;
}

Result<IconTheme> IconTheme::read(const std::string& path) {
  const auto index = KeyFile::read(path, largestIndex);
  if (!index) return fail(index.error());
  return themeOf(*index);
}

Result<IconTheme> IconTheme::parse(std::string_view text) {
  const auto index = KeyFile::parse(text);
  if (!index) return fail(index.error());
  return themeOf(*index);
}

IconTheme IconTheme::hicolor() {
  IconTheme theme;
  for (const int size : {16, 22, 24, 32, 36, 48, 64, 72, 96, 128, 192, 256, 512}) {
    for (const int scale : {1, 2}) {
      const std::string side = std::to_string(size);
      const std::string_view suffix = scale == 1 ? "/apps" : "@2/apps";
      IconThemeDirectory directory;
      directory.path.append(side).append("x").append(side).append(suffix);
      directory.size = directory.minSize = directory.maxSize = size;
      directory.scale = scale;
      theme.directories.push_back(std::move(directory));
    }
  }
  IconThemeDirectory scalable;
  scalable.path = "scalable/apps";
  scalable.type = Type::scalable;
  scalable.size = 128;
  scalable.minSize = 1;
  scalable.maxSize = 512;
  theme.directories.push_back(std::move(scalable));
  return theme;
}

}  // namespace mirabel
