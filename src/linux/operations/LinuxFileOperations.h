#pragma once

#include <functional>
#include <string_view>

#include "foundation/ExtendedAttributes.h"
#include "linux/operations/OperationContext.h"
#include "linux/operations/OperationQueue.h"
#include "platform/FileOperations.h"

namespace mirabel {

/// The host's operations on Linux. They run on a few borrowed threads; an item is reached beneath
/// its root, on descriptors, and no symbolic link on the way is followed. What is made gets the
/// permissions that the process's umask leaves.
///
/// Copies and folders that are being removed have a hidden name next to where they belong, which
/// begins with ".mirabel-"; when the process is killed, the next one clears them away.
class LinuxFileOperations final : public FileOperations {
 public:
  struct Options {
    /// Whether a folder of that name is one document to people: its suffix stays when another name
    /// is made from it.
    std::function<bool(std::string_view name)> isPackageName;
    /// See `FileCalls`.
    FileCalls::Check check = {};
  };
  /// Clears away what earlier processes left. All of the references outlive it.
  LinuxFileOperations(const MonitoredRoots& roots, VolumeIndex& index,
                      ExtendedAttributeStore& attributes, Options options);
  /// Waits for what was asked for.
  ~LinuxFileOperations() override;

  Result<void> createDirectory(const URL& url) override;
  void vs_importUnderFolder(const URL& source, const URL& folder,
                            URLHandler completionHandler) override;
  void vs_createSubFolder(const URL& folder, std::string_view name,
                          URLHandler completionHandler) override;
  void vs_renameWithNewName(const URL& item, std::string_view newName,
                            URLHandler completionHandler) override;
  void vs_reparentUnderFolder(const URL& item, const URL& folder,
                              std::optional<std::string> newName, Bouncing allowBouncing,
                              URLHandler completionHandler) override;
  void vs_trashUnderFolder(const URL& item, const URL& folder,
                           URLHandler completionHandler) override;
  void vs_deleteWithCompletionHandler(const URL& item, ErrorHandler completionHandler) override;
  std::optional<Error> vs_withReadWriteAccess(const URL& url, const AccessBlock& block) override;

  [[nodiscard]] const OperationProgress& progress() const { return progress_; }

 private:
  const MonitoredRoots& roots_;
  ExtendedAttributeStore& attributes_;
  FileCalls calls_;
  PendingWork pending_;
  OperationProgress progress_;
  OperationContext context_;
  OperationQueue queue_;
};

}  // namespace mirabel
