#include <array>
#include <cerrno>
#include <future>
#include <ostream>
#include <poll.h>

#include "cli/ChangeBatch.h"
#include "cli/Commands.h"
#include "cli/ContainerArgument.h"
#include "cli/EndSignals.h"
#include "cli/Printing.h"
#include "linux/kernel/WakeUp.h"

namespace mirabel {
namespace {

/// One run of the command.
class Watch {
 public:
  Watch(Program& program, const WatchOptions& options)
      : program_(program), options_(options), failure_("can't watch " + named(options.item)) {}
  Watch(const Watch&) = delete;
  Watch& operator=(const Watch&) = delete;

  ExitCode run();

 private:
  ExitCode open();
  Result<void> begin();
  ExitCode follow();
  Result<void> tell();
  [[nodiscard]] bool mustEnd(int milliseconds);
  enum class Awaited { changes, end };
  Awaited await();

  Program& program_;
  const WatchOptions& options_;
  std::string failure_;
  EndSignals signals_;  // before the documents and their threads
  WakeUp opened_;
  std::shared_ptr<WakeUp> changed_ = std::make_shared<WakeUp>();
  Documents* documents_ = nullptr;
  std::unique_ptr<DocumentContainer> container_;
  std::unique_ptr<ContainerWatch> watch_;
  std::string anchor_;
  bool hasTold_ = false;
  bool isWaitingForService_ = false;
};

ExitCode Watch::run() {
  if (opened_.descriptor() < 0 || changed_->descriptor() < 0) {
    return program_.report(Error::posix(EMFILE), failure_);
  }
  // Another process may hold the volume for long, and a first look at a large home takes its time.
  // Whoever interrupts that does not wait for it; what was under way survives like any crash.
  auto opening = std::async(std::launch::async, [this] {
    const ExitCode code = open();
    opened_.set();
    return code;
  });
  std::array<pollfd, 2> wait{pollfd{signals_.descriptor(), POLLIN, 0},
                             pollfd{opened_.descriptor(), POLLIN, 0}};
  while (::poll(wait.data(), wait.size(), -1) < 0 && errno == EINTR) {
  }
  if (wait[0].revents != 0 && wait[1].revents == 0) signals_.endProcess();
  const ExitCode code = opening.get();
  return code == ExitCode::done ? follow() : code;
}

ExitCode Watch::open() {
  documents_ = program_.documents();
  if (documents_ == nullptr) return program_.exitCode();
  const auto begun = begin();
  return begun ? ExitCode::done : program_.report(begun.error(), failure_);
}

Result<void> Watch::begin() {
  // What was named by its path is followed by its identity.
  const auto identifier = ContainerArgument(options_.item).identifier(*documents_);
  if (!identifier) return fail(identifier.error());
  auto container = documents_->container(*identifier);
  if (!container) return fail(container.error());
  auto watch = documents_->watch(*identifier, [changed = changed_] { changed->set(); });
  if (!watch) return fail(watch.error());
  container_ = *std::move(container);
  watch_ = *std::move(watch);
  // Taken when the watch has begun: that tells of everything since then.
  auto anchor = options_.since ? Result<std::string>(*options_.since)
                               : ChangeBatch::currentAnchor(*container_);
  if (!anchor) return fail(anchor.error());
  anchor_ = *std::move(anchor);
  return {};
}

ExitCode Watch::follow() {
  const bool isForPeople = !program_.options().json;
  for (bool isFirst = true; isFirst || await() == Awaited::changes; isFirst = false) {
    // Before it asks: what is signalled from then on may be too late for the answer.
    changed_->clear();
    const auto told = tell();
    if (!told && !told.error().isPosix(ENOTCONN)) return program_.report(told.error(), failure_);
    // The anchor holds: when the service is back, everything since is told.
    if (!told && !isWaitingForService_) program_.note("the service has left; waiting for it");
    isWaitingForService_ = !told;
    if (isFirst && isForPeople) program_.note("watching " + options_.item + "; Ctrl-C ends it");
  }
  if (isForPeople && program_.canWrite()) program_.note("the anchor is now " + anchor_);
  return ExitCode::done;
}

Result<void> Watch::tell() {
  for (bool more = true; more && !mustEnd(0);) {
    const auto batch = ChangeBatch::ask(*container_, anchor_);
    if (!batch) return fail(batch.error());
    more = batch->moreComing();
    anchor_ = batch->anchor();
    // The first one says from where on changes are told, even when there are none yet.
    if (hasTold_ && !more && batch->isEmpty()) break;
    batch->print(program_);
    program_.out().flush();
    hasTold_ = true;
  }
  return {};
}

/// Waits for changes, or for a reason to end.
Watch::Awaited Watch::await() {
  while (!mustEnd(-1)) {
    pollfd changed{changed_->descriptor(), POLLIN, 0};
    if (::poll(&changed, 1, 0) > 0) return Awaited::changes;
  }
  return Awaited::end;
}

/// Whether there is a reason to end; waits for one, or for changes.
bool Watch::mustEnd(int milliseconds) {
  if (!program_.canWrite()) return true;
  std::array<pollfd, 3> wait{pollfd{signals_.descriptor(), POLLIN, 0},
                             pollfd{program_.outputDescriptor(), 0, 0},
                             pollfd{changed_->descriptor(), POLLIN, 0}};
  if (::poll(wait.data(), wait.size(), milliseconds) <= 0) return false;
  if (wait[0].revents != 0) return true;
  if ((wait[1].revents & (POLLERR | POLLHUP)) == 0) return false;
  // Its reader has left: nothing can be written any more, and nothing is wrong.
  program_.out().setstate(std::ios::badbit);
  return true;
}

}  // namespace

ExitCode runWatch(Program& program, const WatchOptions& options) {
  return Watch(program, options).run();
}

}  // namespace mirabel
