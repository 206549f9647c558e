#pragma once

#include <array>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ApplicationRegistry.h"

namespace mirabel::testing {

/// A machine and the means to install applications on it.
class ApplicationMachine {
 public:
  struct Application {
    std::string identifier;
    std::optional<std::string> name = {};
    bool hasDocuments = true;
    bool supportsOpenInPlace = false;
    bool fileSharingEnabled = false;
    std::optional<bool> supportsDocumentBrowser = {};
  };

  virtual ~ApplicationMachine() = default;
  [[nodiscard]] virtual ApplicationRegistry& registry() = 0;
  /// An application with an identifier that is installed already takes its place.
  virtual void install(const Application& application,
                       ApplicationType type = ApplicationType::user) = 0;
  /// By the user.
  virtual void installUnreadable() = 0;
  virtual void uninstall(std::string_view identifier) = 0;
  [[nodiscard]] virtual URL containerOf(std::string_view identifier) const = 0;
};

using ApplicationMachineFactory = std::function<std::unique_ptr<ApplicationMachine>()>;

/// What every application registry keeps to.
class ApplicationRegistryConformance : public ::testing::TestWithParam<ApplicationMachineFactory> {
 protected:
  using Identifiers = std::vector<std::optional<std::string>>;

  ApplicationRegistry& registry() { return machine->registry(); }
  /// Nothing stands for an application that could not be read.
  Identifiers enumerated(ApplicationType type) {
    Identifiers identifiers;
    const auto done =
        registry().enumerateApplicationsOfType(type, [&](const std::optional<BundleProxy>& proxy) {
          identifiers.push_back(proxy ? proxy->bundleIdentifier : std::nullopt);
        });
    EXPECT_TRUE(done);
    return identifiers;
  }
  URL documentsOf(std::string_view identifier) {
    return machine->containerOf(identifier).appendingPathComponent("Documents");
  }

  std::unique_ptr<ApplicationMachine> machine = GetParam()();
};

TEST_P(ApplicationRegistryConformance, ApplicationIsFoundByIdentifierAndByItsDocuments) {
  machine->install({.identifier = "org.a", .name = "An A", .supportsOpenInPlace = true});
  machine->install({.identifier = "org.b", .fileSharingEnabled = true});
  const auto a = registry().proxyForBundleIdentifier("org.a");
  ASSERT_TRUE(a);
  EXPECT_EQ(a->bundleIdentifier, "org.a");
  EXPECT_EQ(a->localizedName, "An A");
  EXPECT_EQ(a->dataContainerURL, machine->containerOf("org.a"));
  EXPECT_TRUE(a->supportsOpenInPlace);
  EXPECT_FALSE(a->fileSharingEnabled);
  const auto b = registry().proxyAt(documentsOf("org.b"));
  ASSERT_TRUE(b);
  EXPECT_EQ(b->bundleIdentifier, "org.b");
  EXPECT_EQ(b->localizedName, std::nullopt);
  EXPECT_FALSE(b->supportsOpenInPlace);
  EXPECT_TRUE(b->fileSharingEnabled);
}

TEST_P(ApplicationRegistryConformance, NothingIsFoundElsewhere) {
  machine->install({.identifier = "org.a"});
  machine->install({.identifier = "org.bare", .hasDocuments = false});
  for (const char* identifier : {"", "org", "org.a2", "ORG.A", ".", "..", "org.a/../org.a"})
    EXPECT_FALSE(registry().proxyForBundleIdentifier(identifier)) << identifier;
  const URL documents = documentsOf("org.a");
  const URL elsewhere[] = {machine->containerOf("org.a"),
                           documents.appendingPathComponent("a"),
                           documents.appendingPathComponent("Documents"),
                           documentsOf("org.a2"),
                           documentsOf("org.bare"),
                           URL::fileURL("/Documents"),
                           URL::fromString("https://localhost/Documents")};
  for (const URL& url : elsewhere)
    EXPECT_FALSE(registry().proxyAt(url)) << url.description();
  const auto bare = registry().proxyForBundleIdentifier("org.bare");
  ASSERT_TRUE(bare);
  EXPECT_FALSE(bare->dataContainerURL);
}

TEST_P(ApplicationRegistryConformance, EachTypeIsReportedInTheSameOrderEachTime) {
  for (const char* identifier : {"org.a", "org.b", "org.c"})
    machine->install({.identifier = identifier});
  machine->install({.identifier = "org.system"}, ApplicationType::system);
  for (int time = 0; time < 2; ++time) {
    EXPECT_EQ(enumerated(ApplicationType::user), (Identifiers{"org.a", "org.b", "org.c"}));
    EXPECT_EQ(enumerated(ApplicationType::system), Identifiers{"org.system"});
  }
  machine->uninstall("org.b");
  EXPECT_EQ(enumerated(ApplicationType::user), (Identifiers{"org.a", "org.c"}));
  EXPECT_FALSE(registry().proxyForBundleIdentifier("org.b"));
  EXPECT_FALSE(registry().proxyAt(documentsOf("org.b")));
}

TEST_P(ApplicationRegistryConformance, UnreadableEntryIsReportedAsNothing) {
  machine->install({.identifier = "org.a"});
  machine->installUnreadable();
  EXPECT_THAT(enumerated(ApplicationType::user),
              ::testing::UnorderedElementsAre(std::nullopt, "org.a"));
}

TEST_P(ApplicationRegistryConformance, InfoDictionaryHasThoseOfTheKeysThatThereAre) {
  constexpr std::string_view key = "UISupportsDocumentBrowser";
  const std::array keys = {std::string_view("Other"), key};
  machine->install({.identifier = "none"});
  machine->install({.identifier = "on", .supportsDocumentBrowser = true});
  machine->install({.identifier = "off", .supportsDocumentBrowser = false});
  const auto with = [&](bool value) {
    return PropertyList::Dictionary{{std::string(key), PropertyList(value)}};
  };
  const std::pair<const char*, PropertyList::Dictionary> cases[] = {
      {"none", {}}, {"on", with(true)}, {"off", with(false)}};
  for (const auto& [identifier, expected] : cases) {
    const BundleProxy application = registry().proxyForBundleIdentifier(identifier).value();
    EXPECT_EQ(registry().infoDictionaryValues(application, keys), PropertyList(expected));
    EXPECT_EQ(registry().infoDictionaryValues(application, {}),
              PropertyList(PropertyList::Dictionary()));
  }
}

TEST_P(ApplicationRegistryConformance, BlockMayAskTheRegistry) {
  machine->install({.identifier = "org.a", .supportsDocumentBrowser = true});
  int reported = 0;
  const auto done = registry().enumerateApplicationsOfType(
      ApplicationType::user, [&](const std::optional<BundleProxy>& proxy) {
        ++reported;
        EXPECT_TRUE(registry().infoDictionaryValues(*proxy, {}));
        EXPECT_TRUE(registry().proxyForBundleIdentifier(*proxy->bundleIdentifier));
      });
  EXPECT_TRUE(done);
  EXPECT_EQ(reported, 1);
}

}  // namespace mirabel::testing
