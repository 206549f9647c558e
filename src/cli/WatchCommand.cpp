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
#include "cli/WakeUp.h"
#include "fs/FSChangeToken.h"
#include "linux/files/LinuxVesselManager.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {
namespace {

// How often it is asked whether there are events that no signal has come for.
constexpr int millisecondsBetweenChecks = 5000;

bool isBehind(const VolumeIndex::Status& status, const std::string& anchor) {
  const auto bytes = fromBase64(anchor);
  if (!bytes) return true;
  const auto token = FSChangeToken::decode(dataFromString(*bytes));
  return !token || status.lastEventID > token->streamEventID;
}

/// One run of the command.
class Watch {
 public:
  Watch(Program& program, const WatchOptions& options)
      : program_(program),
        options_(options),
        failure_("can't watch " + options.item),
        container_(options.item) {}
  ~Watch();
  Watch(const Watch&) = delete;
  Watch& operator=(const Watch&) = delete;

  ExitCode run();

 private:
  ExitCode open();
  Result<void> begin();
  Result<void> listen();
  void followLibraries();
  ExitCode follow();
  Result<void> tell();
  enum class Awaited { changes, end };
  Awaited await();
  [[nodiscard]] bool mustEnd(int milliseconds);

  Program& program_;
  const WatchOptions& options_;
  std::string failure_;
  EndSignals signals_;  // before the session and its threads
  WakeUp opened_;
  std::shared_ptr<WakeUp> changed_ = std::make_shared<WakeUp>();
  Session* session_ = nullptr;
  ContainerArgument container_;
  std::optional<URL> place_;
  std::shared_ptr<VesselEnumerator> signaller_;
  std::uint64_t librariesVersion_ = 0;  ///< that the signaller listens to, or an earlier one
  std::shared_ptr<VesselEnumerator> enumerator_;
  std::string anchor_;
  bool hasTold_ = false;
};

Watch::~Watch() {
  if (session_ == nullptr) return;
  session_->linuxPlatform().manager().setSignalListener({});
  for (const auto& enumerator : {signaller_, enumerator_}) {
    if (enumerator) enumerator->invalidate();
  }
}

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
  session_ = program_.session();
  if (session_ == nullptr) return program_.exitCode();
  const auto begun = begin();
  return begun ? ExitCode::done : program_.report(begun.error(), failure_);
}

Result<void> Watch::begin() {
  // Whatever is named: notifiers name the root and the working set, whatever they are for, and a
  // new list of app libraries may be told under either name alone.
  session_->linuxPlatform().manager().setSignalListener(
      [changed = changed_](std::string_view, const VesselManager::SignalHandler& done) {
        changed->set();
        done(std::nullopt);
      });
  if (auto listening = listen(); !listening) return listening;
  session_->watchApplications();
  // Taken when the notifier exists: that tells of everything since then.
  auto anchor = options_.since ? Result<std::string>(*options_.since) : currentAnchor(*enumerator_);
  if (!anchor) return fail(anchor.error());
  anchor_ = *std::move(anchor);
  return {};
}

/// Has whatever happens in the container signalled from now on, also after it was moved.
Result<void> Watch::listen() {
  const auto found = container_.followed(*session_);
  if (!found) return fail(found.error());
  if (signaller_ && found->folder == place_) {
    followLibraries();
    return {};
  }
  place_ = found->folder;
  // What was named by its path is followed by its identity.
  if (place_) container_ = ContainerArgument(found->identifier);
  // The working set has no notifier of its own; that of all folders looks at the same places.
  const bool isWorkingSet = found->identifier == VesselWorkingSetContainerItemIdentifier;
  librariesVersion_ = session_->libraries().shared().versionToken();
  auto signaller = session_->enumerator(
      isWorkingSet ? VesselAllDirectoriesContainerItemIdentifier : found->identifier,
      LiveUpdates::wanted);
  if (!signaller) return fail(signaller.error());
  auto enumerator = session_->enumerator(found->identifier);
  if (!enumerator) return fail(enumerator.error());
  signaller_ = *std::move(signaller);
  enumerator_ = *std::move(enumerator);
  return {};
}

/// Has what happens in app libraries that came meanwhile signalled too. The signaller is never
/// asked for changes, which would have it take over the new list; but an anchor is always one of
/// the list of now.
void Watch::followLibraries() {
  const std::uint64_t version = session_->libraries().shared().versionToken();
  if (version == librariesVersion_) return;
  librariesVersion_ = version;
  signaller_->currentSyncAnchor([](const std::optional<Data>&) {});
}

ExitCode Watch::follow() {
  const bool isForPeople = !program_.options().json;
  for (bool isFirst = true; isFirst || await() == Awaited::changes; isFirst = false) {
    // Before it asks: what is signalled from then on may be too late for the answer.
    changed_->clear();
    if (auto told = tell(); !told) return program_.report(told.error(), failure_);
    if (isFirst && isForPeople) program_.note("watching " + options_.item + "; Ctrl-C ends it");
  }
  if (isForPeople && program_.canWrite()) program_.note("the anchor is now " + anchor_);
  return ExitCode::done;
}

Result<void> Watch::tell() {
  if (auto listening = listen(); !listening) return listening;
  for (bool more = true; more && !mustEnd(0);) {
    const auto batch = ChangeBatch::ask(*enumerator_, anchor_);
    if (!batch) return fail(batch.error());
    more = (*batch)->moreComing();
    anchor_ = (*batch)->anchor();
    // The first one says from where on changes are told, even when there are none yet.
    if (hasTold_ && !more && (*batch)->isEmpty()) break;
    (*batch)->print(program_);
    program_.out().flush();
    hasTold_ = true;
  }
  return {};
}

/// Waits for changes, or for a reason to end.
Watch::Awaited Watch::await() {
  while (!mustEnd(millisecondsBetweenChecks)) {
    pollfd changed{changed_->descriptor(), POLLIN, 0};
    if (::poll(&changed, 1, 0) > 0) return Awaited::changes;
    // A stream that could not go on reading the history signals nothing any more.
    if (isBehind(session_->linuxPlatform().index().status(), anchor_)) return Awaited::changes;
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
