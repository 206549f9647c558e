#include "host/bus/Confined.h"

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <iostream>
#include <sched.h>
#include <sys/wait.h>
#include <unistd.h>

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

constexpr int passed = 0;
constexpr int failedInside = 1;
constexpr int impossible = 2;

int inChild(const std::function<int()>& body) {
  std::cout.flush();
  const pid_t child = ::fork();
  if (child == 0) {
    const int code = body();
    std::cout.flush();
    ::_exit(code);
  }
  int status = 0;
  while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : failedInside;
}

int outcome() {
  return ::testing::Test::HasFailure() ? failedInside : passed;
}

}  // namespace

bool inSandbox(const std::string& flatpakInfo, const std::function<void(BusClient&)>& body) {
  std::string root = "/tmp/mirabel-root-XXXXXX";
  if (::mkdtemp(root.data()) == nullptr) return false;
  if (!flatpakInfo.empty()) std::ofstream(root + "/.flatpak-info") << flatpakInfo;
  const int code = inChild([&] {
    BusClient client;
    if (::geteuid() != 0 && ::unshare(CLONE_NEWUSER) != 0) return impossible;
    if (::chroot(root.c_str()) != 0 || ::chdir("/") != 0) return impossible;
    body(client);
    return outcome();
  });
  std::error_code ignored;
  fs::remove_all(root, ignored);
  EXPECT_NE(code, failedInside) << "in the sandbox";
  return code != impossible;
}

void asUser(uid_t user, const std::function<void(BusClient&)>& body) {
  const int code = inChild([&] {
    if (::setresgid(user, user, user) != 0 || ::setresuid(user, user, user) != 0) return impossible;
    BusClient client;
    body(client);
    return outcome();
  });
  EXPECT_EQ(code, passed) << "as another user";
}

}  // namespace mirabel::testing
