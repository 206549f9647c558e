#pragma once

#include <sys/types.h>

namespace mirabel::testing {

/// While it lives, the process acts as a user without privileges. Does nothing in a process that
/// has none to begin with.
class OrdinaryUser {
 public:
  /// The user that root becomes.
  static constexpr uid_t substitute = 65534;
  [[nodiscard]] static bool isRoot();

  OrdinaryUser();
  ~OrdinaryUser();
  OrdinaryUser(const OrdinaryUser&) = delete;
  OrdinaryUser& operator=(const OrdinaryUser&) = delete;

 private:
  bool switched_;
};

}  // namespace mirabel::testing
