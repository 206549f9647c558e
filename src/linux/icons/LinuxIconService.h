#pragma once

#include <string>

#include "linux/icons/IconFolders.h"
#include "platform/IconService.h"

namespace mirabel {

/// The icons that desktop entries name, from the desktop's icon themes. Nothing is kept between
/// calls: a theme or an icon that was changed is seen at once. Files of more than 8 MiB and
/// pictures of more than 4096 pixels in a direction are no icons.
class LinuxIconService final : public IconService {
 public:
  struct Options {
    IconFolders folders;
    std::string theme = "hicolor";
    DeviceInformation device{};
  };
  explicit LinuxIconService(Options options) : options_(std::move(options)) {}

  [[nodiscard]] DeviceInformation deviceInformation() override { return options_.device; }
  [[nodiscard]] std::expected<Data, IconFailure> primaryIcon(const BundleProxy& application,
                                                             const IconVariant& variant) override;

 private:
  [[nodiscard]] Result<Data> iconFile(const BundleProxy& application,
                                      const IconVariant& variant) const;

  const Options options_;
};

}  // namespace mirabel
