#include "linux/icons/DesktopEntryIcon.h"

#include <cerrno>
#include <string_view>

#include "linux/icons/BoundedFile.h"
#include "linux/icons/KeyFile.h"

namespace mirabel {
namespace {

constexpr std::size_t largestEntry = 256u << 10;
constexpr const char* entryGroup = "Desktop Entry";

bool isFileName(std::string_view text) {
  constexpr std::string_view separators("/\0", 2);
  return !text.empty() && text.find_first_of(separators) == std::string_view::npos;
}

}  // namespace

Result<std::string> iconOfDesktopEntry(const std::vector<std::string>& folders,
                                       const std::string& identifier) {
  if (!isFileName(identifier)) return fail(Error::posix(EINVAL, "no name of a desktop entry"));
  const std::string name = identifier + ".desktop";
  for (const std::string& folder : folders) {
    const auto entry = KeyFile::read(joinedPath({folder, name}), largestEntry);
    if (!entry && entry.error().isPosix(ENOENT)) continue;
    if (!entry) return fail(entry.error());
    auto icon = entry->text(entryGroup, "Icon");
    if (!icon || icon->empty())
      return fail(Error::posix(ENOENT, "its desktop entry names no icon"));
    return *std::move(icon);
  }
  return fail(Error::posix(ENOENT, "there is no desktop entry"));
}

}  // namespace mirabel
