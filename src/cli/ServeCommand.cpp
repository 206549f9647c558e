#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <malloc.h>
#include <memory>
#include <optional>
#include <poll.h>
#include <string>
#include <sys/resource.h>
#include <systemd/sd-daemon.h>

#include "cli/Commands.h"
#include "cli/EndSignals.h"
#include "host/LocalDocuments.h"
#include "host/bus/BusService.h"
#include "linux/kernel/WakeUp.h"

namespace mirabel {
namespace {

/// How often the service manager wants to hear that all is well: twice as often as it waits.
std::optional<std::chrono::milliseconds> watchdogPeriod() {
  std::uint64_t microseconds = 0;
  if (::sd_watchdog_enabled(0, &microseconds) <= 0) return {};
  return std::chrono::milliseconds(microseconds / 2000);
}

/// One run of the service. It fails where the state has become unusable, or belongs to another
/// volume than the documents do by now: its manager starts it again.
class Serving {
 public:
  explicit Serving(Program& program) : program_(program) {}
  ExitCode run();

 private:
  ExitCode open();
  void wait();

  Program& program_;
  EndSignals signals_;  // before the threads of the documents
  WakeUp ended_;        // the bus has gone away, or the state can't be used any more
  std::string whyBroken_;
  std::atomic<bool> isBroken_ = false;  // after the reason is there
  // What the documents have under way reports to the service, so that they go first.
  std::unique_ptr<bus::BusService> service_;
  std::unique_ptr<LocalDocuments> documents_;
};

ExitCode Serving::run() {
  if (const ExitCode code = open(); code != ExitCode::done) return code;
  documents_->keepSearching();
  ::sd_notify(0, "READY=1");
  program_.note("serving the documents of " + documents_->places().home + " on the session bus");
  wait();
  ::sd_notify(0, "STOPPING=1");
  service_->stop();
  documents_.reset();
  service_.reset();
  if (!isBroken_) return ExitCode::done;
  return program_.reportFailed(whyBroken_);
}

/// Watches, listings and the files of calls take descriptors, more than most sessions allow at
/// first.
void allowManyDescriptors() {
  rlimit files{};
  if (::getrlimit(RLIMIT_NOFILE, &files) != 0) return;
  files.rlim_cur = files.rlim_max;
  static_cast<void>(::setrlimit(RLIMIT_NOFILE, &files));
}

/// Calls are answered on many threads. With the eight heaps for each core that the allocator would
/// give them, what a burst of calls has freed lies scattered among what is kept, and can't be given
/// back. Two, and answers take no longer. For when there are no threads yet.
void shareHeaps() {
  ::mallopt(M_ARENA_MAX, 2);
}

ExitCode Serving::open() {
  shareHeaps();
  allowManyDescriptors();
  LinuxPlatform::Options options;
  options.home = program_.options().home;
  options.timeout = program_.options().timeout;
  options.notice = [this](std::string_view text) { program_.note(text); };
  options.broken = [this](std::string_view why) {
    if (isBroken_) return;
    whyBroken_ = why;
    isBroken_ = true;
    ended_.set();
  };
  auto documents = LocalDocuments::open(std::move(options));
  if (!documents) return program_.report(documents.error(), "can't open the documents");
  documents_ = *std::move(documents);
  auto service = bus::BusService::start(*documents_, [this] { ended_.set(); });
  if (!service) return program_.report(service.error(), "can't serve the documents");
  service_ = *std::move(service);
  return ExitCode::done;
}

void Serving::wait() {
  const auto period = watchdogPeriod();
  while (true) {
    std::array<pollfd, 2> waiting{pollfd{signals_.descriptor(), POLLIN, 0},
                                  pollfd{ended_.descriptor(), POLLIN, 0}};
    const int timeout = period ? static_cast<int>(period->count()) : -1;
    const int ready = ::poll(waiting.data(), waiting.size(), ended_.limited(timeout));
    if (ready > 0 || ended_.isSet()) break;
    if (ready < 0 && errno != EINTR) break;
    // Where the index does not answer any more, this does not return, and the manager hears
    // nothing.
    static_cast<void>(documents_->provider().linuxPlatform().index().status());
    ::sd_notify(0, "WATCHDOG=1");
  }
}

}  // namespace

ExitCode runServe(Program& program) {
  return Serving(program).run();
}

}  // namespace mirabel
