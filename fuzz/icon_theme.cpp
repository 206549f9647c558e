// Any bytes: no index of a theme, or one whose directories lie below the theme, are of sizes within
// reason, and are the same when it is written and read again.

#include "Require.h"
#include "linux/icons/IconTheme.h"

using namespace mirabel;

namespace {

using Type = IconThemeDirectory::Type;

const char* nameOf(Type type) {
  if (type == Type::fixed) return "Fixed";
  return type == Type::scalable ? "Scalable" : "Threshold";
}

bool areEqual(const IconThemeDirectory& a, const IconThemeDirectory& b) {
  return a.path == b.path && a.type == b.type && a.size == b.size && a.scale == b.scale &&
         a.minSize == b.minSize && a.maxSize == b.maxSize && a.threshold == b.threshold;
}

void requireSound(const IconThemeDirectory& directory) {
  constexpr int largest = 4096;
  require(!directory.path.empty() && directory.path.front() != '/');
  require(("/" + directory.path + "/").find("/../") == std::string::npos);
  for (const int size : {directory.size, directory.minSize, directory.maxSize})
    require(size >= 1 && size <= largest);
  require(directory.scale >= 1 && directory.threshold >= 0 && directory.threshold <= largest);
  for (const int size : {1, 48, largest}) {
    const IconSize wanted{size, directory.scale};
    require(directory.distance(wanted) >= 0);
    // What is meant for a size does not miss it.
    require(!directory.matches(wanted) || directory.distance(wanted) == 0);
  }
}

std::string written(const IconThemeDirectory& directory) {
  std::string text = "[" + directory.path + "]\nType=" + nameOf(directory.type) + "\n";
  const auto add = [&](const char* key, int value) {
    text += key + std::string("=") + std::to_string(value) + "\n";
  };
  add("Size", directory.size);
  add("Scale", directory.scale);
  add("MinSize", directory.minSize);
  add("MaxSize", directory.maxSize);
  add("Threshold", directory.threshold);
  return "[Icon Theme]\nDirectories=" + directory.path + "\n" + text;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const auto theme = IconTheme::parse({reinterpret_cast<const char*>(data), size});
  if (!theme) return 0;
  require(theme->directories.size() <= 4'000 && theme->inherits.size() <= 16);
  for (const std::string& name : theme->inherits)
    require(!name.empty() && name.find(',') == std::string::npos);
  for (const IconThemeDirectory& directory : theme->directories) {
    requireSound(directory);
    // An escape stands for what can't be written plainly.
    if (directory.path.find_first_of("\\\n\t\r") != std::string::npos) continue;
    const auto again = IconTheme::parse(written(directory));
    require(again && again->directories.size() == 1);
    require(areEqual(again->directories.front(), directory));
  }
  return 0;
}
