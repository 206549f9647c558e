#include "support/TempHome.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/xattr.h>
#include <system_error>
#include <unistd.h>

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

void check(bool succeeded, const std::string& what) {
  if (!succeeded) throw std::system_error(errno, std::generic_category(), what);
}

std::string baseFolder() {
  for (const char* variable : {"MIRABEL_TEST_DIR", "TMPDIR"}) {
    const char* value = std::getenv(variable);
    if (value != nullptr && *value != '\0') return fs::canonical(value);
  }
  return fs::canonical(fs::temp_directory_path());
}

}  // namespace

TempHome::TempHome() : path_(baseFolder() + "/mirabel-home-XXXXXX") {
  check(::mkdtemp(path_.data()) != nullptr, path_);
  makeFolder("");
}

TempHome::~TempHome() {
  std::error_code ignored;
  // What a test has locked would keep its owner from removing it.
  const auto options = fs::directory_options::skip_permission_denied;
  for (fs::recursive_directory_iterator it(path_, options, ignored), end; !ignored && it != end;
       it.increment(ignored)) {
    if (it->symlink_status(ignored).type() != fs::file_type::directory) continue;
    fs::permissions(it->path(), fs::perms::owner_all, ignored);
  }
  fs::remove_all(path_, ignored);
}

std::string TempHome::at(std::string_view name) const {
  return name.empty() ? documents() : documents() + "/" + std::string(name);
}

void TempHome::makeFolder(std::string_view name) const {
  check(::mkdir(at(name).c_str(), 0755) == 0, at(name));
}

void TempHome::writeFile(std::string_view name, std::string_view contents) const {
  std::ofstream file(at(name), std::ios::binary | std::ios::trunc);
  file << contents;
  file.close();
  check(file.good(), at(name));
}

void TempHome::makeSymlink(std::string_view name, std::string_view target) const {
  check(::symlink(std::string(target).c_str(), at(name).c_str()) == 0, at(name));
}

void TempHome::makeFifo(std::string_view name) const {
  check(::mkfifo(at(name).c_str(), 0644) == 0, at(name));
}

void TempHome::makeSocket(std::string_view name) const {
  // From inside the folder: the address has room for short paths only.
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  const int socket = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  const fs::path before = fs::current_path();
  fs::current_path(documents());
  name.copy(address.sun_path, sizeof(address.sun_path) - 1);
  const bool bound =
      ::bind(socket, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0;
  fs::current_path(before);
  ::close(socket);
  check(bound, at(name));
}

void TempHome::link(std::string_view existing, std::string_view added) const {
  fs::create_hard_link(at(existing), at(added));
}

void TempHome::rename(std::string_view from, std::string_view to) const {
  fs::rename(at(from), at(to));
}

void TempHome::setMode(std::string_view name, mode_t mode) const {
  check(::chmod(at(name).c_str(), mode) == 0, at(name));
}

void TempHome::remove(std::string_view name) const {
  fs::remove_all(at(name));
}

void TempHome::giveTo(uid_t user) const {
  check(::lchown(path_.c_str(), user, user) == 0, path_);
  for (const fs::directory_entry& entry : fs::recursive_directory_iterator(path_)) {
    check(::lchown(entry.path().c_str(), user, user) == 0, entry.path());
  }
}

bool hasUserAttributes(const std::string& folder) {
  const char* name = "user.com.norvane.probe";
  return ::setxattr(folder.c_str(), name, "", 0, 0) == 0 &&
         ::removexattr(folder.c_str(), name) == 0;
}

}  // namespace mirabel::testing
