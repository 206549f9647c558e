#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/FileOperations.h"
#include "support/FakeCore.h"
#include "support/FakeReports.h"

namespace mirabel::testing {

/// The host's file operations on a volume in memory.
class FakeFileOperations final : public FileOperations {
 public:
  FakeFileOperations(FakeCore& core, FakeReports& reports) : core_(core), reports_(reports) {}

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

 private:
  void report(Result<URL> outcome, URLHandler completionHandler);
  Result<URL> imported(const URL& source, const URL& folder);
  Result<URL> created(const URL& folder, std::string_view name);
  Result<URL> moved(Op op, const URL& item, const URL& folder, std::string_view name,
                    Bouncing bouncing);
  std::optional<Error> deleted(const URL& item);
  [[nodiscard]] Result<void> checkFolder(const URL& folder) const;
  [[nodiscard]] bool isFree(const URL& place) const;
  [[nodiscard]] URL freePlace(const URL& folder, std::string_view name) const;

  FakeCore& core_;
  FakeReports& reports_;
};

}  // namespace mirabel::testing
