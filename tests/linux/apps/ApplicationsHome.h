#pragma once

#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "linux/apps/LinuxApplicationRegistry.h"
#include "support/TempHome.h"

namespace mirabel::testing {

/// A home with directories of entries, one of the user's and one of the system's, and containers.
class ApplicationsHome {
 public:
  ApplicationsHome();

  [[nodiscard]] const std::string& path() const { return home_.path(); }
  [[nodiscard]] std::string user(std::string_view name = {}) const;
  [[nodiscard]] std::string system(std::string_view name = {}) const;
  [[nodiscard]] std::string container(std::string_view identifier) const;
  /// With those directories, names in plain English, and this file system.
  [[nodiscard]] LinuxApplicationRegistry::Options options() const;

  /// Folders on the way are made; what is there is written over in place. At absolute paths.
  static void write(const std::string& path, std::string_view text);
  /// Writes an entry of these lines, such as "Name=A", and makes its container.
  void install(std::string_view identifier, std::string_view lines = {}) const;
  void makeDocuments(std::string_view identifier) const;
  /// Hands everything that is there to another user. Needs root.
  void giveTo(uid_t other) const { home_.giveTo(other); }

 private:
  TempHome home_;
};

/// The text of an entry of an application with these lines.
[[nodiscard]] std::string entryText(std::string_view lines = {});

/// The identifiers of a type, in their order; "" stands for an entry that can't be read.
[[nodiscard]] std::vector<std::string> identifiersOf(ApplicationRegistry& registry,
                                                     ApplicationType type);
/// The reason why something was left out, as both types were enumerated; empty for what was not.
[[nodiscard]] std::string reasonFor(LinuxApplicationRegistry& registry,
                                    std::string_view identifier);

/// A registry of what is installed in a home.
class RegistryTest : public ::testing::Test {
 protected:
  std::vector<std::string> users() { return identifiersOf(registry, ApplicationType::user); }
  std::vector<std::string> systems() { return identifiersOf(registry, ApplicationType::system); }

  ApplicationsHome home;
  LinuxApplicationRegistry registry{home.options()};
};

}  // namespace mirabel::testing
