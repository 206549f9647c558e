#include "linux/files/LinuxExtendedAttributes.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/xattr.h>

#include "linux/files/AttributeCalls.h"
#include "linux/files/EntryPlace.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

std::string kernelName(std::string_view name) {
  return std::string(userAttributePrefix).append(name);
}

class OpenFile final : public AttributeTarget {
 public:
  explicit OpenFile(UniqueFd file) : file_(std::move(file)) {}

  Result<void> set(std::string_view name, const Data& value) override {
    const std::string key = kernelName(name);
    if (::fsetxattr(file_.get(), key.c_str(), value.data(), value.size(), 0) != 0) {
      return fail(Error::posix(errno));
    }
    return {};
  }

  Result<void> remove(std::string_view name) override {
    if (::fremovexattr(file_.get(), kernelName(name).c_str()) == 0) return {};
    return fail(Error::posix(errno == ENOTSUP ? ENODATA : errno));
  }

 private:
  UniqueFd file_;
};

bool holdsUserAttributes(FileKind kind) {
  return kind == FileKind::regular || kind == FileKind::folder;
}

}  // namespace

Result<std::vector<std::string>> LinuxExtendedAttributes::names(const URL& url) {
  const auto place = placeOf(roots_, url);
  if (!place) return fail(place.error());
  std::vector<char> buffer;
  const auto list = listAttributes(place->folder.get(), place->name, buffer);
  if (!list) return fail(list.error());
  return userAttributeNames(*list);
}

Result<std::size_t> LinuxExtendedAttributes::size(std::string_view name, const URL& url) {
  const auto place = placeOf(roots_, url);
  if (!place) return fail(place.error());
  return attributeSize(place->folder.get(), place->name, kernelName(name));
}

Result<Data> LinuxExtendedAttributes::read(std::string_view name, const URL& url,
                                           std::size_t size) {
  const auto place = placeOf(roots_, url);
  if (!place) return fail(place.error());
  return readAttribute(place->folder.get(), place->name, kernelName(name), size);
}

Result<std::unique_ptr<AttributeTarget>> LinuxExtendedAttributes::open(const URL& url) {
  const auto place = placeOf(roots_, url);
  if (!place) return fail(place.error());
  // Looked at first: merely opening a device can set it off.
  const auto status = statusAt(place->folder.get(), place->name);
  if (!status) return fail(status.error());
  if (!holdsUserAttributes(status->kind)) return fail(Error::posix(EPERM));
  auto file = openPlace(*place, O_RDONLY);
  // Attributes ask for permission on the file, not on the descriptor: one that its owner may
  // write but not read takes them as well.
  if (!file && file.error().isPosix(EACCES) && status->kind == FileKind::regular) {
    file = openPlace(*place, O_WRONLY);
  }
  if (!file) return fail(file.error());
  // The name may have been given to something else since.
  const auto opened = statusAt(file->get(), "");
  if (!opened) return fail(opened.error());
  if (!holdsUserAttributes(opened->kind)) return fail(Error::posix(EPERM));
  return std::make_unique<OpenFile>(std::move(*file));
}

}  // namespace mirabel
