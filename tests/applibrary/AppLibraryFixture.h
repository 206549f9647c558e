#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "items/LocalItem.h"
#include "platform/EnumerationObservers.h"
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

/// Writes down what it is told, one text per call: names or identifiers.
class ChangeLog final : public VesselChangeObserver {
 public:
  void didUpdateItems(const VesselItems& items) override {
    std::string call = "update";
    for (const auto& item : items)
      call += " " + item->filename();
    calls.push_back(call);
  }
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override {
    std::string call = "delete";
    for (const std::string& identifier : identifiers)
      call += " " + identifier;
    calls.push_back(call);
  }
  void finishEnumeratingChangesUpToSyncAnchor(const Data&, bool) override {
    calls.emplace_back("finish");
  }
  void finishEnumeratingWithError(const Error&) override { calls.emplace_back("error"); }

  std::vector<std::string> calls;
};

/// A platform with applications and caches, and what was logged.
class AppLibraryFixture : public ::testing::Test {
 protected:
  /// An application that shows its documents.
  void install(std::string_view identifier, std::optional<std::string> name = {}) {
    fake.install(identifier, "/apps/" + std::string(identifier), std::move(name));
    fake.applications.installed.back().supportsOpenInPlace = true;
    fake.applications.installed.back().fileSharingEnabled = true;
  }
  void uninstall(std::string_view identifier) {
    std::erase_if(fake.applications.installed,
                  [&](const BundleProxy& proxy) { return proxy.bundleIdentifier == identifier; });
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
