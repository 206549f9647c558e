#include "host/bus/ServiceFixture.h"

namespace mirabel::testing {

void ServiceFixture::SetUp() {
  if (!PrivateBus::isPossible()) GTEST_SKIP() << "there is no dbus-daemon";
  bus = std::make_unique<PrivateBus>();
}

void ServiceFixture::serve() {
  service = std::make_unique<Running>(
      std::vector<std::string>{MIRABEL_PROGRAM, "--home", home.path(), "serve"});
  // It says so once its name is taken and calls are answered.
  const std::string line = service->errors().line();
  ASSERT_THAT(line, ::testing::StartsWith("mirabel: serving "));
}

}  // namespace mirabel::testing
