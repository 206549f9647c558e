#include "linux/files/LinuxDirectoryStreams.h"

#include <dirent.h>
#include <string>

#include "linux/files/FolderOpening.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

class Stream final : public DirectoryStream {
 public:
  explicit Stream(UniqueFd folder) : directory_(std::move(folder)) {}

  std::optional<DirectoryEntry> next() override {
    auto entry = directory_.next();
    if (!entry || !*entry) return std::nullopt;
    return DirectoryEntry{(*entry)->name, kindOf(**entry)};
  }

  Result<void> close() override { return directory_.close(); }

 private:
  // Some file systems leave the kind out of their directories.
  FileKind kindOf(const RawDirectory::Entry& entry) const {
    if (entry.type != DT_UNKNOWN) return kindOfDirectoryType(entry.type);
    const auto status = statusAt(directory_.descriptor(), std::string(entry.name));
    return status ? status->kind : FileKind::other;
  }

  RawDirectory directory_;
};

}  // namespace

Result<std::unique_ptr<DirectoryStream>> LinuxDirectoryStreams::open(const URL& folder) {
  auto opened = openFolderForReading(roots_, folder.path());
  if (!opened) return fail(opened.error());
  return std::make_unique<Stream>(std::move(opened->descriptor));
}

}  // namespace mirabel
