#include "support/OrdinaryUser.h"

#include <cerrno>
#include <system_error>
#include <unistd.h>

namespace mirabel::testing {
namespace {

// Only the effective identity changes: the real one is what leads back.
void become(uid_t user) {
  const bool isLeavingRoot = user != 0;
  if (isLeavingRoot && ::setegid(user) != 0) {
    throw std::system_error(errno, std::generic_category(), "setegid");
  }
  if (::seteuid(user) != 0) throw std::system_error(errno, std::generic_category(), "seteuid");
  if (!isLeavingRoot && ::setegid(0) != 0) {
    throw std::system_error(errno, std::generic_category(), "setegid");
  }
}

}  // namespace

bool OrdinaryUser::isRoot() {
  return ::geteuid() == 0;
}

OrdinaryUser::OrdinaryUser() : switched_(isRoot()) {
  if (switched_) become(substitute);
}

OrdinaryUser::~OrdinaryUser() {
  if (switched_) become(0);
}

}  // namespace mirabel::testing
