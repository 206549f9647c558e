#include "host/bus/CallerIdentity.h"

#include <array>
#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <map>
#include <sdbus-c++/sdbus-c++.h>
#include <sys/stat.h>
#include <unistd.h>

#include "host/bus/BusNames.h"
#include "mirabel/UniqueFd.h"

namespace mirabel::bus {
namespace {

constexpr std::size_t longestInfo = 64 * 1024;

std::string_view trimmed(std::string_view text) {
  const auto first = text.find_first_not_of(" \t\r");
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(" \t\r") - first + 1);
}

// What is longer than any of its kind says nothing.
Result<std::string> contentsOf(int file) {
  std::string text;
  std::array<char, 4096> piece{};
  while (true) {
    const ssize_t count = ::read(file, piece.data(), piece.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return fail(Error::posix(errno));
    if (count == 0) return text;
    text.append(piece.data(), static_cast<std::size_t>(count));
    if (text.size() > longestInfo) return fail(Error::posix(EFBIG));
  }
}

// A sandbox lays its description into its root, where what runs in it can't take it away. Where a
// process's root can't be looked at, nothing is known of it, and that it is not in a sandbox least
// of all.
Result<CallerIdentity> identityOfProcess(std::uint32_t process) {
  const UniqueFd root(::open(("/proc/" + std::to_string(process) + "/root").c_str(),
                             O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!root) {
    if (errno == ENOENT) return fail(Error::posix(ESRCH));
    return CallerIdentity{std::string()};
  }
  const UniqueFd info(
      ::openat(root.get(), ".flatpak-info", O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  if (!info) return CallerIdentity{errno == ENOENT ? std::nullopt : std::optional<std::string>("")};
  struct stat status {};
  if (::fstat(info.get(), &status) != 0 || !S_ISREG(status.st_mode))
    return CallerIdentity{std::string()};
  const auto text = contentsOf(info.get());
  return CallerIdentity{text ? applicationOfSandbox(*text) : std::string()};
}

bool isConfinedByLabel(const std::map<std::string, sdbus::Variant>& credentials) {
  const auto label = credentials.find("LinuxSecurityLabel");
  if (label == credentials.end() || !label->second.containsValueOfType<std::vector<std::uint8_t>>())
    return false;
  const auto bytes = label->second.get<std::vector<std::uint8_t>>();
  return std::string_view(reinterpret_cast<const char*>(bytes.data()), bytes.size())
      .starts_with("snap.");
}

std::optional<std::uint32_t> number(const std::map<std::string, sdbus::Variant>& credentials,
                                    const std::string& key) {
  const auto found = credentials.find(key);
  if (found == credentials.end() || !found->second.containsValueOfType<std::uint32_t>()) return {};
  return found->second.get<std::uint32_t>();
}

}  // namespace

std::string applicationOfSandbox(std::string_view flatpakInfo) {
  bool isInGroup = false;
  while (!flatpakInfo.empty()) {
    const auto end = flatpakInfo.find('\n');
    const std::string_view line = trimmed(flatpakInfo.substr(0, end));
    flatpakInfo.remove_prefix(end == std::string_view::npos ? flatpakInfo.size() : end + 1);
    if (line.starts_with('[')) {
      isInGroup = line == "[Application]";
      continue;
    }
    const auto equals = line.find('=');
    if (!isInGroup || equals == std::string_view::npos) continue;
    if (trimmed(line.substr(0, equals)) == "name")
      return std::string(trimmed(line.substr(equals + 1)));
  }
  return {};
}

CallerIdentities::CallerIdentities() : connection_(sdbus::createSessionBusConnection()) {
  daemon_ = sdbus::createProxy(*connection_, daemonName, daemonPath);
}

CallerIdentities::~CallerIdentities() = default;

Result<CallerIdentity> CallerIdentities::identify(const std::string& uniqueName) {
  const auto ask = [&] {
    const std::lock_guard lock(asking_);
    std::map<std::string, sdbus::Variant> credentials;
    daemon_->callMethod("GetConnectionCredentials")
        .onInterface(daemonName)
        .withArguments(uniqueName)
        .storeResultsTo(credentials);
    return credentials;
  };
  try {
    const auto credentials = ask();
    const auto user = number(credentials, "UnixUserID");
    const auto process = number(credentials, "ProcessID");
    if (!user || *user != ::geteuid()) {
      return fail(Error::posix(EACCES, "the documents are another user's"));
    }
    if (!process || isConfinedByLabel(credentials)) return CallerIdentity{std::string()};
    auto identity = identityOfProcess(*process);
    // Where the caller has left meanwhile, its number may be another process's.
    if (number(ask(), "ProcessID") != process) return fail(Error::posix(ESRCH));
    return identity;
  } catch (const sdbus::Error& error) {
    return fail(Error::posix(ESRCH, error.getMessage()));
  }
}

}  // namespace mirabel::bus
