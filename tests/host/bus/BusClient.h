#pragma once

#include <deque>
#include <memory>
#include <sdbus-c++/sdbus-c++.h>
#include <string>
#include <vector>

#include "host/bus/BusItems.h"
#include "host/bus/BusNames.h"

namespace mirabel::testing {

using BusOptions = std::map<std::string, sdbus::Variant>;

/// A program on the bus that knows nothing but the service's names. It starts no thread, so that
/// it may change what it is: its user, its root.
class BusClient {
 public:
  /// Waits for an answer so many microseconds.
  explicit BusClient(std::uint64_t longestAnswer = 30'000'000);

  /// An answer, or the name of the error.
  struct Answer {
    std::string error;
    std::string message;
    sdbus::MethodReply reply;
  };
  template <class... Arguments>
  Answer call(const char* interface, const char* method, const Arguments&... arguments) {
    auto message = service_->createMethodCall(interface, method);
    static_cast<void>((message << ... << arguments));
    return send(message);
  }
  template <class... Arguments>
  Answer provider(const char* method, const Arguments&... arguments) {
    return call(bus::providerInterface, method, arguments...);
  }
  template <class... Arguments>
  Answer operations(const char* method, const Arguments&... arguments) {
    return call(bus::operationsInterface, method, arguments...);
  }
  sdbus::MethodCall methodCall(const char* interface, const char* method) {
    return service_->createMethodCall(interface, method);
  }
  /// An error of the bus's own says that there was no answer: it must not come.
  Answer send(const sdbus::MethodCall& message);

  // What an answer holds; for one that is an error, which has the test fail, nothing.
  static ItemRecord item(Answer answer);
  static std::vector<ItemRecord> items(Answer answer);
  static Data bytes(Answer answer);
  struct Changes {
    std::vector<ItemRecord> updated;
    std::vector<std::string> deleted;
  };
  static Changes changes(Answer answer);

  std::string idOf(const std::string& path);
  Data anchorOf(const std::string& container) {
    return bytes(provider("GetCurrentSyncAnchor", container));
  }

  /// The container of the next signal; "" when none comes for far longer than it should take.
  std::string signal();
  /// Takes the signals that have come.
  std::vector<std::string> takeSignals();

 private:
  static bool isAnswer(const Answer& answer);
  void takeIn();

  const std::uint64_t longestAnswer_;
  std::unique_ptr<sdbus::IConnection> connection_;
  std::unique_ptr<sdbus::IProxy> service_;
  std::deque<std::string> signals_;
};

}  // namespace mirabel::testing
