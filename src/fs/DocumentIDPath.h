#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace mirabel {

/// What the path of a document record says: the document moved from one object to another.
/// Its form is "/.docid/$dev/changed/$docid/src=$src,dst=$dst", where leading slashes and the
/// device may be missing.
struct DocumentIDPath {
  std::int64_t documentID = 0;
  std::int64_t sourceFileID = 0;
  std::int64_t destinationFileID = 0;  ///< 0: the document is gone

  /// Nothing for anything but exactly that form, and for numbers that need more than 64 bits.
  [[nodiscard]] static std::optional<DocumentIDPath> parse(std::string_view path);

  friend bool operator==(const DocumentIDPath&, const DocumentIDPath&) = default;
};

}  // namespace mirabel
