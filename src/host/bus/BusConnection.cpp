#include "host/bus/BusConnection.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <future>
#include <map>
#include <optional>

#include "host/bus/BusNames.h"

namespace mirabel::bus {
namespace {

// Imports and listings take as long as they take. A service that has died is told by the bus.
constexpr std::uint64_t withoutTimeout = UINT64_MAX;
constexpr std::chrono::milliseconds betweenLooks{500};

/// Fails where nobody has the service's name.
std::string ownerOfName(sdbus::IConnection& connection) {
  std::string owner;
  const auto daemon = sdbus::createProxy(connection, daemonName, daemonPath);
  daemon->callMethod("GetNameOwner")
      .onInterface(daemonName)
      .withArguments(std::string(serviceName))
      .storeResultsTo(owner);
  return owner;
}

}  // namespace

class BusConnection::Pending {
 public:
  /// Nothing where it was refused.
  std::optional<std::uint64_t> add(Handler handle) {
    std::unique_lock lock(mutex_);
    if (!refusal_) {
      handlers_.emplace(++last_, std::move(handle));
      return last_;
    }
    lock.unlock();
    handle(nullptr, *refusal_);
    return {};
  }
  void answer(std::uint64_t number, sdbus::Message* reply, const Error& error) {
    std::unique_lock lock(mutex_);
    auto node = handlers_.extract(number);
    lock.unlock();
    if (node) node.mapped()(reply, error);
  }
  /// Those to come as well.
  void refuseAll(const Error& error) {
    std::unique_lock lock(mutex_);
    if (!refusal_) refusal_ = error;
    const auto refused = std::exchange(handlers_, {});
    lock.unlock();
    for (const auto& [number, handle] : refused)
      handle(nullptr, error);
  }

 private:
  std::mutex mutex_;
  std::uint64_t last_ = 0;
  std::map<std::uint64_t, Handler> handlers_;
  std::optional<Error> refusal_;  ///< stays as it is once it is there
};

BusConnection::BusConnection() : pending_(std::make_shared<Pending>()) {}

BusConnection::~BusConnection() {
  end();
}

void BusConnection::end() {
  if (loop_) loop_->end();
  isLost_ = true;
  pending_->refuseAll(Error::posix(ENOTCONN, "the answer is not waited for any more"));
}

std::shared_ptr<BusConnection> BusConnection::open() {
  // Where neither is set there is no session, and looking for its bus would take its time.
  if (std::getenv("DBUS_SESSION_BUS_ADDRESS") == nullptr &&
      std::getenv("XDG_RUNTIME_DIR") == nullptr)
    return nullptr;
  try {
    std::shared_ptr<BusConnection> opened(new BusConnection);
    opened->connection_ = sdbus::createSessionBusConnection();
    opened->setOwner(ownerOfName(*opened->connection_));
    opened->service_ = sdbus::createProxy(*opened->connection_, serviceName, objectPath);
    opened->loop_ = std::make_unique<BusLoop>(*opened->connection_, [connection = opened.get()] {
      connection->isLost_ = true;
      connection->pending_->refuseAll(Error::posix(ENOTCONN, "the bus has gone"));
    });
    return opened;
  } catch (const sdbus::Error&) {
    return nullptr;
  }
}

bool BusConnection::hasBus() {
  try {
    return sdbus::createSessionBusConnection() != nullptr;
  } catch (const sdbus::Error&) {
    return false;
  }
}

void BusConnection::setOwner(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  if (uniqueName == ownerName_) return;
  ownerName_ = uniqueName;
  owner_ = nullptr;
  if (uniqueName.empty()) return;
  owners_.push_back(sdbus::createProxy(*connection_, uniqueName, objectPath));
  owner_ = owners_.back().get();
}

sdbus::IProxy& BusConnection::owner() {
  const std::lock_guard lock(mutex_);
  if (owner_ != nullptr) return *owner_;
  throw sdbus::Error("org.freedesktop.DBus.Error.ServiceUnknown", "the service has left");
}

std::string BusConnection::ownerName() {
  const std::lock_guard lock(mutex_);
  return ownerName_;
}

bool BusConnection::findOwnerOtherThan(const std::string& former) {
  try {
    const std::string now = ownerOfName(*connection_);
    setOwner(now);
    return now != former;
  } catch (const sdbus::Error&) {
    return false;
  }
}

Error BusConnection::deadlock() {
  return Error::posix(EDEADLK,
                      "asked where the service's answers arrive; ask on a thread of your own");
}

sdbus::MethodReply BusConnection::send(const char* interface, const char* method,
                                       const Write& write, Patience patience) {
  const std::string former = ownerName();
  try {
    return sendToOwner(interface, method, write, patience);
  } catch (const sdbus::Error& error) {
    // It never arrived. That another service is there may not have been heard of yet.
    const bool isNobody = error.getName() == "org.freedesktop.DBus.Error.ServiceUnknown" ||
                          error.getName() == "org.freedesktop.DBus.Error.NameHasNoOwner";
    if (!isNobody || !findOwnerOtherThan(former)) throw;
  }
  return sendToOwner(interface, method, write, patience);
}

sdbus::MethodReply BusConnection::sendToOwner(const char* interface, const char* method,
                                              const Write& write, Patience patience) {
  sdbus::IProxy& service = owner();
  auto message = service.createMethodCall(interface, method);
  if (write) write(message);
  struct Answer {
    std::promise<void> isThere;
    sdbus::MethodReply reply;
    std::optional<BusError> error;
  };
  const auto answer = std::make_shared<Answer>();
  auto isThere = answer->isThere.get_future();
  service.callMethod(
      message,
      [answer](sdbus::MethodReply& reply, const sdbus::Error* error) {
        if (error != nullptr) {
          answer->error = BusError::read(reply, *error);
        } else {
          answer->reply = reply;
        }
        answer->isThere.set_value();
      },
      withoutTimeout);
  const auto start = std::chrono::steady_clock::now();
  // Where the bus itself goes away, nobody answers any more.
  while (isThere.wait_for(patience ? std::min(betweenLooks, *patience) : betweenLooks) !=
         std::future_status::ready) {
    if (isLost_) throw sdbus::Error("org.freedesktop.DBus.Error.Disconnected", "the bus has gone");
    if (patience && std::chrono::steady_clock::now() - start >= *patience)
      throw sdbus::Error("org.freedesktop.DBus.Error.Timeout", "there is no answer");
  }
  if (answer->error) throw *answer->error;
  return std::move(answer->reply);
}

void BusConnection::callAsync(const char* interface, const char* method, const Write& write,
                              Handler handle) {
  const auto number = pending_->add(std::move(handle));
  if (!number) return;
  try {
    sdbus::IProxy& service = owner();
    auto message = service.createMethodCall(interface, method);
    if (write) write(message);
    service.callMethod(
        message,
        [pending = pending_, number = *number](sdbus::MethodReply& reply,
                                               const sdbus::Error* error) {
          if (error == nullptr) return pending->answer(number, &reply, {});
          pending->answer(number, nullptr, errorFromBus(BusError::read(reply, *error)));
        },
        withoutTimeout);
  } catch (const sdbus::Error& error) {
    pending_->answer(*number, nullptr, errorFromBus(error));
  }
}

void BusConnection::callInTurn(const char* interface, const char* method, const Write& write,
                               Handler handle) {
  // There, the answer that is handled has just given its turn back.
  const bool mayWait = !loop_->isOnItsThread();
  if (mayWait) underway_.acquire();
  const bool hasTurn = mayWait || underway_.try_acquire();
  callAsync(interface, method, write,
            [this, hasTurn, handle = std::move(handle)](sdbus::Message* reply, const Error& error) {
              if (hasTurn) underway_.release();
              handle(reply, error);
            });
}

void BusConnection::listen(std::function<void(const std::string& container)> signalled,
                           std::function<void(bool isThere)> moved) {
  service_->registerSignalHandler(providerInterface, "EnumeratorSignaled",
                                  [signalled = std::move(signalled)](sdbus::Signal& signal) {
                                    std::string container;
                                    signal >> container;
                                    signalled(container);
                                  });
  service_->finishRegistration();
  moving_ = connection_->addMatch(std::string(ownerChanges) + ",arg0='" + serviceName + "'",
                                  [this, moved = std::move(moved)](sdbus::Message& message) {
                                    std::string name;
                                    std::string before;
                                    std::string now;
                                    message >> name >> before >> now;
                                    setOwner(now);
                                    moved(!now.empty());
                                  });
}

}  // namespace mirabel::bus
