#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "mirabel/Values.h"

namespace mirabel {

/// Where a walk of directories stands, in a form that another process can take up. The bytes are a
/// binary property list; see docs/formats/listing-positions.md.
struct WalkPosition {
  struct Folder {
    std::string name;            ///< of the first its path, of the others the last component
    std::uint64_t fileID = 0;    ///< what lay there
    std::uint64_t position = 0;  ///< what `DirectoryStream::position` told

    friend bool operator==(const Folder&, const Folder&) = default;
  };

  std::uint64_t plan = 0;       ///< digest of the directories to walk
  std::uint64_t nextRoot = 0;   ///< of these, how many were begun
  std::vector<Folder> folders;  ///< that stand open, from the outermost
  /// Name of the entry handed out last when it may have to be entered, in the innermost folder.
  std::optional<std::string> descent;

  [[nodiscard]] Data encode() const;
  /// Nothing for bytes that hold no position.
  [[nodiscard]] static std::optional<WalkPosition> decode(std::span<const std::uint8_t> bytes);

  friend bool operator==(const WalkPosition&, const WalkPosition&) = default;
};

}  // namespace mirabel
