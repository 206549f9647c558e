#pragma once

#include "foundation/ExtendedAttributes.h"
#include "linux/files/ObjectLook.h"

namespace mirabel {

/// Extended attributes on Linux: "com.norvane.x" is kept as "user.com.norvane.x", and attributes
/// of other namespaces are not seen. What lies on a file system without attributes has none, and
/// setting one there is ENOTSUP; on anything but regular files and folders, which alone can hold
/// user attributes, it is EPERM.
///
/// The two attributes of the trash hold for everything that can be trashed. What a file does not
/// take itself (it may not be written, or is a symbolic link, or has no room left) is kept in the
/// volume's state under the same name, goes with the file wherever it is moved on its volume, and
/// is read back in the same way; nothing of the file is changed for it.
///
/// Opening for writing never blocks and does not wake a device.
class LinuxExtendedAttributes final : public ExtendedAttributeStore {
 public:
  explicit LinuxExtendedAttributes(const LookContext& context) : context_(context) {}

  Result<std::vector<std::string>> names(const URL& url) override;
  Result<std::size_t> size(std::string_view name, const URL& url) override;
  Result<Data> read(std::string_view name, const URL& url, std::size_t size) override;
  Result<std::unique_ptr<AttributeTarget>> open(const URL& url) override;

 private:
  [[nodiscard]] KeptAttributes::Attributes keptFor(const URL& url) const;

  LookContext context_;
};

/// Adds the names that are kept for an object to those that it has itself, and takes those away
/// that it is to have no longer.
void mergeNames(std::vector<std::string>& names, const KeptAttributes::Attributes& kept);

}  // namespace mirabel
