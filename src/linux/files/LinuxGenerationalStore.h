#pragma once

#include "linux/files/ObjectLook.h"
#include "platform/GenerationalStore.h"

namespace mirabel {

/// Document IDs from the volume's index, which gives one to every document that it meets. What is
/// no document (a plain folder, a symbolic link, a special file) has none: EINVAL when one is to
/// be allocated for it.
class LinuxGenerationalStore final : public GenerationalStore {
 public:
  explicit LinuxGenerationalStore(const LookContext& context) : context_(context) {}

  Result<std::uint32_t> permanentStorage(FileObject& object) override;
  Result<std::uint32_t> permanentStorageForItemAtURL(const URL& url,
                                                     Allocation allocation) override;
  /// ENOENT too for another volume, and for a number that no document can have.
  Result<std::uint64_t> fileIDOfDocument(DeviceID device, std::int64_t documentID) override;

 private:
  LookContext context_;
};

}  // namespace mirabel
