#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "items/LocalItem.h"
#include "support/FakeAppLibraries.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {

/// Items of a platform in memory, and what was logged.
class ItemsFixture : public ::testing::Test {
 protected:
  FakePlatform fake;
  FakeAppLibraries libraries{fake.applications};
  FileObjectURLs identity{fake.platform(), libraries};
  ItemContext context{fake.platform(), identity, libraries};
  LogCapture log;
};

}  // namespace mirabel::testing
