#include "linux/files/ObjectLook.h"

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

#include "foundation/URL.h"
#include "linux/files/PackageTypes.h"

namespace mirabel {
namespace {

// Beneath a root the parent is open already and need not be looked up again.
Result<Sighting> identify(VolumeIndex& index, const URL& url, const EntryPlace& place,
                          const ObjectStatus& status, bool isPackage) {
  if (place.name.empty()) return index.learnPath(url.path(), status, isPackage);
  Sighting sighting{place.name, status, isPackage};
  auto learned = index.learn(place.folderPath, place.folder.get(), {&sighting, 1});
  if (!learned) return fail(learned.error());
  if (sighting.fileID == 0) return fail(Error::posix(ESTALE));
  return sighting;
}

Result<ResourceValues> lookOnce(const LookContext& context, const URL& url) {
  const auto place = placeOf(context.roots, url);
  if (!place) return fail(place.error());
  const auto status = statusAt(place->folder.get(), place->name);
  if (!status) return fail(status.error());
  const std::string_view name = url.lastPathComponent();
  const bool isPackage = status->kind == FileKind::folder && PackageTypes::isPackageName(name);
  const auto sighting = identify(context.index, url, *place, *status, isPackage);
  if (!sighting) return fail(sighting.error());
  return valuesOf(context.types, name, *sighting, mayWrite(place->folder.get(), place->name));
}

}  // namespace

bool mayWrite(int folder, const std::string& name) {
  const int flags = AT_EACCESS | AT_SYMLINK_NOFOLLOW | (name.empty() ? AT_EMPTY_PATH : 0);
  return ::faccessat(folder, name.c_str(), W_OK, flags) == 0;
}

ResourceValues valuesOf(TypeTable& types, std::string_view name, const Sighting& sighting,
                        bool isWritable) {
  const ObjectStatus& status = sighting.status;
  ResourceValues values;
  values.kind = status.kind;
  values.isPackage = sighting.isPackage;
  values.isWritable = isWritable;
  values.fileID = sighting.fileID;
  values.documentID = sighting.documentID;
  // The kernel's own count of a folder's links means something else.
  if (status.kind != FileKind::folder) values.linkCount = status.linkCount;
  if (status.kind == FileKind::regular || status.kind == FileKind::symbolicLink) {
    values.size = status.size;
  }
  if (status.hasBirthTime) values.creationDate = dateFromNanoseconds(status.birthTime);
  values.contentModificationDate = dateFromNanoseconds(status.modificationTime);
  values.typeIdentifier = types.typeOf(name, status);
  return values;
}

Result<ResourceValues> lookAtObject(const LookContext& context, const URL& url) {
  // A name that changed hands while it was looked at is there all the same.
  constexpr int mostLooks = 8;
  for (int look = 1;; ++look) {
    auto values = lookOnce(context, url);
    if (values || !values.error().isPosix(ESTALE) || look == mostLooks) return values;
  }
}

}  // namespace mirabel
