#include "support/FakeVolume.h"

#include <algorithm>
#include <cerrno>
#include <functional>
#include <stdexcept>

namespace mirabel::testing {
namespace {

using Entry = std::pair<std::string, std::shared_ptr<FakeNode>>;

struct Split {
  std::string_view parent;
  std::string_view name;
};

Split split(std::string_view path) {
  const std::size_t slash = path.rfind('/');
  return {slash == 0 ? "/" : path.substr(0, slash), path.substr(slash + 1)};
}

std::vector<Entry>::iterator entryNamed(FakeNode& folder, std::string_view name) {
  return std::ranges::find(folder.entries, name, &Entry::first);
}

std::string typeOf(const FakeNode& node, std::string_view name) {
  switch (node.kind) {
    case FileKind::symbolicLink:
      return "inode/symlink";
    case FileKind::other:
      return "inode/fifo";
    case FileKind::regular:
      return name.ends_with(".txt") ? "text/plain" : "application/octet-stream";
    case FileKind::folder:
      break;
  }
  if (name.ends_with(".quill")) return "com.norvane.quillsuite.document";
  if (name.ends_with(".lumen")) return "com.norvane.lumenbeat.song";
  if (name.ends_with(".bundle")) return "com.norvane.package";
  return "inode/directory";
}

using Visitor = std::function<bool(const FakeNode&, const std::string& path)>;

/// Whether `isIt` holds for something below `folder`; nothing after that is visited. Depth first.
bool search(const FakeNode& folder, const std::string& path, const Visitor& isIt) {
  return std::ranges::any_of(folder.entries, [&](const Entry& entry) {
    const std::string place = path + "/" + entry.first;
    return isIt(*entry.second, place) || search(*entry.second, place, isIt);
  });
}

void loseName(FakeNode& node) {
  --node.names;
  for (const auto& [name, child] : node.entries)
    loseName(*child);
}

void gainName(FakeNode& node) {
  ++node.names;
  for (const auto& [name, child] : node.entries)
    gainName(*child);
}

}  // namespace

FakeVolume::FakeVolume() : root_(std::make_shared<FakeNode>()) {
  root_->kind = FileKind::folder;
  root_->fileID = 2;
  root_->names = 1;
}

FakeNode& FakeVolume::makeFolder(std::string_view path) {
  if (auto existing = find(path)) return **existing;
  makeFolder(split(path).parent);
  return add(path, FileKind::folder);
}

FakeNode& FakeVolume::writeFile(std::string_view path, std::string_view contents) {
  auto existing = find(path);
  FakeNode& node = existing ? **existing : add(path, FileKind::regular);
  node.contents = dataFromString(contents);
  return node;
}

FakeNode& FakeVolume::makeSymlink(std::string_view path, std::string_view target) {
  FakeNode& node = add(path, FileKind::symbolicLink);
  node.contents = dataFromString(target);
  return node;
}

FakeNode& FakeVolume::makeFifo(std::string_view path) {
  return add(path, FileKind::other);
}

void FakeVolume::link(std::string_view existing, std::string_view added) {
  enter(added, *find(existing));
}

void FakeVolume::rename(std::string_view from, std::string_view to) {
  const std::shared_ptr<FakeNode> node = find(from).value();
  const auto replaced = find(to);
  const bool isSave = replaced && (*replaced)->kind == FileKind::regular &&
                      node->kind == FileKind::regular && (*replaced)->documentID != 0;
  if (isSave) node->documentID = (*replaced)->documentID;
  if (replaced) remove(to);
  remove(from);
  enter(to, node);
}

void FakeVolume::remove(std::string_view path) {
  FakeNode& folder = at(split(path).parent);
  const auto entry = entryNamed(folder, split(path).name);
  loseName(*entry->second);
  folder.entries.erase(entry);
}

void FakeVolume::copy(std::string_view from, std::string_view to) {
  enter(to, copyOf(at(from)));
}

std::shared_ptr<FakeNode> FakeVolume::copyOf(const FakeNode& original) {
  auto node = std::make_shared<FakeNode>(original);
  node->fileID = nextFileID_++;
  node->documentID = 0;
  node->names = 0;
  for (auto& [name, child] : node->entries)
    child = copyOf(*child);
  return node;
}

FakeNode& FakeVolume::at(std::string_view path) {
  const auto node = find(path);
  if (!node) throw std::logic_error("the test uses a path that is not there: " + std::string(path));
  return **node;
}

Result<std::shared_ptr<FakeNode>> FakeVolume::find(std::string_view path) const {
  std::shared_ptr<FakeNode> node = root_;
  while (!path.empty() && path != "/") {
    if (node->kind == FileKind::symbolicLink) return fail(Error::posix(ELOOP));
    if (node->kind != FileKind::folder) return fail(Error::posix(ENOTDIR));
    path.remove_prefix(1);
    const std::string_view name = path.substr(0, path.find('/'));
    const auto entry = entryNamed(*node, name);
    if (entry == node->entries.end()) return fail(Error::posix(ENOENT));
    node = std::shared_ptr<FakeNode>(entry->second);
    path.remove_prefix(name.size());
  }
  return node;
}

std::vector<std::string> FakeVolume::pathsOfFileID(std::uint64_t fileID) const {
  std::vector<std::string> paths;
  search(*root_, "", [&](const FakeNode& node, const std::string& path) {
    if (node.fileID == fileID) paths.push_back(path);
    return false;
  });
  return paths;
}

std::uint64_t FakeVolume::fileIDOfDocument(std::uint64_t documentID) const {
  if (documentID == 0) return 0;
  std::uint64_t fileID = 0;
  const bool isFound = search(*root_, "", [&](const FakeNode& node, const std::string&) {
    fileID = node.fileID;
    return node.documentID == documentID;
  });
  return isFound ? fileID : 0;
}

std::uint32_t FakeVolume::documentIDOf(FakeNode& node) {
  if (node.documentID == 0) node.documentID = nextDocumentID_++;
  return node.documentID;
}

ResourceValues FakeVolume::values(const FakeNode& node, std::string_view name) {
  ResourceValues values;
  values.kind = node.kind;
  values.isPackage = isPackage(node, name);
  values.isWritable = node.isWritable;
  values.fileID = node.fileID;
  values.documentID = node.documentID;
  values.linkCount = node.names;
  values.size = node.contents.size();
  values.creationDate = node.created;
  values.contentModificationDate = node.modified;
  values.typeIdentifier = typeOf(node, name);
  return values;
}

bool FakeVolume::isPackage(const FakeNode& node, std::string_view name) {
  return node.kind == FileKind::folder && typeOf(node, name) != "inode/directory";
}

FakeNode& FakeVolume::add(std::string_view path, FileKind kind) {
  auto node = std::make_shared<FakeNode>();
  node->kind = kind;
  node->fileID = nextFileID_++;
  enter(path, node);
  return *node;
}

void FakeVolume::enter(std::string_view path, std::shared_ptr<FakeNode> node) {
  gainName(*node);
  node->place = nextPlace_++;
  at(split(path).parent).entries.emplace_back(split(path).name, std::move(node));
}

}  // namespace mirabel::testing
