#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <sdbus-c++/sdbus-c++.h>
#include <stop_token>
#include <string_view>

#include "host/bus/BusErrors.h"
#include "host/bus/BusItems.h"
#include "host/bus/CallSize.h"
#include "host/bus/Callers.h"
#include "mirabel/Error.h"

namespace mirabel::bus {

/// One method call, answered once; where that is forgotten, with an error when it goes. Any thread
/// may answer it.
class BusCall {
 public:
  BusCall(sdbus::MethodCall message, std::shared_ptr<Caller> caller)
      : message_(std::move(message)), caller_(std::move(caller)) {}
  ~BusCall();
  BusCall(const BusCall&) = delete;
  BusCall& operator=(const BusCall&) = delete;

  /// The arguments, in their order; the bus has checked their types.
  template <class Value>
  [[nodiscard]] Value argument() {
    Value value{};
    message_ >> value;
    return value;
  }
  /// The caller's turn in its lane, which ends with the call: when it is answered.
  void keepTurn(std::shared_ptr<void> turn) { turn_ = std::move(turn); }

  /// Has the next argument be the first again.
  void readAgain() { message_.rewind(true); }
  /// See `sizeOfArguments`; before any of them is read.
  [[nodiscard]] std::size_t size(std::size_t most) { return sizeOfArguments(message_, most); }

  [[nodiscard]] Caller& caller() const { return *caller_; }

  /// `write` puts the results into the reply; where that throws, the call is answered with an
  /// error.
  void reply(const std::function<void(sdbus::Message& reply)>& write = {});
  void reply(const ItemRecord& item);
  void reply(const Result<ItemRecord>& item);
  void reply(const Result<std::vector<ItemRecord>>& items);
  void fail(const Error& error);
  void fail(const sdbus::Error& error);
  /// For arguments that can't be understood.
  void failInvalid(const std::string& why);

  /// The documents as the caller may see them; null, and the call is answered, where it may not.
  [[nodiscard]] Documents* documents();
  /// The same for what is no business of a sandboxed caller.
  [[nodiscard]] Documents* allDocuments();

 private:
  void sendError(const sdbus::Error& error, const BusError::Info* info);

  sdbus::MethodCall message_;
  std::shared_ptr<Caller> caller_;
  bool isAnswered_ = false;
  std::shared_ptr<void> turn_;
};

/// Which calls wait for which. Those of a caller in one lane are answered one after the other, in
/// their order, but for what is answered at once; of operations a few run at a time.
enum class Lane {
  lookups,       ///< short
  enumerations,  ///< listings, changes, watches, searches
  operations,    ///< what changes items
};

/// A method of the service. Names are those of results and arguments in the introspection data.
struct BusMethod {
  const char* interface;
  const char* name;
  const char* inputSignature;
  std::vector<std::string> inputNames;
  const char* outputSignature;
  std::vector<std::string> outputNames;
  Lane lane;
  std::function<void(const std::shared_ptr<BusCall>& call)> answer;
  /// On the thread that drives the bus, and so without waiting for anything: whether it could
  /// answer. Where it could not, or there is none, the call goes to its lane.
  std::function<bool(BusCall& call)> answerAtOnce{};
};

/// The item of an identifier, if that can be told without waiting for anything, or else null.
using Recall = std::function<std::shared_ptr<const ItemRecord>(std::string_view identifier)>;

/// Sends a signal of the provider's interface to one connection. Any thread.
using Signaller = std::function<void(const std::string& caller, const std::string& container)>;

[[nodiscard]] std::vector<BusMethod> providerMethods(Signaller signaller, Recall recall);
/// `stagingFolder`: where what comes as a descriptor is kept until it is imported. `stopping`: when
/// what is being copied there is given up.
[[nodiscard]] std::vector<BusMethod> operationsMethods(const std::string& stagingFolder,
                                                       const std::stop_token& stopping);
[[nodiscard]] std::vector<BusMethod> managerMethods();

}  // namespace mirabel::bus
