#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/ExtendedAttributes.h"
#include "foundation/URL.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Whether an operation may choose another name where the wanted one is taken.
enum class Bouncing { refused, allowed };

/// What operations have not finished with may lie beside its place for a while, under a name that
/// begins like this. It is nobody's item.
inline constexpr std::string_view unfinishedNamePrefix = ".mirabel-";

/// Changes to the file system, as the host's operations on a file URL; the `vs_` operations take
/// the URL that they are asked of first. Any thread may call them.
///
/// Those with a handler report exactly once, on a thread of their own choosing that is not the
/// caller's, or at once on the caller's for what is refused before anything is touched. A handler
/// must not wait for another operation. When it is called with success, the change is on disk. A
/// failure leaves the item whole and in one place: the one where it was, or, where no more failed
/// than to have the change on disk, the one where it should be.
///
/// No name is ever replaced. Where the name is taken (and bouncing is refused), the error is
/// `FileErrorCode::fileExists`, with the URL of what is in the way (`vs_collidingURL`). A name that
/// is empty, ".", "..", or holds "/" or NUL is POSIX EINVAL, one that is too long ENAMETOOLONG.
/// Other errors are POSIX errors: ENOENT when the item or the folder is gone, ENOTDIR, EACCES,
/// EPERM, EROFS, ENOSPC, EIO.
class FileOperations {
 public:
  using URLHandler = std::function<void(Result<URL>)>;
  using ErrorHandler = std::function<void(std::optional<Error>)>;
  using AccessBlock = std::function<std::optional<Error>(AttributeTarget&)>;

  virtual ~FileOperations() = default;

  /// Creates the folder and what is missing above it; one that exists is no error. POSIX errors.
  [[nodiscard]] virtual Result<void> createDirectory(const URL& url) = 0;

  /// Copies the file or the whole folder at `source`, which may lie anywhere, into `folder` under
  /// its own name, with its contents, times, permissions and user attributes. The source stays.
  virtual void vs_importUnderFolder(const URL& source, const URL& folder,
                                    URLHandler completionHandler) = 0;
  /// Creates a folder in `folder`.
  virtual void vs_createSubFolder(const URL& folder, std::string_view name,
                                  URLHandler completionHandler) = 0;
  virtual void vs_renameWithNewName(const URL& item, std::string_view newName,
                                    URLHandler completionHandler) = 0;
  /// Moves the item into `folder`, under `newName` where one is given. With bouncing allowed the
  /// name is the wanted one where that is free, and else one made from it.
  virtual void vs_reparentUnderFolder(const URL& item, const URL& folder,
                                      std::optional<std::string> newName, Bouncing allowBouncing,
                                      URLHandler completionHandler) = 0;
  /// Moves the item into the trash folder `folder`, under its own name or one made from it.
  virtual void vs_trashUnderFolder(const URL& item, const URL& folder,
                                   URLHandler completionHandler) = 0;
  /// Removes the item, a folder with everything in it. It is gone for everybody at once: once the
  /// item's name is taken away, the removal is finished even across a crash.
  virtual void vs_deleteWithCompletionHandler(const URL& item, ErrorHandler completionHandler) = 0;

  /// Runs `block` with the file open so that its attributes can be written, and answers what that
  /// answers, or why the file could not be opened.
  [[nodiscard]] virtual std::optional<Error> vs_withReadWriteAccess(const URL& url,
                                                                    const AccessBlock& block) = 0;
};

/// What is in the way, where the error knows it.
[[nodiscard]] std::optional<URL> vs_collidingURL(const Error& error);
/// `FileErrorCode::fileExists` for what lies at `colliding`.
[[nodiscard]] Error fileExists(const URL& colliding);

}  // namespace mirabel
