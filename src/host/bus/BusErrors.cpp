#include "host/bus/BusErrors.h"

#include <array>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>

#include "host/ErrorText.h"
#include "host/bus/BusText.h"
#include "mirabel/Values.h"

namespace mirabel::bus {
namespace {

constexpr std::string_view prefix = "com.norvane.Vessel1.Error.";
constexpr std::string_view posixPrefix = "POSIX.";
constexpr std::string_view storePrefix = "Store.Code";
constexpr int largestErrno = 200;

struct NamedError {
  std::string_view name;
  ErrorDomain domain;
  std::int64_t code;
};

template <class Code>
constexpr NamedError named(std::string_view name, ErrorDomain domain, Code code) {
  return {name, domain, static_cast<std::int64_t>(code)};
}

constexpr std::array namedErrors{
    named("NoSuchFile", ErrorDomain::file, FileErrorCode::noSuchFile),
    named("WriteNotPermitted", ErrorDomain::file, FileErrorCode::writeNotPermitted),
    named("FileExists", ErrorDomain::file, FileErrorCode::fileExists),
    named("Collision", ErrorDomain::vessel, VesselErrorCode::collision),
    named("SyncAnchorExpired", ErrorDomain::vessel, VesselErrorCode::syncAnchorExpired),
    named("NoSuchItem", ErrorDomain::vessel, VesselErrorCode::noSuchItem),
    named("InvalidParameter", ErrorDomain::vessel, VesselErrorCode::invalidParameter),
    named("InvalidItemIdentifier", ErrorDomain::localVessel,
          LocalVesselError::invalidItemIdentifier),
    named("InvalidItemURL", ErrorDomain::localVessel, LocalVesselError::invalidItemURL),
    named("ItemNotFound", ErrorDomain::localVessel, LocalVesselError::itemNotFound),
    named("UnableToGetDeviceUUID", ErrorDomain::localVessel,
          LocalVesselError::unableToGetDeviceUUID),
    named("PropertyList", ErrorDomain::propertyList, 0),
};

// The last element of a bus name may hold letters, digits and underscores only.
std::string nameOf(const Error& error) {
  for (const NamedError& candidate : namedErrors) {
    if (candidate.domain == error.domain && candidate.code == error.code)
      return std::string(candidate.name);
  }
  if (error.domain == ErrorDomain::posix) {
    const char* name = ::strerrorname_np(static_cast<int>(error.code));
    return std::string(posixPrefix) + (name != nullptr ? name : "EIO");
  }
  if (error.domain == ErrorDomain::store) {
    std::string digits = std::to_string(error.code);
    if (digits.starts_with('-')) digits.front() = '_';
    return std::string(storePrefix) + digits;
  }
  return "Failed";
}

std::optional<std::int64_t> posixCode(std::string_view name) {
  for (int code = 1; code <= largestErrno; ++code) {
    const char* candidate = ::strerrorname_np(code);
    if (candidate != nullptr && name == candidate) return code;
  }
  return {};
}

// "_" stands for the sign. 0 for what is no code.
std::int64_t storeCode(std::string_view text) {
  std::string digits(text);
  if (digits.starts_with('_')) digits.front() = '-';
  std::int64_t code = 0;
  std::from_chars(digits.data(), digits.data() + digits.size(), code);
  return code;
}

Error fromOwnName(std::string_view name) {
  for (const NamedError& candidate : namedErrors)
    if (candidate.name == name) return {candidate.domain, candidate.code, {}};
  if (name.starts_with(posixPrefix)) {
    return {ErrorDomain::posix, posixCode(name.substr(posixPrefix.size())).value_or(EIO), {}};
  }
  if (name.starts_with(storePrefix)) {
    return {ErrorDomain::store, storeCode(name.substr(storePrefix.size())), {}};
  }
  return Error::posix(EIO);
}

bool isOneOf(std::string_view name, std::initializer_list<std::string_view> names) {
  for (const std::string_view candidate : names)
    if (name == candidate) return true;
  return false;
}

}  // namespace

BusError BusError::read(sdbus::Message& reply, const sdbus::Error& error) {
  Info info;
  try {
    std::string message;
    reply >> message >> info;
  } catch (const sdbus::Error&) {
    info.clear();  // a service of before
  }
  return {error, std::move(info)};
}

BusError errorForBus(const Error& error) {
  BusError::Info info;
  for (const auto& [key, value] : error.userInfo)
    if (key != toldExplanation) info[key] = dataFromString(value);
  // Paths in it may hold any bytes, and an answer that can't be sent leaves the caller waiting.
  return {sdbus::Error(std::string(prefix) + nameOf(error), escaped(explanation(error))),
          std::move(info)};
}

Error errorFromBus(const sdbus::Error& error) {
  const std::string_view name = error.getName();
  if (name.starts_with(prefix)) {
    Error ours = fromOwnName(name.substr(prefix.size()));
    if (const auto* told = dynamic_cast<const BusError*>(&error)) {
      for (const auto& [key, value] : told->info())
        ours.userInfo[key] = stringView(value);
    }
    ours.userInfo[std::string(toldExplanation)] = error.getMessage();
    return ours;
  }
  using namespace std::string_view_literals;
  if (isOneOf(
          name,
          {"org.freedesktop.DBus.Error.ServiceUnknown"sv,
           "org.freedesktop.DBus.Error.NameHasNoOwner"sv, "org.freedesktop.DBus.Error.NoReply"sv,
           "org.freedesktop.DBus.Error.Disconnected"sv, "org.freedesktop.DBus.Error.Timeout"sv,
           "System.Error.ENOTCONN"sv, "System.Error.ECONNRESET"sv, "System.Error.ETIMEDOUT"sv}))
    return Error::posix(ENOTCONN, "the service does not answer");
  if (name == "org.freedesktop.DBus.Error.AccessDenied")
    return Error::posix(EACCES, error.getMessage());
  return Error::posix(EIO, std::string(name) + ": " + error.getMessage());
}

}  // namespace mirabel::bus
