#pragma once

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <sdbus-c++/sdbus-c++.h>
#include <semaphore>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "host/bus/BusErrors.h"
#include "host/bus/BusLoop.h"
#include "mirabel/Error.h"

namespace mirabel::bus {

/// The client's end of the connection with the service. Any thread may call it.
class BusConnection {
 public:
  /// Null where there is no session bus, or nobody has the service's name; none is started for
  /// this.
  [[nodiscard]] static std::shared_ptr<BusConnection> open();
  /// Whether there is a session bus that can be reached.
  [[nodiscard]] static bool hasBus();

  ~BusConnection();
  BusConnection(const BusConnection&) = delete;
  BusConnection& operator=(const BusConnection&) = delete;
  /// Has what waits for answers told that there will be none, POSIX ENOTCONN, and whoever asks from
  /// now on. Waits for what is being handled. Not on the connection's thread.
  void end();

  using Write = std::function<void(sdbus::Message& call)>;
  using Handler = std::function<void(sdbus::Message* reply, const Error& error)>;

  /// How long an answer is waited for.
  using Patience = std::optional<std::chrono::milliseconds>;
  static constexpr Patience unlimited = std::nullopt;

  /// Calls a method and waits for the answer, however long that takes unless its patience is
  /// limited. `read` makes the result of it. Errors: see `errorFromBus`; POSIX EDEADLK at once on
  /// the connection's own thread, where the answer would arrive.
  template <class Read>
  [[nodiscard]] auto call(const char* interface, const char* method, const Write& write,
                          Read&& read, Patience patience = unlimited)
      -> Result<std::remove_cvref_t<decltype(read(std::declval<sdbus::Message&>()))>> {
    if (loop_->isOnItsThread()) return fail(deadlock());
    try {
      auto reply = send(interface, method, write, patience);
      return read(reply);
    } catch (const sdbus::Error& error) {
      return fail(errorFromBus(error));
    }
  }
  /// Calls a method and has the answer handled, on the connection's thread: with the reply, or with
  /// null and the error.
  void callAsync(const char* interface, const char* method, const Write& write, Handler handle);

  /// The same, but waits while many that were called like this have no answer yet: a bus lets a
  /// client have so many, and no more. On the connection's thread it does not wait, and makes one
  /// more.
  void callInTurn(const char* interface, const char* method, const Write& write, Handler handle);

  /// `signalled` is called for each signal that a container has changed, and `moved` when the
  /// service has left the bus or come back to it. On the connection's thread. To be called once.
  void listen(std::function<void(const std::string& container)> signalled,
              std::function<void(bool isThere)> moved);

 private:
  BusConnection();
  /// What waits for answers; those that come no more are refused.
  class Pending;

  [[nodiscard]] static Error deadlock();
  [[nodiscard]] sdbus::MethodReply send(const char* interface, const char* method,
                                        const Write& write, Patience patience);
  [[nodiscard]] sdbus::MethodReply sendToOwner(const char* interface, const char* method,
                                               const Write& write, Patience patience);
  /// Who has the service's name; empty: nobody.
  void setOwner(const std::string& uniqueName);
  /// Asks the bus who has the name now; whether that is somebody else than `former`.
  [[nodiscard]] bool findOwnerOtherThan(const std::string& former);
  [[nodiscard]] std::string ownerName();
  [[nodiscard]] sdbus::IProxy& owner();

  std::shared_ptr<Pending> pending_;
  std::unique_ptr<sdbus::IConnection> connection_;
  std::unique_ptr<sdbus::IProxy> service_;  ///< whose signals are heard
  std::mutex mutex_;                        ///< for the owners
  /// By their own names, so that a call starts no service, perhaps of another home, in the place of
  /// one that has left. Those that left stay, for calls that were sent to them may be pending.
  std::vector<std::unique_ptr<sdbus::IProxy>> owners_;
  sdbus::IProxy* owner_ = nullptr;
  std::string ownerName_;
  sdbus::Slot moving_;
  std::atomic<bool> isLost_ = false;
  static constexpr std::ptrdiff_t mostUnderway = 64;
  std::counting_semaphore<mostUnderway> underway_{mostUnderway};
  std::unique_ptr<BusLoop> loop_;
};

}  // namespace mirabel::bus
