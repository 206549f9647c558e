#pragma once

#include <filesystem>
#include <fstream>
#include <string>

#include "support/TempHome.h"

namespace mirabel::testing {

/// Applications of a home, as Flatpak lays them out: entries among its exports, and a container
/// for each.
class InstalledApps {
 public:
  explicit InstalledApps(const TempHome& home) : home_(home.path()) {
    std::filesystem::create_directories(exports());
    std::filesystem::create_directories(home_ / ".var/app");
  }

  /// One that shows its documents; `lines` may say otherwise. The entry comes last and whole.
  void install(const std::string& bundle, const std::string& name,
               const std::string& lines = "Exec=run %F\nMimeType=text/plain;\n") const {
    std::filesystem::create_directories(documents(bundle));
    const std::filesystem::path hidden = home_ / ("." + bundle);
    std::ofstream(hidden) << "[Desktop Entry]\nType=Application\nName=" << name << '\n' << lines;
    std::filesystem::rename(hidden, entry(bundle));
  }
  /// Its documents stay, as they do with Flatpak.
  void remove(const std::string& bundle) const { std::filesystem::remove(entry(bundle)); }

  [[nodiscard]] std::string documents(const std::string& bundle) const {
    return home_ / ".var/app" / bundle / "Documents";
  }
  void write(const std::string& bundle, const std::string& file, const std::string& text) const {
    std::ofstream(documents(bundle) + "/" + file) << text;
  }

 private:
  [[nodiscard]] std::filesystem::path exports() const {
    return home_ / ".local/share/flatpak/exports/share/applications";
  }
  [[nodiscard]] std::filesystem::path entry(const std::string& bundle) const {
    return exports() / (bundle + ".desktop");
  }

  std::filesystem::path home_;
};

}  // namespace mirabel::testing
