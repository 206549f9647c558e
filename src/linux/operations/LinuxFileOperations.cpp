#include "linux/operations/LinuxFileOperations.h"

#include <utility>

#include "linux/operations/FolderCreation.h"
#include "linux/operations/ItemImport.h"
#include "linux/operations/ItemMove.h"
#include "linux/operations/ItemRemoval.h"
#include "linux/operations/Recovery.h"

namespace mirabel {
namespace {

// They wait for the disk most of the time, and what one of them has synchronised is done for all.
constexpr std::size_t mostAtOnce = 4;
constexpr mode_t folderPermissions = 0777;

Result<URL> createSubFolder(const OperationContext& context, const URL& parent,
                            const std::string& name) {
  if (auto refusal = whyNoName(name)) return fail(*std::move(refusal));
  auto folder = openFolder(context, parent);
  if (!folder) return fail(folder.error());
  URL url = folder->url(name);
  const int descriptor = folder->descriptor.get();
  auto made = context.calls.makeFolder(descriptor, name, folderPermissions);
  if (!made) return fail(operationError(made.error(), url));
  if (auto synced = syncFolder(context, descriptor); !synced) return fail(synced.error());
  return url;
}

}  // namespace

LinuxFileOperations::LinuxFileOperations(const MonitoredRoots& roots, VolumeIndex& index,
                                         ExtendedAttributeStore& attributes, Options options)
    : roots_(roots),
      attributes_(attributes),
      calls_(std::move(options.check)),
      pending_(index, calls_),
      context_{roots, calls_, pending_, progress_, std::move(options.isPackageName)},
      queue_(mostAtOnce) {
  recoverOperations(context_, index);
}

LinuxFileOperations::~LinuxFileOperations() {
  queue_.drain();
  pending_.close();
}

Result<void> LinuxFileOperations::createDirectory(const URL& url) {
  return createFolder(roots_, url);
}

void LinuxFileOperations::vs_importUnderFolder(const URL& source, const URL& folder,
                                               URLHandler completionHandler) {
  queue_.add([=, this, done = std::move(completionHandler)] {
    done(importItem(context_, source, folder));
  });
}

void LinuxFileOperations::vs_createSubFolder(const URL& folder, std::string_view name,
                                             URLHandler completionHandler) {
  queue_.add([=, this, name = std::string(name), done = std::move(completionHandler)] {
    done(createSubFolder(context_, folder, name));
  });
}

void LinuxFileOperations::vs_renameWithNewName(const URL& item, std::string_view newName,
                                               URLHandler completionHandler) {
  queue_.add([=, this, name = std::string(newName), done = std::move(completionHandler)] {
    done(ItemMove(context_).rename(item, name));
  });
}

void LinuxFileOperations::vs_reparentUnderFolder(const URL& item, const URL& folder,
                                                 std::optional<std::string> newName,
                                                 Bouncing allowBouncing,
                                                 URLHandler completionHandler) {
  queue_.add([=, this, name = std::move(newName), done = std::move(completionHandler)] {
    done(ItemMove(context_).moveUnder(item, folder, name, allowBouncing));
  });
}

void LinuxFileOperations::vs_trashUnderFolder(const URL& item, const URL& folder,
                                              URLHandler completionHandler) {
  vs_reparentUnderFolder(item, folder, {}, Bouncing::allowed, std::move(completionHandler));
}

void LinuxFileOperations::vs_deleteWithCompletionHandler(const URL& item,
                                                         ErrorHandler completionHandler) {
  queue_.add([=, this, done = std::move(completionHandler)] {
    auto removed = removeItem(context_, item);
    done(removed ? std::nullopt : std::optional(std::move(removed.error())));
  });
}

std::optional<Error> LinuxFileOperations::vs_withReadWriteAccess(const URL& url,
                                                                 const AccessBlock& block) {
  auto target = attributes_.open(url);
  return target ? block(**target) : std::optional(target.error());
}

}  // namespace mirabel
