#include <cerrno>
#include <cstring>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "cli/ExitCode.h"
#include "host/ErrorText.h"
#include "host/bus/BusErrors.h"

namespace mirabel::testing {
namespace {

using ::testing::MatchesRegex;

std::vector<Error> allErrors() {
  std::vector<Error> errors;
  for (int code = 1; code < 200; ++code)
    if (::strerrorname_np(code) != nullptr) errors.push_back(Error::posix(code));
  for (const auto code :
       {FileErrorCode::noSuchFile, FileErrorCode::writeNotPermitted, FileErrorCode::fileExists})
    errors.push_back(Error::file(code));
  for (const auto code : {VesselErrorCode::collision, VesselErrorCode::syncAnchorExpired,
                          VesselErrorCode::noSuchItem, VesselErrorCode::invalidParameter})
    errors.push_back(Error::vessel(code));
  for (std::int64_t code = 0; code < 4; ++code)
    errors.push_back(Error::local(static_cast<LocalVesselError>(code)));
  errors.push_back(Error::propertyList("it is cut"));
  for (const std::int64_t code : {1L, 11L, 266L, -5L, INT64_MIN, INT64_MAX})
    errors.push_back(Error::store(code, "disk I/O error"));
  return errors;
}

TEST(BusErrors, ComeBackWithDomainCodeAndWords) {
  for (Error error : allErrors()) {
    error.userInfo[std::string(errorkey::detail)] += "\"a name\": \u00fc";
    const bus::BusError told = bus::errorForBus(error);
    EXPECT_THAT(told.getName(),
                MatchesRegex("com\\.norvane\\.Vessel1\\.Error(\\.[A-Za-z_][A-Za-z0-9_]*)+"));
    const Error back = bus::errorFromBus(told);
    EXPECT_EQ(back.domain, error.domain) << told.getName();
    EXPECT_EQ(back.code, error.code) << told.getName();
    EXPECT_EQ(explanation(back), explanation(error)) << told.getName();
    EXPECT_EQ(exitCodeFor(back), exitCodeFor(error)) << told.getName();
    EXPECT_EQ(back.description(), error.description()) << told.getName();
  }
}

TEST(BusErrors, HoldNothingThatTheBusRefuses) {
  using namespace std::string_literals;
  const std::string bytes = "caf\xe9 \0 \xed\xa0\x80 \xef\xbf\xbe end"s;
  const sdbus::Error told = bus::errorForBus(Error::posix(ENOENT, bytes));
  EXPECT_EQ(told.getMessage(),
            "caf\\xe9 \\x00 \\xed\\xa0\\x80 \\xef\\xbf\\xbe end: no such file or folder");
}

TEST(BusErrors, OfTheBusAndOfNewerServicesAreUnderstood) {
  const std::string ours = "com.norvane.Vessel1.Error.";
  const std::string theirs = "org.freedesktop.DBus.Error.";
  const std::pair<std::string, int> cases[] = {
      {theirs + "ServiceUnknown", ENOTCONN},
      {theirs + "NameHasNoOwner", ENOTCONN},
      {theirs + "NoReply", ENOTCONN},
      {theirs + "Disconnected", ENOTCONN},
      {theirs + "AccessDenied", EACCES},
      {theirs + "LimitsExceeded", EIO},
      {theirs + "UnknownMethod", EIO},
      {ours + "POSIX.ENEWERERRNO", EIO},
      {ours + "POSIX.", EIO},
      {ours + "NewerError", EIO},
      {ours, EIO},
      {"org.example.Error", EIO},
  };
  for (const auto& [name, code] : cases) {
    const Error error = bus::errorFromBus(sdbus::Error(name, "why"));
    EXPECT_TRUE(error.isPosix(code)) << name;
    EXPECT_NE(explanation(error), "") << name;
  }
  const Error store = bus::errorFromBus(sdbus::Error(ours + "Store.Codex", "why"));
  EXPECT_EQ(store.domain, ErrorDomain::store);
}

}  // namespace
}  // namespace mirabel::testing
