#pragma once

#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace mirabel {

/// What a desktop entry says of its application. Nothing in it is ever run.
struct DesktopEntry {
  /// It is an application, and not one that is to be taken for deleted.
  bool isApplication = false;
  /// In the first of the languages that it has a name in; UTF-8, at most 1 KiB.
  std::optional<std::string> localizedName;

  /// The keys of that name with "X-Vessel-" before it. A value that is no boolean counts as false.
  std::optional<bool> supportsDocumentBrowser;
  std::optional<bool> supportsOpenInPlace;
  std::optional<bool> fileSharingEnabled;

  /// Its command takes files or URLs, and it names the types of them.
  bool opensFiles = false;

  /// Whether it has any of the three keys, so that nothing is to be guessed.
  [[nodiscard]] bool hasKeys() const {
    return supportsDocumentBrowser || supportsOpenInPlace || fileSharingEnabled;
  }

  /// Nothing for bytes that are no desktop entry. Bytes that are not UTF-8 are replaced.
  /// `languages` as `languagesOf` makes them.
  [[nodiscard]] static std::optional<DesktopEntry> parse(std::string_view bytes,
                                                         std::span<const std::string> languages);
};

/// The languages that names are looked for in, most wanted first, those of the environment where
/// `locales` is empty: "de_AT.UTF-8" stands for itself, "de_AT", "de.UTF-8" and "de".
[[nodiscard]] std::vector<std::string> languagesOf(const std::vector<std::string>& locales);

}  // namespace mirabel
