#include "cli/Running.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <stdexcept>
#include <sys/wait.h>
#include <unistd.h>

namespace mirabel::testing {
namespace {

constexpr int mostMilliseconds = 30'000;

struct Pipe {
  Pipe() {
    std::array<int, 2> ends{};
    if (::pipe2(ends.data(), O_CLOEXEC) != 0) throw std::runtime_error("pipe2");
    reading.reset(ends[0]);
    writing.reset(ends[1]);
  }
  UniqueFd reading;
  UniqueFd writing;
};

}  // namespace

std::string Lines::line() {
  while (pending_.find('\n') == std::string::npos) {
    if (!readMore()) return "";
  }
  const std::size_t length = pending_.find('\n') + 1;
  std::string first = pending_.substr(0, length);
  pending_.erase(0, length);
  return first;
}

std::string Lines::rest() {
  while (readMore()) {
  }
  return std::exchange(pending_, {});
}

bool Lines::readMore() {
  pollfd wait{end_.get(), POLLIN, 0};
  if (::poll(&wait, 1, mostMilliseconds) <= 0) return false;
  std::array<char, 4096> bytes{};
  const ssize_t count = ::read(end_.get(), bytes.data(), bytes.size());
  if (count <= 0) return false;
  pending_.append(bytes.data(), static_cast<std::size_t>(count));
  return true;
}

Running::Running(std::vector<std::string> command) {
  std::vector<char*> words;
  words.reserve(command.size() + 1);
  for (std::string& word : command)
    words.push_back(word.data());
  words.push_back(nullptr);
  Pipe out;
  Pipe err;
  posix_spawn_file_actions_t actions;
  ::posix_spawn_file_actions_init(&actions);
  ::posix_spawn_file_actions_adddup2(&actions, out.writing.get(), STDOUT_FILENO);
  ::posix_spawn_file_actions_adddup2(&actions, err.writing.get(), STDERR_FILENO);
  // Tests that run in the background of a shell would hand on an ignored SIGINT.
  sigset_t ending;
  ::sigemptyset(&ending);
  ::sigaddset(&ending, SIGINT);
  posix_spawnattr_t attributes;
  ::posix_spawnattr_init(&attributes);
  ::posix_spawnattr_setsigdefault(&attributes, &ending);
  ::posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF);
  const int failure =
      ::posix_spawnp(&process_, words.front(), &actions, &attributes, words.data(), environ);
  ::posix_spawnattr_destroy(&attributes);
  ::posix_spawn_file_actions_destroy(&actions);
  if (failure != 0) throw std::runtime_error("posix_spawn");
  output_ = Lines(std::move(out.reading));
  errors_ = Lines(std::move(err.reading));
}

Running::~Running() {
  if (process_ <= 0) return;
  send(SIGKILL);
  end();
}

void Running::send(int signal) const {
  // The number of one that has ended is nobody's, or another's; and -1 is everybody.
  if (process_ <= 0) throw std::logic_error("it has ended");
  ::kill(process_, signal);
}

int Running::end() {
  if (process_ <= 0) throw std::logic_error("it has ended");
  int status = 0;
  while (::waitpid(process_, &status, 0) < 0 && errno == EINTR) {
  }
  process_ = -1;
  return status;
}

}  // namespace mirabel::testing
