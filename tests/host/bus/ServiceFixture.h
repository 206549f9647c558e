#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <string>

#include "cli/Running.h"
#include "host/bus/PrivateBus.h"
#include "support/TempHome.h"

namespace mirabel::testing {

/// A bus of the test's own, and the program that serves a temporary home on it.
class ServiceFixture : public ::testing::Test {
 protected:
  void SetUp() override;

  /// Starts the service and waits until it answers. What the home holds by then is found by its
  /// first look, and what comes later is followed.
  void serve();

  TempHome home;
  std::unique_ptr<PrivateBus> bus;
  std::unique_ptr<Running> service;
};

}  // namespace mirabel::testing
