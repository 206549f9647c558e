#include "platform/NotificationCenterConformance.h"
#include "support/FakeNotificationCenter.h"

namespace mirabel::testing {
namespace {

class FakeCenterUnderTest final : public NotificationCenterUnderTest {
 public:
  NotificationCenter& center() override { return center_; }
  void post(std::string_view name) override { center_.post(name); }
  void settle() override {}

 private:
  FakeNotificationCenter center_;
};

std::unique_ptr<NotificationCenterUnderTest> makeFakeCenter() {
  return std::make_unique<FakeCenterUnderTest>();
}

INSTANTIATE_TEST_SUITE_P(Fake, NotificationCenterConformance, ::testing::Values(makeFakeCenter));

}  // namespace
}  // namespace mirabel::testing
