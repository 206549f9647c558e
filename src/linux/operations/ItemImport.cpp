#include "linux/operations/ItemImport.h"

#include <cerrno>
#include <fcntl.h>

#include "linux/operations/TreeCopy.h"
#include "platform/FileOperations.h"

namespace mirabel {
namespace {

Result<void> canBeCopied(const OperationContext& context, const EntryPlace& source,
                         const OpenFolder& folder) {
  const auto status = context.calls.status(source.folder.get(), source.name);
  if (!status) return fail(status.error());
  if (status->kind != FileKind::folder) return {};
  const auto within = liesWithin(context, folder.descriptor.get(), *status);
  if (!within) return fail(within.error());
  if (*within) return fail(Error::posix(EINVAL, "a folder can't be copied into itself"));
  return {};
}

}  // namespace

Result<URL> importItem(const OperationContext& context, const URL& source, const URL& folder) {
  const std::string name(source.lastPathComponent());
  if (auto refusal = whyNoName(name)) return fail(*std::move(refusal));
  auto from = placeOf(context.roots, source);
  if (!from) return fail(from.error());
  auto target = openFolder(context, folder);
  if (!target) return fail(target.error());
  URL url = target->url(name);
  const int descriptor = target->descriptor.get();
  // Told before anything is copied; the rename makes sure.
  if (context.calls.status(descriptor, name)) return fail(fileExists(url));
  if (auto possible = canBeCopied(context, *from, *target); !possible)
    return fail(possible.error());
  auto copy = context.pending.temporaryName(target->path);
  if (!copy) return fail(copy.error());
  auto done = TreeCopy(context.calls, context.progress, CopyKind::copy)
                  .run(from->folder.get(), from->name, descriptor, copy->name);
  if (done) done = context.calls.rename(descriptor, copy->name, descriptor, name);
  if (!done) {
    removeTemporary(context, *target, *copy);
    return fail(operationError(done.error(), url));
  }
  if (auto synced = forgetTemporary(context, *target, *copy); !synced) return fail(synced.error());
  return url;
}

}  // namespace mirabel
