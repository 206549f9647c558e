#include <utility>

#include "platform/ApplicationRegistryConformance.h"
#include "support/FakeApplications.h"

namespace mirabel::testing {
namespace {

class FakeMachine final : public ApplicationMachine {
 public:
  ApplicationRegistry& registry() override { return applications_; }

  void install(const Application& application, ApplicationType type) override {
    BundleProxy proxy;
    proxy.bundleIdentifier = application.identifier;
    proxy.localizedName = application.name;
    proxy.supportsOpenInPlace = application.supportsOpenInPlace;
    proxy.fileSharingEnabled = application.fileSharingEnabled;
    if (application.hasDocuments) proxy.dataContainerURL = containerOf(application.identifier);
    const bool isUsers = type == ApplicationType::user;
    (isUsers ? applications_.installed : applications_.ofSystem).push_back(std::move(proxy));
    if (!application.supportsDocumentBrowser) return;
    applications_.infoDictionaries[application.identifier].emplace_back(
        "UISupportsDocumentBrowser", *application.supportsDocumentBrowser);
  }
  void installUnreadable() override { ++applications_.unreadable; }
  void uninstall(std::string_view identifier) override {
    std::erase_if(applications_.installed,
                  [&](const BundleProxy& proxy) { return proxy.bundleIdentifier == identifier; });
  }
  URL containerOf(std::string_view identifier) const override {
    return URL::fileURL("/home/me/.var/app/" + std::string(identifier));
  }

 private:
  FaultScript faults_;
  FakeApplications applications_{faults_};
};

std::unique_ptr<ApplicationMachine> makeFakeMachine() {
  return std::make_unique<FakeMachine>();
}

INSTANTIATE_TEST_SUITE_P(Fake, ApplicationRegistryConformance, ::testing::Values(makeFakeMachine));

}  // namespace
}  // namespace mirabel::testing
