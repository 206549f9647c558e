#include "soak/ServedHome.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <stdexcept>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>
#include <utility>
#include <vector>

namespace mirabel::testing {
namespace {

constexpr int patienceInMilliseconds = 60'000;
constexpr const char* busVariable = "DBUS_SESSION_BUS_ADDRESS";

[[noreturn]] void fail(const std::string& what) {
  throw std::runtime_error(what);
}

pid_t spawn(std::vector<std::string> words, int output, const std::vector<std::string>& added) {
  std::vector<char*> arguments;
  for (std::string& word : words)
    arguments.push_back(word.data());
  arguments.push_back(nullptr);
  std::vector<std::string> variables(added);
  for (char** variable = environ; *variable != nullptr; ++variable)
    variables.emplace_back(*variable);
  std::vector<char*> environment;
  for (std::string& variable : variables)
    environment.push_back(variable.data());
  environment.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  ::posix_spawn_file_actions_init(&actions);
  if (output >= 0) ::posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
  pid_t process = -1;
  const int error = ::posix_spawnp(&process, arguments.front(), &actions, nullptr, arguments.data(),
                                   environment.data());
  ::posix_spawn_file_actions_destroy(&actions);
  if (error != 0) throw std::system_error(error, std::generic_category(), words.front());
  return process;
}

int waitFor(pid_t process) {
  int status = 0;
  while (::waitpid(process, &status, 0) < 0 && errno == EINTR) {
  }
  return status;
}

bool isReadable(int descriptor) {
  pollfd wait{descriptor, POLLIN, 0};
  return ::poll(&wait, 1, patienceInMilliseconds) == 1;
}

/// A socket as service managers have one, which hears when a program is ready.
class Readiness {
 public:
  Readiness() : socket_(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    // An abstract name that the kernel chooses.
    socklen_t size = sizeof(sa_family_t);
    if (::bind(socket_, reinterpret_cast<sockaddr*>(&address), size) != 0) fail("no socket");
    size = sizeof(address);
    ::getsockname(socket_, reinterpret_cast<sockaddr*>(&address), &size);
    name_ = "@" + std::string(address.sun_path + 1, size - sizeof(sa_family_t) - 1);
  }
  ~Readiness() { ::close(socket_); }
  Readiness(const Readiness&) = delete;
  Readiness& operator=(const Readiness&) = delete;

  [[nodiscard]] const std::string& name() const { return name_; }
  void wait() const {
    std::string told;
    while (told.find("READY=1") == std::string::npos) {
      std::array<char, 4096> message{};
      if (!isReadable(socket_)) fail("the service does not start");
      const ssize_t size = ::recv(socket_, message.data(), message.size(), 0);
      told.assign(message.data(), size > 0 ? static_cast<std::size_t>(size) : 0);
    }
  }

 private:
  int socket_;
  std::string name_;
};

}  // namespace

PrivateBus::PrivateBus() {
  std::array<int, 2> ends{};
  if (::pipe2(ends.data(), O_CLOEXEC) != 0) fail("no pipe");
  daemon_ = spawn({"dbus-daemon", "--session", "--nofork", "--nopidfile", "--print-address=1"},
                  ends[1], {});
  ::close(ends[1]);
  for (char character = 0; isReadable(ends[0]) && ::read(ends[0], &character, 1) == 1;) {
    if (character == '\n') break;
    address_ += character;
  }
  ::close(ends[0]);
  if (address_.empty()) fail("no bus");
  const char* former = std::getenv(busVariable);
  formerAddress_ = former == nullptr ? "" : former;
  ::setenv(busVariable, address_.c_str(), 1);
}

PrivateBus::~PrivateBus() {
  if (formerAddress_.empty()) {
    ::unsetenv(busVariable);
  } else {
    ::setenv(busVariable, formerAddress_.c_str(), 1);
  }
  ::kill(daemon_, SIGTERM);
  waitFor(daemon_);
}

ServedHome::ServedHome(std::string home) : home_(std::move(home)) {
  start();
}

ServedHome::~ServedHome() {
  if (process_ > 0) stop();
}

void ServedHome::start() {
  const Readiness readiness;
  process_ =
      spawn({MIRABEL_PROGRAM, "--home", home_, "serve"}, -1, {"NOTIFY_SOCKET=" + readiness.name()});
  readiness.wait();
}

void ServedHome::kill() {
  ::kill(process_, SIGKILL);
  wait();
}

int ServedHome::stop() {
  ::kill(process_, SIGTERM);
  return wait();
}

int ServedHome::wait() {
  return waitFor(std::exchange(process_, -1));
}

}  // namespace mirabel::testing
