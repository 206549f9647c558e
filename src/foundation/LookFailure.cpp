#include "foundation/LookFailure.h"

#include <cerrno>

namespace mirabel {

LookFailure lookFailure(const Error& error) {
  if (error.is(FileErrorCode::noSuchFile)) return LookFailure::absent;
  if (error.domain != ErrorDomain::posix) return LookFailure::passing;
  switch (error.code) {
    case ENOENT:
    case ENOTDIR:
    case ELOOP:
    case ENAMETOOLONG:
      return LookFailure::absent;
    case EACCES:
    case EPERM:
    case EXDEV:
      return LookFailure::closed;
    default:
      return LookFailure::passing;
  }
}

}  // namespace mirabel
