#pragma once

#include "foundation/ExtendedAttributes.h"
#include "linux/kernel/MonitoredRoots.h"

namespace mirabel {

/// Extended attributes on Linux: "com.norvane.x" is kept as "user.com.norvane.x", and attributes
/// of other namespaces are not seen. What lies on a file system without attributes has none, and
/// setting one there is ENOTSUP.
///
/// Opening for writing never blocks and does not wake a device: it is EPERM for anything but
/// regular files and folders, which alone can hold user attributes.
class LinuxExtendedAttributes final : public ExtendedAttributeStore {
 public:
  /// `roots` outlives the store.
  explicit LinuxExtendedAttributes(const MonitoredRoots& roots) : roots_(roots) {}

  Result<std::vector<std::string>> names(const URL& url) override;
  Result<std::size_t> size(std::string_view name, const URL& url) override;
  Result<Data> read(std::string_view name, const URL& url, std::size_t size) override;
  Result<std::unique_ptr<AttributeTarget>> open(const URL& url) override;

 private:
  const MonitoredRoots& roots_;
};

}  // namespace mirabel
