#include "linux/files/LinuxFileObjects.h"

#include <cerrno>
#include <fcntl.h>
#include <limits>

#include "foundation/LookFailure.h"
#include "foundation/URL.h"
#include "linux/files/FolderOpening.h"
#include "linux/files/PackageTypes.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

constexpr std::uint16_t linksOfEmptyFolder = 2;
constexpr std::uint16_t mostLinks = std::numeric_limits<std::uint16_t>::max();

class OpenObject final : public FileObject {
 public:
  OpenObject(VolumeIndex& index, std::uint64_t volume, const URL& url, UniqueFd object)
      : index_(index), volume_(volume), url_(url), object_(std::move(object)) {}

  Result<DeviceID> device() override {
    const auto status = statusAt(object_.get(), "");
    if (!status) return fail(status.error());
    return status->device == volume_ ? index_.device() : static_cast<DeviceID>(status->device);
  }

  Result<ObjectAttributes> attributes() override {
    const auto status = statusAt(object_.get(), "");
    if (!status) return fail(status.error());
    const bool isPackage =
        status->kind == FileKind::folder && PackageTypes::isPackageName(url_.lastPathComponent());
    const auto sighting = index_.learnPath(url_.path(), *status, isPackage);
    if (!sighting) return fail(sighting.error());
    // What has the name by now is told of, not half of each.
    return ObjectAttributes{sighting->status.kind, sighting->documentID, sighting->fileID};
  }

 private:
  VolumeIndex& index_;
  std::uint64_t volume_;
  URL url_;
  UniqueFd object_;
};

}  // namespace

LinuxFileObjects::LinuxFileObjects(const LookContext& context)
    : context_(context), volume_(context.roots.volume().value_or(context.index.device())) {}

Result<std::unique_ptr<FileObject>> LinuxFileObjects::open(const URL& url) {
  auto place = placeOf(context_.roots, url);
  if (!place) return fail(place.error());
  auto object =
      place->name.empty() ? Result<UniqueFd>(std::move(place->folder)) : openPlace(*place, O_PATH);
  if (!object) return fail(object.error());
  return std::make_unique<OpenObject>(context_.index, volume_, url, std::move(*object));
}

Result<FileStatus> LinuxFileObjects::status(const URL& url) {
  auto values = url.resources().snapshot();
  if (!values) {
    auto looked = lookAtObject(context_, url);
    if (!looked) return fail(looked.error());
    values = std::move(*looked);
  }
  if (values->kind != FileKind::folder) return FileStatus{values->fileID, 1};
  const auto links = linkCountOfFolder(url);
  if (!links) return fail(links.error());
  return FileStatus{values->fileID, *links};
}

Result<std::string> LinuxFileObjects::pathOfFileID(DeviceID device, std::uint64_t fileID) {
  if (device != context_.index.device()) return fail(Error::posix(ENOENT));
  return context_.index.pathOfFileID(fileID);
}

Result<std::vector<std::string>> LinuxFileObjects::pathsOfFileID(DeviceID device,
                                                                 std::uint64_t fileID) {
  if (device != context_.index.device()) return std::vector<std::string>();
  return context_.index.pathsOfFileID(fileID);
}

// The kernel's own count of a folder's links tells the folders in it on some file systems and
// nothing on others, so the entries are counted, as far as the answer can count. What can't be
// counted for the moment is no empty folder.
Result<std::uint16_t> LinuxFileObjects::linkCountOfFolder(const URL& url) const {
  auto opened = openFolderForReading(context_.roots, url.path());
  if (!opened && lookFailure(opened.error()) == LookFailure::closed) return linksOfEmptyFolder;
  if (!opened) return fail(opened.error());
  RawDirectory directory(std::move(opened->descriptor));
  std::uint16_t links = linksOfEmptyFolder;
  while (links < mostLinks) {
    auto entry = directory.next();
    if (!entry) return fail(entry.error());
    if (!*entry) break;
    const std::string_view name = (*entry)->name;
    if (name != "." && name != "..") ++links;
  }
  return links;
}

}  // namespace mirabel
