#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <random>
#include <sdbus-c++/sdbus-c++.h>
#include <string>
#include <vector>

namespace mirabel::testing {

/// What the clients know to be true, for as long as they run.
struct SoakTruth {
  std::vector<std::string> identifiers;                     ///< of files that nobody changes
  std::map<std::string, std::string> names;                 ///< of those
  std::map<std::string, std::vector<std::string>> folders;  ///< identifiers in each folder, sorted
  std::string busyFolder;                                   ///< in which files come and go
};

/// One program on the bus that asks at random, and checks each answer. Used by one thread.
class SoakClient {
 public:
  SoakClient(const SoakTruth& truth, unsigned seed) : truth_(truth), random_(seed) { connect(); }

  /// Makes one call or a few; answers how many. Throws `SoakFailure` for an answer that is wrong.
  std::size_t step();
  /// Asks so many times without ever reading an answer, and goes.
  static std::size_t askWithoutReading(const SoakTruth& truth, std::size_t calls);

 private:
  void connect();
  [[nodiscard]] std::size_t pick(std::size_t count);
  sdbus::MethodReply call(const char* interface, const char* method,
                          const std::function<void(sdbus::MethodCall&)>& write = {});
  std::size_t lookUp();
  std::size_t list();
  std::size_t leaveInTheMiddle();
  std::size_t follow();
  std::size_t watch();
  std::size_t search();
  std::size_t sendNonsense();

  const SoakTruth& truth_;
  std::mt19937 random_;
  std::unique_ptr<sdbus::IConnection> connection_;
  std::unique_ptr<sdbus::IProxy> service_;
  std::vector<std::uint8_t> anchor_;  ///< of the busy folder
};

struct SoakFailure {
  std::string what;
};

}  // namespace mirabel::testing
