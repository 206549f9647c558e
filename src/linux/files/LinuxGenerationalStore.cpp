#include "linux/files/LinuxGenerationalStore.h"

#include <cerrno>
#include <limits>

namespace mirabel {

Result<std::uint32_t> LinuxGenerationalStore::permanentStorage(FileObject& object) {
  const auto attributes = object.attributes();
  if (!attributes) return fail(attributes.error());
  if (attributes->documentID == 0) return fail(Error::posix(EINVAL));
  return attributes->documentID;
}

Result<std::uint32_t> LinuxGenerationalStore::permanentStorageForItemAtURL(const URL& url,
                                                                           Allocation allocation) {
  // Whoever has read that URL has had the index learn of it: there is no more to learn.
  auto values = allocation == Allocation::never ? url.resources().snapshot() : std::nullopt;
  if (!values) {
    auto looked = lookAtObject(context_, url);
    if (!looked) return fail(looked.error());
    values = std::move(*looked);
  }
  if (values->documentID == 0 && allocation == Allocation::ifNone) {
    return fail(Error::posix(EINVAL));
  }
  return values->documentID;
}

Result<std::uint64_t> LinuxGenerationalStore::fileIDOfDocument(DeviceID device,
                                                               std::int64_t documentID) {
  constexpr std::int64_t greatest = std::numeric_limits<std::uint32_t>::max();
  if (device != context_.index.device() || documentID < 1 || documentID > greatest) {
    return fail(Error::posix(ENOENT));
  }
  return context_.index.fileIDOfDocument(static_cast<std::uint32_t>(documentID));
}

}  // namespace mirabel
