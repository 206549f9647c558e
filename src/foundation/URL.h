#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/ResourceValues.h"
#include "mirabel/Error.h"

namespace mirabel {

/// What has been read of one file so far. Shared by all copies of a URL; thread-safe. It does not
/// notice that the file changes: whoever changes a file clears it, and whoever wants to see the
/// changes of others starts from a fresh URL.
class ResourceCache {
 public:
  /// What is known of `key`: nothing before somebody has read the file, an absent value when the
  /// file has none. `name` is the answer to `ResourceKey::name`.
  [[nodiscard]] std::optional<ResourceValue> value(ResourceKey key, std::string_view name) const;
  [[nodiscard]] bool isFilled() const;
  void fill(ResourceValues values);
  /// Overrides one key until `clear`.
  void set(ResourceKey key, ResourceValue value);
  /// Whether the extended attribute is there, once the names are known. Names come without the
  /// platform's own prefix.
  [[nodiscard]] std::optional<bool> hasAttribute(std::string_view name) const;
  void setAttributeNames(std::vector<std::string> names);
  /// All values, once read, with file and document identifiers that were `set` since.
  [[nodiscard]] std::optional<ResourceValues> snapshot() const;
  void clear();

 private:
  mutable std::mutex mutex_;
  std::optional<ResourceValues> values_;
  std::optional<std::vector<std::string>> attributeNames_;
  std::unique_ptr<std::map<ResourceKey, ResourceValue>> overrides_;
};

/// The place of a file, or some other resource locator that is not a file. A value: copying is
/// cheap, and copies share the resource cache. The path is bytes, not text; it is absolute, holds
/// no empty components and no trailing "/" (but for the root itself), and "." and ".." are kept
/// as they are. A URL made by appending a component keeps its parent alive, so that asking for
/// the parent gives back the same URL with its cache (in trees of ordinary depth).
class URL {
 public:
  /// The file at an absolute path. Repeated and trailing slashes are dropped. A path that is not
  /// absolute or holds a NUL byte cannot name a file: the URL's path is then empty, and stays so
  /// when components are appended.
  static URL fileURL(std::string_view path);
  /// Any text; one without the scheme "file", or of another host than this one, is not a file URL
  /// and has an empty path. Percent escapes of a file URL are decoded, its query and fragment
  /// dropped.
  static URL fromString(std::string_view text);

  [[nodiscard]] bool isFileURL() const { return node_->isFile; }
  [[nodiscard]] const std::string& path() const { return node_->path; }
  /// The last component; "/" for the root, empty for an empty path. Valid as long as a copy of
  /// the URL lives.
  [[nodiscard]] std::string_view lastPathComponent() const;
  /// "/" first, then each component. Views into `path()`.
  [[nodiscard]] std::vector<std::string_view> pathComponents() const;
  /// A component that holds slashes appends each of its parts; an empty one changes nothing.
  [[nodiscard]] URL appendingPathComponent(std::string_view component) const;
  /// The root's parent is the root.
  [[nodiscard]] URL deletingLastPathComponent() const;
  /// The form in which paths are compared: "/var…" reads as "/private/var…".
  [[nodiscard]] URL properURL() const;

  /// "file:///…" with every byte outside the unreserved ASCII characters percent-encoded; the
  /// text itself for other URLs.
  [[nodiscard]] std::string description() const;

  [[nodiscard]] ResourceCache& resources() const { return node_->cache; }
  /// Whether both are copies of one URL, cache included.
  [[nodiscard]] bool isSameObject(const URL& other) const { return node_ == other.node_; }
  /// By place; caches do not count.
  friend bool operator==(const URL& a, const URL& b) {
    return a.node_ == b.node_ || (a.node_->isFile == b.node_->isFile &&
                                  a.node_->path == b.node_->path && a.node_->text == b.node_->text);
  }

 private:
  struct Node {
    std::string path;  // file URLs
    std::string text;  // other URLs
    bool isFile = true;
    unsigned chainLength = 0;  // number of nodes that `parent` keeps alive
    std::shared_ptr<Node> parent;
    ResourceCache cache;
  };
  explicit URL(std::shared_ptr<Node> node) : node_(std::move(node)) {}
  static URL ofNormalizedPath(std::string path);
  std::shared_ptr<Node> node_;
};

/// Whether the path has a component "Documents" directly followed by ".Trash".
[[nodiscard]] bool isInTrash(const URL& url);

}  // namespace mirabel
