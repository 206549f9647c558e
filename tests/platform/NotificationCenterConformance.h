#pragma once

#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/NotificationCenter.h"

namespace mirabel::testing {

/// A center and the means to post to it.
class NotificationCenterUnderTest {
 public:
  virtual ~NotificationCenterUnderTest() = default;
  [[nodiscard]] virtual NotificationCenter& center() = 0;
  virtual void post(std::string_view name) = 0;
  /// Returns when all that was posted is delivered.
  virtual void settle() = 0;
};

using NotificationCenterFactory = std::function<std::unique_ptr<NotificationCenterUnderTest>()>;

/// What every notification center keeps to.
class NotificationCenterConformance : public ::testing::TestWithParam<NotificationCenterFactory> {
 protected:
  using Names = std::vector<std::string>;

  NotificationCenter& center() { return tested->center(); }
  NotificationCenter::Callback noting() {
    return [this](std::string_view name) { heard.emplace_back(name); };
  }
  Names heardOf(std::string_view name) {
    heard.clear();
    tested->post(name);
    tested->settle();
    return heard;
  }

  std::unique_ptr<NotificationCenterUnderTest> tested = GetParam()();
  Names heard;
  const int observer = 0;
  const int other = 0;
};

TEST_P(NotificationCenterConformance, ObserversHearTheNamesThatTheyAskedFor) {
  EXPECT_EQ(heardOf("a"), Names{});
  center().addObserver(&observer, "a", noting());
  center().addObserver(&observer, "b", noting());
  center().addObserver(&other, "b", noting());
  EXPECT_EQ(heardOf("a"), Names{"a"});
  EXPECT_EQ(heardOf("b"), (Names{"b", "b"}));
  EXPECT_EQ(heardOf("c"), Names{});
  center().removeEveryObserver(&observer);
  EXPECT_EQ(heardOf("a"), Names{});
  EXPECT_EQ(heardOf("b"), Names{"b"});
  center().removeEveryObserver(&observer);
}

TEST_P(NotificationCenterConformance, CallbackMayRemoveItsObserverAndThoseAfterIt) {
  center().addObserver(&observer, "a", [this](std::string_view) {
    heard.emplace_back("first");
    center().removeEveryObserver(&observer);
    center().removeEveryObserver(&other);
  });
  center().addObserver(&observer, "a", noting());
  center().addObserver(&other, "a", noting());
  EXPECT_EQ(heardOf("a"), Names{"first"});
  EXPECT_EQ(heardOf("a"), Names{});
}

}  // namespace mirabel::testing
