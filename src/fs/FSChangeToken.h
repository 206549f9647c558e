#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "foundation/PropertyList.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Page cursor and sync anchor: on which volume and at which place of its event history an
/// enumeration stands. The bytes are a binary property list, a dictionary with the fields' names
/// as keys; opaque to the host. See docs/formats/change-token.md.
struct FSChangeToken {
  std::uint64_t version = 0;        ///< always written as 0
  UUID deviceUUID;                  ///< the history it belongs to
  std::uint64_t streamEventID = 0;  ///< changes up to this event have been delivered
  std::uint64_t offset = 0;         ///< entries passed in a paged walk
  std::uint64_t appLibraryVersionToken = 0;

  [[nodiscard]] Data encode() const;
  /// Nothing when there are no bytes, and, with an error line, for bytes that hold no token.
  [[nodiscard]] static std::optional<FSChangeToken> decode(
      const std::optional<std::span<const std::uint8_t>>& bytes);
  /// For log lines.
  [[nodiscard]] std::string description() const;

  friend bool operator==(const FSChangeToken&, const FSChangeToken&) = default;
};

}  // namespace mirabel
