#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "applibrary/MRBAppLibraryManager.h"
#include "fs/FSChangesEnumerations.h"
#include "provider/LocalVessel.h"
#include "support/FakeEventStreams.h"
#include "support/FakeIconService.h"
#include "support/FakeNotificationCenter.h"
#include "support/FakePacerClock.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {

/// A provider with everything that a host gives it, on a platform in memory.
class HostedFixture : public ::testing::Test {
 protected:
  /// An application that shows its documents.
  void install(const std::string& identifier, std::optional<std::string> name = {}) {
    fake.install(identifier, "/apps/" + identifier, std::move(name));
  }
  /// Makes the provider, and returns when it has seen what is installed.
  void start() {
    vessel = std::make_unique<LocalVessel>(
        fake.platform(), libraries, libraries, ChangeServices{events, fake.diagnostics, changes},
        ApplicationServices{libraries, notifications, icons, time});
    vessel->waitForAppLibraries();
  }

  FakePlatform fake;
  FakeEventStreams events;
  FakeNotificationCenter notifications;
  FakeIconService icons;
  FakePacerClock time;  // of the refreshes of the app libraries
  LogCapture log;
  MRBAppLibraryManager libraries{fake.platform()};
  FileObjectURLs identity{fake.platform(), libraries};
  FSChangesEnumerations changes{{fake.platform(), identity, libraries}, events, libraries};
  std::unique_ptr<LocalVessel> vessel;
};

}  // namespace mirabel::testing
