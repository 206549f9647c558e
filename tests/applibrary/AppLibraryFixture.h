#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/ChangeLog.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {

inline constexpr const char* mainCachePath = "/home/me/.local/share/Mirabel/app-libraries.plist";
inline constexpr const char* workingSetCachePath =
    "/home/me/.local/share/Mirabel/searchable-app-libraries.plist";

inline BundleProxy recordOf(std::string_view identifier, std::string_view container,
                            std::optional<std::string> name = {}) {
  return {std::string(identifier), URL::fileURL(container), std::move(name)};
}

/// One text per record: identifier, container and name.
inline std::vector<std::string> shown(const std::vector<BundleProxy>& records) {
  std::vector<std::string> texts;
  for (const BundleProxy& record : records) {
    texts.push_back(record.bundleIdentifier.value_or("-") + " " +
                    (record.dataContainerURL ? record.dataContainerURL->path() : "-") + " " +
                    record.localizedName.value_or("-"));
  }
  return texts;
}

/// A platform with applications and caches, and what was logged.
class AppLibraryFixture : public ::testing::Test {
 protected:
  /// An application that shows its documents.
  void install(std::string_view identifier, std::optional<std::string> name = {}) {
    fake.install(identifier, "/apps/" + std::string(identifier), std::move(name));
  }
  /// The messages so far, which are then forgotten.
  std::vector<std::string> messages() {
    std::vector<std::string> texts;
    for (const LogLine& line : log.messages())
      texts.push_back(line.text);
    log.clear();
    return texts;
  }

  FakePlatform fake;
  LogCapture log;
};

}  // namespace mirabel::testing
