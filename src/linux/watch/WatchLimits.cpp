#include "linux/watch/WatchLimits.h"

#include <algorithm>
#include <fstream>
#include <vector>

namespace mirabel {
namespace {

struct Setting {
  const char* file;
  const char* name;
};

std::vector<Setting> settingsOf(WatcherKind kind) {
  // The system's limit, and that of the user's namespace: whichever is lower holds.
  switch (kind) {
    case WatcherKind::folderMarks:
      return {{"/proc/sys/fs/fanotify/max_user_marks", "fs.fanotify.max_user_marks"},
              {"/proc/sys/user/max_fanotify_marks", "user.max_fanotify_marks"}};
    case WatcherKind::inotify:
      return {{"/proc/sys/fs/inotify/max_user_watches", "fs.inotify.max_user_watches"},
              {"/proc/sys/user/max_inotify_watches", "user.max_inotify_watches"}};
    case WatcherKind::fileSystemMark:
      return {};
  }
  return {};
}

}  // namespace

WatchLimits WatchLimits::of(WatcherKind kind) {
  WatchLimits limits;
  for (const Setting& setting : settingsOf(kind)) {
    std::ifstream file(setting.file);
    std::uint64_t value = 0;
    if (!(file >> value)) continue;
    if (limits.allowed && *limits.allowed <= value) continue;
    limits.allowed = value;
    limits.setting = setting.name;
  }
  return limits;
}

}  // namespace mirabel
