#include <array>
#include <csignal>
#include <cstdlib>
#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>

#include "host/LocalDocuments.h"
#include "host/bus/BusClient.h"
#include "host/bus/BusService.h"
#include "host/bus/ServiceFixture.h"
#include "mirabel/Session.h"
#include "mirabel/UniqueFd.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;

/// Where a service manager hears from its services.
class NotifySocket {
 public:
  NotifySocket() : socket_(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    // The kernel chooses a name that is no file.
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    socklen_t size = sizeof(sa_family_t);
    auto* const general = reinterpret_cast<sockaddr*>(&address);
    EXPECT_EQ(::bind(socket_.get(), general, size), 0);
    size = sizeof(address);
    EXPECT_EQ(::getsockname(socket_.get(), general, &size), 0);
    const std::size_t length = size - offsetof(sockaddr_un, sun_path) - 1;
    ::setenv("NOTIFY_SOCKET", ("@" + std::string(address.sun_path + 1, length)).c_str(), 1);
  }
  ~NotifySocket() { ::unsetenv("NOTIFY_SOCKET"); }
  NotifySocket(const NotifySocket&) = delete;
  NotifySocket& operator=(const NotifySocket&) = delete;

  std::string message() const {
    pollfd wait{socket_.get(), POLLIN, 0};
    if (::poll(&wait, 1, 30'000) <= 0) return "";
    std::array<char, 256> text{};
    const auto count = ::recv(socket_.get(), text.data(), text.size(), 0);
    return count < 0 ? "" : std::string(text.data(), static_cast<std::size_t>(count));
  }

 private:
  UniqueFd socket_;
};

class Serve : public ServiceFixture {
 protected:
  /// A failure that is told at once.
  static void expectRefusal(std::vector<std::string> options, const std::string& why) {
    options.insert(options.begin(), {MIRABEL_PROGRAM, "--timeout", "0", "serve"});
    Running refused(std::move(options));
    EXPECT_THAT(refused.errors().rest(), HasSubstr(why));
    const int status = refused.end();
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 7) << status;
  }
};

TEST_F(Serve, TellsItsManagerWhenItAnswersAndWhenItEnds) {
  for (const int signal : {SIGTERM, SIGINT}) {
    const NotifySocket manager;
    Running running({MIRABEL_PROGRAM, "--home", home.path(), "serve"});
    ASSERT_EQ(manager.message(), "READY=1");
    BusClient client;
    EXPECT_NE(client.idOf(home.documents()), "");
    running.send(signal);
    EXPECT_EQ(manager.message(), "STOPPING=1");
    EXPECT_EQ(running.end(), 0);
    EXPECT_EQ(client.provider("GetItem", std::string("did=1")).error,
              "org.freedesktop.DBus.Error.ServiceUnknown");
  }
}

// A file that may not grow is to SQLite what a failing disk is.
TEST_F(Serve, FailsWhereTheStateBreaksSoThatItIsStartedAgain) {
  std::signal(SIGXFSZ, SIG_IGN);  // the program inherits it
  serve();
  std::signal(SIGXFSZ, SIG_DFL);
  home.writeFile("early");
  EXPECT_NE(BusClient().idOf(home.at("early")), "");  // has identifiers reserved
  const rlimit none{};
  ASSERT_EQ(::prlimit(service->id(), RLIMIT_FSIZE, &none, nullptr), 0);
  home.writeFile("late");
  ASSERT_THAT(service->errors().rest(), HasSubstr("the next start checks what is there"));
  const int status = service->end();
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1) << status;
}

// At login, a program may be started while the service has the volume and no name yet.
TEST_F(Serve, IsFoundByWhoeverWaitsForTheVolume) {
  auto documents = LocalDocuments::open({.home = home.path()}).value();
  std::unique_ptr<bus::BusService> begun;
  int told = 0;
  SessionOptions options;
  options.home = home.path();
  options.notice = [&](std::string_view) {
    if (++told == 1) begun = bus::BusService::start(*documents, [] {}).value();
  };
  auto opened = openDocuments(std::move(options));
  ASSERT_TRUE(opened) << opened.error().description();
  EXPECT_TRUE((*opened)->itemAtPath(home.documents()));
  EXPECT_EQ(told, 1);
  opened->reset();
  begun->stop();
  documents.reset();
}

TEST_F(Serve, IsRefusedWhereItWouldNotBeReached) {
  const TempHome other;
  serve();
  expectRefusal({"--home", home.path()}, "try again when it is done");
  expectRefusal({"--home", other.path()}, "another service is on this bus");
  ::setenv("DBUS_SESSION_BUS_ADDRESS", "unix:path=/nowhere", 1);
  expectRefusal({"--home", other.path()}, "no session bus can be reached");
}

}  // namespace
}  // namespace mirabel::testing
