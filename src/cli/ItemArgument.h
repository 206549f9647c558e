#pragma once

#include <string>
#include <string_view>

#include "mirabel/Documents.h"

namespace mirabel {

/// How a person names an item: the word "root", an identifier, or else a path. What begins with
/// "fid=", "did=" or "#" and has no "/" in it is an identifier, so that "./fid=3" is a path. Errors
/// of the lookups: `LocalVesselError::invalidItemIdentifier` for an identifier that no form fits,
/// `itemNotFound` for a path outside the documents and the app libraries, and for an application
/// whose documents are no app library, the host's no-such-item error, POSIX and file errors for a
/// path that leads nowhere.
class ItemArgument {
 public:
  explicit ItemArgument(std::string text) : text_(std::move(text)) {}

  [[nodiscard]] bool isIdentifier() const;
  [[nodiscard]] Result<ItemRecord> item(Documents& documents) const;

  /// What lies at a path, whatever it is called: relative to the working folder, the links on the
  /// way followed, the last component not.
  [[nodiscard]] static Result<ItemRecord> itemAtPath(Documents& documents, const std::string& path);

  /// Where a path leads, inside the documents or outside, its links resolved but for the last
  /// component. POSIX errors.
  [[nodiscard]] static Result<std::string> resolvedPath(const std::string& path);

 private:
  [[nodiscard]] Result<ItemRecord> itemByIdentifier(Documents& documents) const;

  std::string text_;
};

}  // namespace mirabel
