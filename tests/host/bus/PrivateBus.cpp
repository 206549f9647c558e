#include "host/bus/PrivateBus.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <sys/stat.h>
#include <system_error>

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

constexpr const char* addressVariable = "DBUS_SESSION_BUS_ADDRESS";

// As a session's own, but without services that can be started, and open to other users.
std::string configuration(const std::string& folder) {
  return "<busconfig><type>session</type><listen>unix:path=" + folder +
         "/bus</listen><policy context='default'><allow user='*'/>"
         "<allow send_destination='*' eavesdrop='true'/><allow eavesdrop='true'/>"
         "<allow own='*'/></policy>"
         // Those of a session's bus.
         "<limit name='max_incoming_bytes'>1000000000</limit>"
         "<limit name='max_outgoing_bytes'>1000000000</limit>"
         "<limit name='max_completed_connections'>100000</limit>"
         "<limit name='max_incomplete_connections'>10000</limit>"
         "<limit name='max_connections_per_user'>100000</limit>"
         "<limit name='max_match_rules_per_connection'>50000</limit>"
         "<limit name='max_replies_per_connection'>50000</limit></busconfig>\n";
}

}  // namespace

bool PrivateBus::isPossible() {
  return std::system("command -v dbus-daemon >/dev/null") == 0;
}

PrivateBus::PrivateBus() : folder_("/tmp/mirabel-bus-XXXXXX") {
  // Not below the folder of the tests: the address of a socket has room for short paths only.
  if (::mkdtemp(folder_.data()) == nullptr || ::chmod(folder_.c_str(), 0755) != 0)
    throw std::system_error(errno, std::generic_category(), folder_);
  const std::string file = folder_ + "/bus.conf";
  std::ofstream(file) << configuration(folder_);
  // What it complains of is read by nobody, and it would wait for a reader.
  daemon_ = std::make_unique<Running>(
      std::vector<std::string>{"sh", "-c",
                               "exec dbus-daemon --config-file=" + file +
                                   " --nofork --nopidfile --print-address "
                                   "2>/dev/null"});
  std::string address = daemon_->output().line();
  if (address.empty()) throw std::runtime_error("no bus");
  address.pop_back();
  if (const char* before = std::getenv(addressVariable)) addressBefore_ = before;
  ::setenv(addressVariable, address.c_str(), 1);
}

PrivateBus::~PrivateBus() {
  if (addressBefore_) {
    ::setenv(addressVariable, addressBefore_->c_str(), 1);
  } else {
    ::unsetenv(addressVariable);
  }
  daemon_.reset();
  std::error_code ignored;
  fs::remove_all(folder_, ignored);
}

}  // namespace mirabel::testing
