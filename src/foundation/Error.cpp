#include "mirabel/Error.h"

#include <system_error>
#include <utility>

namespace mirabel {
namespace {

Error make(ErrorDomain domain, std::int64_t code) {
  return {domain, code, {}};
}

Error makeWithDetail(ErrorDomain domain, std::int64_t code, std::string detail) {
  Error error = make(domain, code);
  if (!detail.empty()) error.userInfo.emplace(errorkey::detail, std::move(detail));
  return error;
}

std::string_view titleOf(ErrorDomain domain) {
  switch (domain) {
    case ErrorDomain::posix:
      return "POSIX error";
    case ErrorDomain::file:
      return "file error";
    case ErrorDomain::vessel:
      return "Vessel error";
    case ErrorDomain::localVessel:
      return "LocalVessel error";
    case ErrorDomain::propertyList:
      return "property list error";
    case ErrorDomain::store:
      return "store error";
  }
  return "error";
}

std::string_view fileMeaning(FileErrorCode code) {
  switch (code) {
    case FileErrorCode::noSuchFile:
      return "no such file";
    case FileErrorCode::writeNotPermitted:
      return "write not permitted";
    case FileErrorCode::fileExists:
      return "file already exists";
  }
  return {};
}

std::string_view vesselMeaning(VesselErrorCode code) {
  switch (code) {
    case VesselErrorCode::collision:
      return "an item of that name already exists";
    case VesselErrorCode::syncAnchorExpired:
      return "sync anchor expired";
    case VesselErrorCode::noSuchItem:
      return "no such item";
    case VesselErrorCode::invalidParameter:
      return "invalid parameter";
  }
  return {};
}

std::string_view localMeaning(LocalVesselError code) {
  switch (code) {
    case LocalVesselError::invalidItemIdentifier:
      return "invalid item identifier";
    case LocalVesselError::invalidItemURL:
      return "invalid item URL";
    case LocalVesselError::itemNotFound:
      return "item not found";
    case LocalVesselError::unableToGetDeviceUUID:
      return "unable to get device UUID";
  }
  return {};
}

/// What the code says in words; empty for one that its domain does not know.
std::string meaningOf(const Error& error) {
  switch (error.domain) {
    case ErrorDomain::posix:
      return std::generic_category().message(static_cast<int>(error.code));
    case ErrorDomain::file:
      return std::string(fileMeaning(static_cast<FileErrorCode>(error.code)));
    case ErrorDomain::vessel:
      return std::string(vesselMeaning(static_cast<VesselErrorCode>(error.code)));
    case ErrorDomain::localVessel:
      return std::string(localMeaning(static_cast<LocalVesselError>(error.code)));
    case ErrorDomain::propertyList:
      return "unreadable data";
    case ErrorDomain::store:
      return "database failure";
  }
  return {};
}

}  // namespace

Error Error::posix(int errnoValue) {
  return make(ErrorDomain::posix, errnoValue);
}

Error Error::posix(int errnoValue, std::string detail) {
  return makeWithDetail(ErrorDomain::posix, errnoValue, std::move(detail));
}

Error Error::file(FileErrorCode code) {
  return make(ErrorDomain::file, static_cast<std::int64_t>(code));
}

Error Error::vessel(VesselErrorCode code) {
  return make(ErrorDomain::vessel, static_cast<std::int64_t>(code));
}

Error Error::local(LocalVesselError code) {
  return make(ErrorDomain::localVessel, static_cast<std::int64_t>(code));
}

Error Error::propertyList(std::string detail) {
  return makeWithDetail(ErrorDomain::propertyList, 0, std::move(detail));
}

Error Error::store(std::int64_t code, std::string detail) {
  return makeWithDetail(ErrorDomain::store, code, std::move(detail));
}

Error Error::nonExistentItem(std::string_view identifier) {
  Error error = vessel(VesselErrorCode::noSuchItem);
  error.userInfo.emplace(errorkey::itemIdentifier, identifier);
  return error;
}

Error Error::invalidParameter(std::string_view parameter, std::string_view value) {
  Error error = vessel(VesselErrorCode::invalidParameter);
  error.userInfo.emplace(errorkey::parameter, parameter);
  error.userInfo.emplace(errorkey::value, value);
  return error;
}

Error Error::collision(std::string_view collidingItemIdentifier) {
  Error error = vessel(VesselErrorCode::collision);
  error.userInfo.emplace(errorkey::collidingItem, collidingItemIdentifier);
  return error;
}

std::string Error::description() const {
  std::string text(titleOf(domain));
  text += ' ';
  text += std::to_string(code);
  if (const std::string meaning = meaningOf(*this); !meaning.empty()) {
    text += ": ";
    text += meaning;
  }
  if (const auto detail = userInfo.find(errorkey::detail); detail != userInfo.end()) {
    text += "; ";
    text += detail->second;
  }
  return text;
}

}  // namespace mirabel
