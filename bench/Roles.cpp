#include "Roles.h"

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <iostream>
#include <memory>
#include <poll.h>
#include <sys/fanotify.h>
#include <thread>
#include <unistd.h>

#include "BenchTree.h"
#include "Following.h"
#include "host/LocalDocuments.h"
#include "host/bus/BusService.h"

namespace mirabel::bench {
namespace {

void serve(const std::function<std::string()>& work) {
  std::cout << "ready" << std::endl;
  for (std::string line; std::getline(std::cin, line);)
    std::cout << work() << std::endl;
}

void hold(const std::string& home) {
  const OpenIndex index(home, Marks::wanted);
  index.sync();
  require(index.isFollowing(), "changes are heard of");
  serve([&] { return std::to_string(index.sync()); });
}

/// Reads and counts, as soon as there is something.
class BareReader {
 public:
  explicit BareReader(const std::string& root)
      : group_(::fanotify_init(FAN_CLASS_NOTIF | FAN_CLOEXEC | FAN_NONBLOCK | FAN_REPORT_DFID_NAME |
                                   FAN_REPORT_FID | FAN_REPORT_TARGET_FID,
                               O_RDONLY)),
        buffer_(std::make_unique_for_overwrite<char[]>(bufferSize)) {
    require(group_ >= 0, "there is fanotify");
    mark(root);
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
      if (entry.is_directory()) mark(entry.path());
    }
    thread_ = std::thread([this] { run(); });
  }

  ~BareReader() {
    isStopped_ = true;
    thread_.join();
    ::close(group_);
  }
  BareReader(const BareReader&) = delete;
  BareReader& operator=(const BareReader&) = delete;

  std::size_t drain() {
    read();
    return records_;
  }

 private:
  static constexpr std::size_t bufferSize = 1u << 18;
  static constexpr int tick = 20;

  void mark(const std::string& folder) const {
    constexpr std::uint64_t everything = FAN_CREATE | FAN_DELETE | FAN_RENAME | FAN_MODIFY |
                                         FAN_ATTRIB | FAN_CLOSE_WRITE | FAN_DELETE_SELF |
                                         FAN_ONDIR | FAN_EVENT_ON_CHILD;
    require(::fanotify_mark(group_, FAN_MARK_ADD | FAN_MARK_ONLYDIR, everything, AT_FDCWD,
                            folder.c_str()) == 0,
            "a folder can be marked");
  }

  void run() {
    while (!isStopped_) {
      pollfd wait{group_, POLLIN, 0};
      if (::poll(&wait, 1, tick) > 0) read();
    }
  }

  void read() {
    const std::lock_guard lock(mutex_);
    while (true) {
      const ssize_t count = ::read(group_, buffer_.get(), bufferSize);
      if (count <= 0) return;
      auto left = static_cast<std::size_t>(count);
      const auto* record = reinterpret_cast<const fanotify_event_metadata*>(buffer_.get());
      for (; FAN_EVENT_OK(record, left); record = FAN_EVENT_NEXT(record, left)) {
        require((record->mask & FAN_Q_OVERFLOW) == 0, "a bare reader is quick enough");
        ++records_;
      }
    }
  }

  int group_;
  std::unique_ptr<char[]> buffer_;
  std::mutex mutex_;
  std::size_t records_ = 0;
  std::atomic<bool> isStopped_ = false;
  std::thread thread_;
};

void write(const BenchTree& tree) {
  serve([&] {
    return std::to_string(secondsOf([&] {
      for (std::size_t number = 0; number < tree.files(); ++number)
        tree.rewrite(number);
    }));
  });
}

void list(const std::string& home, std::size_t files) {
  const OpenProvider provider(home);
  serve([&] {
    std::size_t early = 0;
    std::size_t listed = 0;
    provider.list([&](std::size_t count) {
      listed = count;
      if (early == 0 && count >= files / 10) early = residentKiB();
    });
    require(listed >= files, "everything is listed");
    return std::to_string(early) + " " + std::to_string(residentKiB());
  });
}

void serveOnBus(const std::string& home) {
  LinuxPlatform::Options options;
  options.home = home;
  auto documents = LocalDocuments::open(std::move(options)).value();
  const auto service = bus::BusService::start(*documents, [] {}).value();
  documents->keepSearching();
  serve([] { return std::string(); });
  service->stop();
  documents.reset();
}

}  // namespace

int runRole(const std::vector<std::string>& arguments) {
  const std::string& role = arguments.front();
  const auto number = [&](std::size_t index) { return std::stoul(arguments.at(index)); };
  if (role == "hold") {
    hold(arguments.at(1));
  } else if (role == "drain") {
    BareReader reader(arguments.at(1));
    serve([&] { return std::to_string(reader.drain()); });
  } else if (role == "write") {
    write(BenchTree(arguments.at(1), number(2), number(3)));
  } else if (role == "serve") {
    serveOnBus(arguments.at(1));
  } else if (role == "list") {
    list(arguments.at(1), number(2));
  } else {
    return 2;
  }
  return 0;
}

}  // namespace mirabel::bench
