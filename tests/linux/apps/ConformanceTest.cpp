#include <filesystem>

#include "linux/apps/ApplicationsHome.h"
#include "linux/apps/LocalNotificationCenter.h"
#include "platform/ApplicationRegistryConformance.h"
#include "platform/NotificationCenterConformance.h"

namespace mirabel::testing {
namespace {

std::string line(std::string_view key, bool value) {
  return "X-Vessel-" + std::string(key) + "=" + (value ? "true" : "false") + "\n";
}

class LinuxMachine final : public ApplicationMachine {
 public:
  ApplicationRegistry& registry() override { return registry_; }

  void install(const Application& application, ApplicationType type) override {
    std::string lines = line("SupportsOpenInPlace", application.supportsOpenInPlace) +
                        line("FileSharingEnabled", application.fileSharingEnabled);
    if (application.name) lines += "Name=" + *application.name + "\n";
    if (application.supportsDocumentBrowser) {
      lines += line("SupportsDocumentBrowser", *application.supportsDocumentBrowser);
    }
    const std::string name = application.identifier + ".desktop";
    ApplicationsHome::write(type == ApplicationType::user ? home_.user(name) : home_.system(name),
                            entryText(lines));
    if (application.hasDocuments) home_.makeDocuments(application.identifier);
  }
  void installUnreadable() override { home_.write(home_.user("broken.desktop"), "{}"); }
  void uninstall(std::string_view identifier) override {
    std::filesystem::remove(home_.user(identifier) + ".desktop");
  }
  URL containerOf(std::string_view identifier) const override {
    return URL::fileURL(home_.container(identifier));
  }

 private:
  ApplicationsHome home_;
  LinuxApplicationRegistry registry_{home_.options()};
};

class LocalCenterUnderTest final : public NotificationCenterUnderTest {
 public:
  NotificationCenter& center() override { return center_; }
  void post(std::string_view name) override { center_.post(name); }
  void settle() override { center_.removeEveryObserver(nullptr); }

 private:
  LocalNotificationCenter center_;
};

std::unique_ptr<ApplicationMachine> makeLinuxMachine() {
  return std::make_unique<LinuxMachine>();
}

std::unique_ptr<NotificationCenterUnderTest> makeLocalCenter() {
  return std::make_unique<LocalCenterUnderTest>();
}

INSTANTIATE_TEST_SUITE_P(Linux, ApplicationRegistryConformance,
                         ::testing::Values(makeLinuxMachine));
INSTANTIATE_TEST_SUITE_P(Linux, NotificationCenterConformance, ::testing::Values(makeLocalCenter));

}  // namespace
}  // namespace mirabel::testing
