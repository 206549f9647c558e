#include "fs/FSDirectoryEnumerator.h"

#include <memory>
#include <string>
#include <utility>

#include "foundation/Log.h"

namespace mirabel {
namespace {

std::unexpected<Error> failAt(std::string_view step, const URL& directory, const Error& error) {
  logDebug([&] {
    return "can't " + std::string(step) + " directory at " + directory.path() + "; " +
           error.description();
  });
  return fail(error);
}

/// One run of a walker. The directories that are open, from the outermost to the one being read,
/// stand on a stack of their own: a deep tree must not end the process.
class Walk {
 public:
  Walk(const FSDirectoryEnumerator& walker, DirectoryStreams& directories,
       ResourceValueSource& resources, const FSDirectoryEnumerator::Visitor& visitor)
      : walker_(walker), directories_(directories), reader_(resources), visitor_(visitor) {}

  Result<std::uint64_t> run() {
    for (const URL& url : walker_.urls) {
      if (!goesOn_) break;
      if (auto opened = enter(url); !opened) return fail(opened.error());
      while (!levels_.empty()) {
        if (auto advanced = advance(); !advanced) return fail(advanced.error());
      }
    }
    return count_;
  }

 private:
  struct Level {
    URL url;
    std::unique_ptr<DirectoryStream> stream;
    EnumeratorOptions options;
  };

  [[nodiscard]] bool isPageFull() const {
    return count_ >= walker_.offset && count_ - walker_.offset >= walker_.limit;
  }

  [[nodiscard]] EnumeratorOptions optionsFor(const URL& directory) const {
    using Options = EnumeratorOptions;
    if (walker_.directoryEnumerationOptionsFor) {
      if (const auto options = walker_.directoryEnumerationOptionsFor(directory)) return *options;
    }
    constexpr Options visible{Options::skipsHiddenFiles, Options::skipsPackageDescendants};
    return walker_.recursively ? visible : visible.unionWith(Options::skipsSubdirectoryDescendants);
  }

  Result<void> enter(const URL& directory) {
    const EnumeratorOptions options = optionsFor(directory);
    auto stream = directories_.open(directory);
    if (!stream) return failAt("open", directory, stream.error());
    levels_.push_back({directory, *std::move(stream), options});
    return {};
  }

  Result<void> leave() {
    const Level level = std::move(levels_.back());
    levels_.pop_back();
    if (auto closed = level.stream->close(); !closed) {
      return failAt("close", level.url, closed.error());
    }
    return {};
  }

  /// One entry of the innermost directory, or its end.
  Result<void> advance() {
    const Level& level = levels_.back();
    const std::optional<DirectoryEntry> entry = level.stream->next();
    if (!entry) return leave();
    if (entry->name == "." || entry->name == "..") return {};
    const bool skipsHidden = level.options.contains(EnumeratorOptions::skipsHiddenFiles);
    if (skipsHidden && entry->name.starts_with('.')) return {};
    if (isPageFull()) {
      // Each level finds out for itself, on its next entry. Only where the outermost does so is
      // the whole walk over; one that was read to its end leaves the next directory its turn.
      if (levels_.size() == 1) goesOn_ = false;
      return leave();
    }
    return take(level.url.appendingPathComponent(entry->name), entry->kind, level.options);
  }

  Result<void> take(const URL& child, FileKind kind, EnumeratorOptions options) {
    const bool isVisited = count_ >= walker_.offset;
    if (++count_ == 0) fatalError("a directory walk counted more entries than there are numbers");
    if (isVisited) {
      if (auto visited = visitor_(child); !visited) return visited;
    }
    // A page that ends with a folder does not look into it: what is wrong there is for the next.
    if (kind != FileKind::folder || !descends(child, options) || isPageFull()) return {};
    return enter(child);
  }

  [[nodiscard]] bool descends(const URL& child, EnumeratorOptions options) const {
    using Options = EnumeratorOptions;
    constexpr Options nothing{Options::skipsPackageDescendants,
                              Options::skipsSubdirectoryDescendants};
    if (options.contains(nothing)) return false;
    const auto value = reader_.value(ResourceKey::isPackage, child);
    const bool* isPackage = value ? std::get_if<bool>(&*value) : nullptr;
    if (isPackage == nullptr) return false;
    return !options.contains(*isPackage ? Options::skipsPackageDescendants
                                        : Options::skipsSubdirectoryDescendants);
  }

  const FSDirectoryEnumerator& walker_;
  DirectoryStreams& directories_;
  ResourceReader reader_;
  const FSDirectoryEnumerator::Visitor& visitor_;
  std::vector<Level> levels_;
  std::uint64_t count_ = 0;
  bool goesOn_ = walker_.limit != 0;
};

}  // namespace

Result<std::uint64_t> FSDirectoryEnumerator::enumerate(DirectoryStreams& directories,
                                                       ResourceValueSource& resources,
                                                       const Visitor& visitor) const {
  return Walk(*this, directories, resources, visitor).run();
}

}  // namespace mirabel
