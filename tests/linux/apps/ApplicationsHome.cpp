#include "linux/apps/ApplicationsHome.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <stdexcept>

#include "linux/kernel/ObjectStatus.h"

namespace mirabel::testing {

namespace fs = std::filesystem;

ApplicationsHome::ApplicationsHome() {
  for (const std::string& folder : {user(), system(), container("")})
    fs::create_directories(folder);
}

std::string ApplicationsHome::user(std::string_view name) const {
  return path() + "/.local/share/applications/" + std::string(name);
}

std::string ApplicationsHome::system(std::string_view name) const {
  return path() + "/system/applications/" + std::string(name);
}

std::string ApplicationsHome::container(std::string_view identifier) const {
  return path() + "/.var/app/" + std::string(identifier);
}

LinuxApplicationRegistry::Options ApplicationsHome::options() const {
  LinuxApplicationRegistry::Options options;
  options.home = path();
  options.directories.user = {path() + "/.local/share/applications"};
  options.directories.system = {path() + "/system/applications"};
  options.device = statusOf(path()).value().device;
  options.locales = {"C"};
  return options;
}

void ApplicationsHome::write(const std::string& path, std::string_view text) {
  fs::create_directories(fs::path(path).parent_path());
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file << text;
  file.close();
  if (!file.good()) throw std::runtime_error("can't write " + path);
}

void ApplicationsHome::install(std::string_view identifier, std::string_view lines) const {
  write(user(identifier) + ".desktop", entryText(lines));
  makeDocuments(identifier);
}

void ApplicationsHome::makeDocuments(std::string_view identifier) const {
  fs::create_directories(container(identifier) + "/Documents");
}

std::string entryText(std::string_view lines) {
  return "[Desktop Entry]\nType=Application\n" + std::string(lines) + "\n";
}

std::vector<std::string> identifiersOf(ApplicationRegistry& registry, ApplicationType type) {
  std::vector<std::string> identifiers;
  const auto done =
      registry.enumerateApplicationsOfType(type, [&](const std::optional<BundleProxy>& proxy) {
        identifiers.push_back(proxy ? proxy->bundleIdentifier.value() : "");
      });
  EXPECT_TRUE(done);
  return identifiers;
}

std::string reasonFor(LinuxApplicationRegistry& registry, std::string_view identifier) {
  for (const auto type : {ApplicationType::user, ApplicationType::system})
    static_cast<void>(identifiersOf(registry, type));
  for (const LeftOut& item : registry.leftOut())
    if (item.identifier == identifier) return item.reason;
  return "";
}

}  // namespace mirabel::testing
