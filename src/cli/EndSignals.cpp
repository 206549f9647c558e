#include "cli/EndSignals.h"

#include <pthread.h>
#include <sys/signalfd.h>
#include <unistd.h>

namespace mirabel {
namespace {

// A shell starts what runs in the background with SIGINT ignored. Blocked, it would come all the
// same.
sigset_t endingSignals() {
  sigset_t ending;
  ::sigemptyset(&ending);
  for (const int signal : {SIGINT, SIGTERM}) {
    struct sigaction action {};
    const bool isIgnored =
        ::sigaction(signal, nullptr, &action) == 0 && action.sa_handler == SIG_IGN;
    if (!isIgnored) ::sigaddset(&ending, signal);
  }
  return ending;
}

}  // namespace

EndSignals::EndSignals() {
  const sigset_t ending = endingSignals();
  signals_.reset(::signalfd(-1, &ending, SFD_CLOEXEC | SFD_NONBLOCK));
  if (signals_) ::pthread_sigmask(SIG_BLOCK, &ending, &before_);
}

EndSignals::~EndSignals() {
  if (!signals_) return;
  while (take() != 0) {
  }
  ::pthread_sigmask(SIG_SETMASK, &before_, nullptr);
}

void EndSignals::endProcess() {
  const int signal = take();
  ::pthread_sigmask(SIG_SETMASK, &before_, nullptr);
  static_cast<void>(std::raise(signal == 0 ? SIGTERM : signal));
}

int EndSignals::take() const {
  signalfd_siginfo came{};
  return ::read(signals_.get(), &came, sizeof(came)) == sizeof(came)
             ? static_cast<int>(came.ssi_signo)
             : 0;
}

}  // namespace mirabel
