#pragma once

#include <memory>
#include <string>
#include <sys/types.h>

namespace mirabel::testing {

/// A session bus of its own, named by the environment for as long as it lives. Failures throw.
class PrivateBus {
 public:
  PrivateBus();
  ~PrivateBus();
  PrivateBus(const PrivateBus&) = delete;
  PrivateBus& operator=(const PrivateBus&) = delete;

  [[nodiscard]] const std::string& address() const { return address_; }

 private:
  pid_t daemon_ = -1;
  std::string address_;
  std::string formerAddress_;
};

/// The program, serving a home on a bus of its own. Failures throw.
class ServedHome {
 public:
  explicit ServedHome(std::string home);
  /// Asks it to end.
  ~ServedHome();
  ServedHome(const ServedHome&) = delete;
  ServedHome& operator=(const ServedHome&) = delete;

  [[nodiscard]] pid_t process() const { return process_; }
  /// Returns when it answers on the bus.
  void start();
  void kill();
  /// Asks it to end in order; the exit status.
  int stop();

 private:
  int wait();

  PrivateBus bus_;
  std::string home_;
  pid_t process_ = -1;
};

}  // namespace mirabel::testing
