#pragma once

#include "linux/files/ObjectLook.h"
#include "platform/FileObjects.h"

namespace mirabel {

/// Objects of the file system as the volume's index knows them. An object on another file system
/// than the first root's has that file system's number as its device.
class LinuxFileObjects final : public FileObjects {
 public:
  explicit LinuxFileObjects(const LookContext& context);

  /// A mount point opens as the root of what is mounted there.
  Result<std::unique_ptr<FileObject>> open(const URL& url) override;
  /// The link count is 1 for what is no folder.
  Result<FileStatus> status(const URL& url) override;
  Result<std::string> pathOfFileID(DeviceID device, std::uint64_t fileID) override;
  Result<std::vector<std::string>> pathsOfFileID(DeviceID device, std::uint64_t fileID) override;

 private:
  [[nodiscard]] Result<std::uint16_t> linkCountOfFolder(const URL& url) const;

  LookContext context_;
  std::uint64_t volume_;  // st_dev of the volume
};

}  // namespace mirabel
