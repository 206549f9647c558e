#pragma once

#include <cstdint>
#include <gtest/gtest.h>
#include <string>
#include <string_view>

#include "linux/icons/LinuxIconService.h"
#include "support/TempHome.h"

namespace mirabel::testing {

/// A picture of one colour.
struct Picture {
  int wide = 0;
  int high = 0;
  std::uint32_t colour = 0;  ///< red, green, blue, alpha

  friend bool operator==(const Picture&, const Picture&) = default;
};
void PrintTo(const Picture& picture, std::ostream* out);

[[nodiscard]] Data png(const Picture& picture);
/// Size and first pixel of what must be a PNG file.
[[nodiscard]] Picture pictureIn(const Data& png);

/// A home with applications and icons in it.
class IconFixture : public ::testing::Test {
 protected:
  /// Paths are relative to the home; folders that are missing on the way are made.
  void write(const std::string& path, std::string_view contents) const;
  void write(const std::string& path, const Picture& picture) const;
  void writeEntry(const std::string& identifier, const std::string& icon) const;
  [[nodiscard]] std::string at(const std::string& path) const { return home.path() + "/" + path; }

  [[nodiscard]] IconFolders folders() const {
    return IconFolders::of(home.path(), IconFolders::Reach::homeAlone);
  }
  using Icon = std::expected<Data, IconFailure>;
  [[nodiscard]] Icon icon(const std::string& identifier, const IconVariant& variant = {48, 48},
                          const std::string& theme = "hicolor") const;

  const std::string data = ".local/share/";
  const std::string icons = ".local/share/icons/";
  TempHome home;
};

}  // namespace mirabel::testing
