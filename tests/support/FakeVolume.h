#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "foundation/ResourceValues.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel::testing {

/// One object of the volume; hard links share it. Tests may turn every field.
struct FakeNode {
  FileKind kind = FileKind::regular;
  std::uint64_t fileID = 0;
  std::uint32_t documentID = 0;
  std::uint32_t names = 0;  ///< hard links; kept by the volume
  std::uint64_t place = 0;  ///< of its newest name among the entries of the folder; only grows
  Data contents;
  Date created{1'700'000'000, 0};
  Date modified{1'700'000'100, 500'000'000};
  bool isWritable = true;
  std::map<std::string, Data, std::less<>> attributes;
  /// Stands in for the number of entries + 2.
  std::optional<std::uint16_t> linkCount;
  /// A folder's entries in the order in which they are read.
  std::vector<std::pair<std::string, std::shared_ptr<FakeNode>>> entries;
};

/// A tree of objects in memory. Paths are absolute. File IDs and document IDs are never given
/// twice. Not thread-safe; `FakePlatform` locks around it.
class FakeVolume {
 public:
  FakeVolume();

  /// Folders that are missing on the way are made.
  FakeNode& makeFolder(std::string_view path);
  /// Replaces the contents of a file that exists.
  FakeNode& writeFile(std::string_view path, std::string_view contents = {});
  FakeNode& makeSymlink(std::string_view path, std::string_view target);
  FakeNode& makeFifo(std::string_view path);
  void link(std::string_view existing, std::string_view added);
  /// Replaces what is at `to`; a document's ID passes to the file that takes its name.
  void rename(std::string_view from, std::string_view to);
  /// With everything below it.
  void remove(std::string_view path);
  /// Enters a copy of the object, with everything below it, under new file IDs and without
  /// document IDs. `to` must be free.
  void copy(std::string_view from, std::string_view to);

  /// The object at `path`, which must exist.
  [[nodiscard]] FakeNode& at(std::string_view path);
  /// ENOENT, ELOOP for a symbolic link on the way, ENOTDIR for another non-folder on the way.
  [[nodiscard]] Result<std::shared_ptr<FakeNode>> find(std::string_view path) const;
  /// Depth first, in the order in which entries are read.
  [[nodiscard]] std::vector<std::string> pathsOfFileID(std::uint64_t fileID) const;
  /// 0 for none.
  [[nodiscard]] std::uint64_t fileIDOfDocument(std::uint64_t documentID) const;
  [[nodiscard]] std::uint32_t documentIDOf(FakeNode& node);

  [[nodiscard]] static ResourceValues values(const FakeNode& node, std::string_view name);
  /// Folders with the suffixes .quill and .lumen are packages of the two document suites, .bundle
  /// is one of no suite.
  [[nodiscard]] static bool isPackage(const FakeNode& node, std::string_view name);

 private:
  FakeNode& add(std::string_view path, FileKind kind);
  std::shared_ptr<FakeNode> copyOf(const FakeNode& original);
  void enter(std::string_view path, std::shared_ptr<FakeNode> node);

  std::shared_ptr<FakeNode> root_;
  std::uint64_t nextFileID_ = 100;
  std::uint64_t nextPlace_ = 2;
  std::uint32_t nextDocumentID_ = 1;
};

}  // namespace mirabel::testing
