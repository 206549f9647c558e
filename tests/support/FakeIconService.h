#pragma once

#include <cerrno>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "platform/IconService.h"

namespace mirabel::testing {

/// Icons by bundle identifier, and what was asked for. Used by one thread at a time.
class FakeIconService final : public IconService {
 public:
  DeviceInformation deviceInformation() override { return device; }

  std::expected<Data, IconFailure> primaryIcon(const BundleProxy& application,
                                               const IconVariant& variant) override {
    asked.push_back(variant);
    const auto found = icons.find(application.bundleIdentifier.value_or(""));
    if (found != icons.end()) return found->second;
    return std::unexpected(IconFailure{IconStep::primaryIconData, Error::posix(ENOENT)});
  }

  DeviceInformation device;
  std::map<std::string, std::expected<Data, IconFailure>> icons;
  std::vector<IconVariant> asked;
};

}  // namespace mirabel::testing
