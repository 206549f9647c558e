#include "linux/apps/ApplicationMonitor.h"

#include <algorithm>
#include <array>
#include <fcntl.h>
#include <poll.h>
#include <string_view>
#include <utility>

#include "linux/apps/EntryListing.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"
#include "platform/NotificationCenter.h"

namespace mirabel {
namespace {

using std::chrono::milliseconds;

// What comes in a burst, as from a package manager, is read and posted together.
constexpr milliseconds restBeforeReading{20};

/// FNV-1a.
class Sum {
 public:
  void add(std::string_view bytes) {
    for (const char c : bytes)
      value_ = (value_ ^ static_cast<unsigned char>(c)) * 0x100000001b3u;
  }
  void addFolder(const std::string& path) {
    const auto status = statusOfTarget(path);
    add(path);
    if (!status) return add("absent");
    add(std::to_string(status->device) + " " + std::to_string(status->inode) + " " +
        std::to_string(status->modificationTime) + " " + std::to_string(status->changeTime));
  }
  [[nodiscard]] std::uint64_t value() const { return value_; }

 private:
  std::uint64_t value_ = 0xcbf29ce484222325u;
};

// In an order of their own: that of the folder may change without a change.
std::vector<std::string> containersIn(const std::string& path, std::size_t most) {
  std::vector<std::string> containers;
  UniqueFd opened(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!opened) return containers;
  RawDirectory folder(std::move(opened));
  while (containers.size() < most) {
    const auto entry = folder.next();
    if (!entry || !*entry) break;
    if (!(*entry)->name.starts_with('.')) containers.push_back(path + "/" += (*entry)->name);
  }
  std::ranges::sort(containers);
  return containers;
}

}  // namespace

std::uint64_t timesOfFolders(const ApplicationPlaces& places,
                             const ApplicationWatches::Bounds& bounds) {
  Sum sum;
  for (const std::string& directory : places.directories) {
    sum.addFolder(directory);
    auto folders = foldersOfEntries(directory, bounds.foldersOfEntries);
    std::ranges::sort(folders);
    for (const std::string& folder : folders)
      sum.addFolder(folder);
  }
  sum.addFolder(places.containers);
  for (const std::string& container : containersIn(places.containers, bounds.containers))
    sum.addFolder(container);
  return sum.value();
}

ApplicationMonitor::ApplicationMonitor(Options options, LocalNotificationCenter& center)
    : options_(std::move(options)), center_(center), watches_(options_.places, options_.bounds) {
  watches_.arm();
  isComplete_ = watches_.isComplete();
  if (!isComplete_) static_cast<void>(lookAtTimes());
  thread_ = std::thread([this] { run(); });
}

ApplicationMonitor::~ApplicationMonitor() {
  stop_.set();
  thread_.join();
}

bool ApplicationMonitor::isStopped(milliseconds rest) const {
  pollfd wait{stop_.descriptor(), POLLIN, 0};
  ::poll(&wait, 1, stop_.limited(static_cast<int>(rest.count())));
  return stop_.isSet();
}

void ApplicationMonitor::run() {
  while (true) {
    std::array<pollfd, 2> wait{pollfd{stop_.descriptor(), POLLIN, 0},
                               pollfd{watches_.descriptor(), POLLIN, 0}};
    const int longest = isComplete_ ? -1 : static_cast<int>(options_.interval.count());
    const int ready = ::poll(wait.data(), wait.size(), stop_.limited(longest));
    if (stop_.isSet() || (ready > 0 && isStopped(restBeforeReading))) return;
    ApplicationWatches::Changes changes;
    if (ready > 0) changes = watches_.drain();
    const bool wasComplete = isComplete_.exchange(watches_.isComplete());
    if (!isComplete_) {
      const bool isDue = std::chrono::steady_clock::now() - lookedAt_ >= options_.interval;
      if ((wasComplete || isDue) && lookAtTimes()) changes = {true, true};
    }
    post(changes);
  }
}

bool ApplicationMonitor::lookAtTimes() {
  lookedAt_ = std::chrono::steady_clock::now();
  if (watches_.descriptor() < 0) watches_.arm();
  const std::uint64_t now = timesOfFolders(options_.places, options_.bounds);
  return std::exchange(times_, now) != now;
}

void ApplicationMonitor::post(const ApplicationWatches::Changes& changes) {
  if (changes.registered) center_.post(notification::applicationRegistered);
  if (changes.unregistered) center_.post(notification::applicationUnregistered);
}

}  // namespace mirabel
