#include "Watchman.h"

#include <chrono>
#include <cstring>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <sys/socket.h>
#include <sys/un.h>
#include <thread>
#include <unistd.h>

#include "BenchHome.h"

namespace mirabel::bench {
namespace {

constexpr int syncTimeout = 60'000;  // milliseconds
constexpr int mostTries = 500;
constexpr std::chrono::milliseconds betweenTries{10};
constexpr std::size_t bufferSize = 1u << 20;

int connectTo(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  require(path.size() < sizeof(address.sun_path), "the socket's path is short enough");
  std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
  for (int i = 0; i < mostTries; ++i) {
    const int socket = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    require(socket >= 0, "a socket can be made");
    const auto* generic = reinterpret_cast<const sockaddr*>(&address);
    if (::connect(socket, generic, sizeof(address)) == 0) return socket;
    ::close(socket);
    std::this_thread::sleep_for(betweenTries);
  }
  return -1;
}

}  // namespace

std::unique_ptr<Watchman> Watchman::start(const std::string& folder) {
  std::filesystem::create_directory(folder);
  // It refuses a folder that others may write to.
  std::filesystem::permissions(folder, std::filesystem::perms::owner_all);
  std::unique_ptr<Watchman> watchman(new Watchman(folder));
  if (!watchman->server_.hasStarted()) return nullptr;
  watchman->socket_ = connectTo(folder + "/sock");
  require(watchman->socket_ >= 0, "watchman can be spoken to");
  return watchman;
}

Watchman::Watchman(const std::string& folder)
    : server_({"watchman", "--foreground", "--sockname=" + folder + "/sock",
               "--statefile=" + folder + "/state", "--logfile=" + folder + "/log",
               "--pidfile=" + folder + "/pid", "--no-save-state"}),
      buffer_(std::make_unique_for_overwrite<char[]>(bufferSize)) {}

Watchman::~Watchman() {
  ::close(socket_);
}

void Watchman::watch(const std::string& root) {
  const auto watched = nlohmann::json::parse(ask({"watch-project", root}));
  require(watched.contains("watch"), "watchman watches the tree");
  root_ = root;
  const nlohmann::json query{{"expression", {"name", "no such name"}},
                             {"fields", {"name"}},
                             {"sync_timeout", syncTimeout}};
  const auto known = nlohmann::json::parse(ask({"query", root, query}));
  require(known.contains("clock"), "watchman knows the tree");
  clock_ = known["clock"];
}

std::string Watchman::changes() const {
  const nlohmann::json query{{"since", clock_},
                             {"fields", {"name", "exists", "size", "mode", "mtime_ms", "ino"}},
                             {"sync_timeout", syncTimeout}};
  return ask({"query", root_, query});
}

std::size_t Watchman::take(const std::string& answer) {
  const auto changed = nlohmann::json::parse(answer);
  require(changed.contains("files") && !changed.value("is_fresh_instance", true),
          "watchman knows what has changed");
  clock_ = changed["clock"];
  return changed["files"].size();
}

std::string Watchman::ask(const nlohmann::json& command) const {
  const std::string line = command.dump() + "\n";
  require(::send(socket_, line.data(), line.size(), MSG_NOSIGNAL) == std::ssize(line),
          "watchman can be asked");
  std::string answer;
  while (!answer.ends_with('\n')) {
    const ssize_t count = ::recv(socket_, buffer_.get(), bufferSize, 0);
    require(count > 0, "watchman answers");
    answer.append(buffer_.get(), static_cast<std::size_t>(count));
  }
  return answer;
}

}  // namespace mirabel::bench
