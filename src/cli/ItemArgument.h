#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "cli/Session.h"

namespace mirabel {

/// How a person names an item: an identifier ("fid=…", "did=…", "#bundle"), one of the words
/// "root", "workingset" and "alldirs", or else a path ("./fid=3" is a path).
class ItemArgument {
 public:
  explicit ItemArgument(std::string text) : text_(std::move(text)) {}

  [[nodiscard]] bool isIdentifier() const;
  /// The identifier it stands for; of a path, that of the object there. Errors: the host's
  /// no-such-item error, and POSIX errors for a path that can't be resolved.
  [[nodiscard]] Result<std::string> identifier(const Session& session) const;
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> item(const Session& session) const;

  /// The URL of a path as a person writes it: relative to the working folder, the links on the
  /// way followed, the last component not.
  [[nodiscard]] static Result<URL> url(const std::string& path);

 private:
  std::string text_;
};

}  // namespace mirabel
