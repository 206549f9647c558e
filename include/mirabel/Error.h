#pragma once

#if __cplusplus <= 202002L
#error "Mirabel's headers need C++23 (-std=c++23)"
#endif

#include <cstdint>
#include <expected>
#include <map>
#include <string>
#include <string_view>
#include <utility>

#include "mirabel/Export.h"

namespace mirabel {

/// The family that an error's code belongs to.
enum class ErrorDomain {
  posix,         ///< code is an errno value
  file,          ///< general file errors, see `FileErrorCode`
  vessel,        ///< errors that the host acts on, see `VesselErrorCode`
  localVessel,   ///< Mirabel's own, see `LocalVesselError`
  propertyList,  ///< bytes that are no property list or archive of ours
  store,         ///< the volume's database or the search index; code is SQLite's
};

/// Codes of `ErrorDomain::file`.
enum class FileErrorCode : std::int64_t {
  noSuchFile = 260,
  writeNotPermitted = 513,
  fileExists = 516,
};

/// Codes of `ErrorDomain::vessel`.
enum class VesselErrorCode : std::int64_t {
  collision = -1001,          ///< `errorkey::collidingItem` names the item in the way
  syncAnchorExpired = -1002,  ///< also a page that expired: start over
  noSuchItem = -1005,         ///< `errorkey::itemIdentifier` names it
  invalidParameter = -1010,   ///< `errorkey::parameter` and `errorkey::value`
};

/// Codes of `ErrorDomain::localVessel`.
enum class LocalVesselError : std::int64_t {
  invalidItemIdentifier = 0,  ///< not of a form that identifiers have
  invalidItemURL = 1,         ///< a place that is none
  itemNotFound = 2,           ///< it is there, and not shown
  unableToGetDeviceUUID = 3,  ///< the volume can't be told from others
};

/// Keys of `Error::userInfo`.
namespace errorkey {
inline constexpr std::string_view collidingURL = "collidingURL";    ///< path of what has the name
inline constexpr std::string_view collidingItem = "collidingItem";  ///< its identifier
inline constexpr std::string_view itemIdentifier = "itemIdentifier";
inline constexpr std::string_view parameter = "parameter";
inline constexpr std::string_view value = "value";
inline constexpr std::string_view detail = "detail";  ///< free text, ends the description
}  // namespace errorkey

/// Why something failed. A value; equal when domain, code and user info are.
struct MIRABEL_EXPORT Error {
  ErrorDomain domain = ErrorDomain::posix;
  std::int64_t code = 0;
  std::map<std::string, std::string, std::less<>> userInfo;

  static Error posix(int errnoValue);
  static Error posix(int errnoValue, std::string detail);
  static Error file(FileErrorCode code);
  static Error vessel(VesselErrorCode code);
  static Error local(LocalVesselError code);
  static Error propertyList(std::string detail);
  static Error store(std::int64_t code, std::string detail);
  static Error syncAnchorExpired() { return vessel(VesselErrorCode::syncAnchorExpired); }
  static Error nonExistentItem(std::string_view identifier);
  static Error invalidParameter(std::string_view parameter, std::string_view value);
  /// The name is taken by the item of that identifier.
  static Error collision(std::string_view collidingItemIdentifier);

  [[nodiscard]] bool isPosix(int errnoValue) const {
    return domain == ErrorDomain::posix && code == errnoValue;
  }
  [[nodiscard]] bool is(VesselErrorCode value) const {
    return domain == ErrorDomain::vessel && code == static_cast<std::int64_t>(value);
  }
  [[nodiscard]] bool is(LocalVesselError value) const {
    return domain == ErrorDomain::localVessel && code == static_cast<std::int64_t>(value);
  }
  [[nodiscard]] bool is(FileErrorCode value) const {
    return domain == ErrorDomain::file && code == static_cast<std::int64_t>(value);
  }

  /// One line for logs and people: what happened, with the code and the detail if there is one.
  [[nodiscard]] std::string description() const;

  friend bool operator==(const Error&, const Error&) = default;
};

/// What can fail: a value, or why there is none.
template <class T>
using Result = std::expected<T, Error>;

/// Shorthand for returning an error from a function that returns a `Result`.
[[nodiscard]] inline std::unexpected<Error> fail(Error error) {
  return std::unexpected<Error>(std::move(error));
}

}  // namespace mirabel
