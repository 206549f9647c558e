#include "foundation/LookFailure.h"

#include <cerrno>
#include <string_view>

namespace mirabel {
namespace {

constexpr std::string_view storageKey = "closedStorage";

}  // namespace

Error closedStorage(const std::string& path) {
  Error error = Error::posix(EACCES, "\"" + path + "\"");
  error.userInfo.emplace(storageKey, path);
  return error;
}

LookFailure lookFailure(const Error& error) {
  if (error.is(FileErrorCode::noSuchFile)) return LookFailure::absent;
  if (error.domain != ErrorDomain::posix) return LookFailure::passing;
  if (error.userInfo.contains(storageKey)) return LookFailure::passing;
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
