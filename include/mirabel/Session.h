#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "mirabel/Documents.h"
#include "mirabel/Error.h"
#include "mirabel/Export.h"

namespace mirabel {

struct SessionOptions {
  /// The home folder. Absent: $HOME, or else what the user database says, and the XDG variables
  /// count. Given: everything hangs below it, and they don't.
  std::optional<std::string> home{};
  /// How long to wait for another process, or another `Documents` of this one, that holds the
  /// volume.
  std::chrono::milliseconds timeout{30'000};
  bool embedded = false;  ///< do without the service, even where it runs
  /// Told, during the call, what a person should know: that it has to wait for another process,
  /// that a damaged database was set aside.
  std::function<void(std::string_view)> notice{};
};

/// The documents of one home: through the service, if it runs for that home, or else through a
/// provider inside this process, which is then the only one that has them until they are let go. A
/// service that is not running is not started. Makes nothing but the folder of the volume's state,
/// and the list of app libraries where there are any. Errors, with a detail for people:
/// - POSIX EBUSY: another process held the volume to the end of the timeout;
/// - ENOENT, ENOTDIR: there is no such home, or its documents are no folder;
/// - EINVAL, EPERM: a layout that can't be served, a state folder that is somebody else's;
/// - other POSIX errors, and `ErrorDomain::store` for a database that can't be opened.
[[nodiscard]] MIRABEL_EXPORT Result<std::unique_ptr<Documents>> openDocuments(
    SessionOptions options);

}  // namespace mirabel
