#include "cli/ExitCode.h"

#include <cerrno>

namespace mirabel {
namespace {

ExitCode exitCodeForPosix(std::int64_t code) {
  switch (code) {
    case ENOENT:
      return ExitCode::noSuchItem;
    case EPERM:
    case EACCES:
    case EROFS:
      return ExitCode::notPermitted;
    case EEXIST:
      return ExitCode::nameTaken;
    case EBUSY:
    case ENOTCONN:
    case EADDRINUSE:
      return ExitCode::busy;
    default:
      return ExitCode::failed;
  }
}

ExitCode exitCodeForVessel(const Error& error) {
  if (error.is(VesselErrorCode::syncAnchorExpired)) return ExitCode::startOver;
  if (error.is(VesselErrorCode::noSuchItem)) return ExitCode::noSuchItem;
  if (error.is(VesselErrorCode::collision)) return ExitCode::nameTaken;
  return ExitCode::failed;
}

ExitCode exitCodeForFile(const Error& error) {
  if (error.is(FileErrorCode::noSuchFile)) return ExitCode::noSuchItem;
  if (error.is(FileErrorCode::writeNotPermitted)) return ExitCode::notPermitted;
  if (error.is(FileErrorCode::fileExists)) return ExitCode::nameTaken;
  return ExitCode::failed;
}

}  // namespace

ExitCode exitCodeFor(const Error& error) {
  switch (error.domain) {
    case ErrorDomain::posix:
      return exitCodeForPosix(error.code);
    case ErrorDomain::file:
      return exitCodeForFile(error);
    case ErrorDomain::vessel:
      return exitCodeForVessel(error);
    case ErrorDomain::localVessel:
      return error.is(LocalVesselError::unableToGetDeviceUUID) ? ExitCode::failed
                                                               : ExitCode::noSuchItem;
    case ErrorDomain::propertyList:
    case ErrorDomain::store:
      return ExitCode::failed;
  }
  return ExitCode::failed;
}

std::string_view domainName(ErrorDomain domain) {
  switch (domain) {
    case ErrorDomain::posix:
      return "POSIX";
    case ErrorDomain::file:
      return "file";
    case ErrorDomain::vessel:
      return "Vessel";
    case ErrorDomain::localVessel:
      return "LocalVessel";
    case ErrorDomain::propertyList:
      return "propertyList";
    case ErrorDomain::store:
      return "store";
  }
  return "unknown";
}

}  // namespace mirabel
