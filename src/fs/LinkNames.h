#pragma once

#include <optional>
#include <tuple>
#include <vector>

#include "fs/HiddenTest.h"
#include "fs/SharedURLs.h"
#include "items/LocalItem.h"

namespace mirabel {

/// The one answer to which of its names a file with hard links is shown under in a container; the
/// listing and the changes both ask it, so that they agree and the file is one item. Of the names
/// that a fresh listing would come by it is the one whose path is smallest, byte by byte; names
/// in the document storage come before those in other folders, and the trash after everything
/// else. Looks at the disk anew each time, but for the folders on the way to the names.
///
/// Used by one thread at a time, for one page or one batch of changes.
class LinkNames {
 public:
  /// What a listing of the container comes by.
  enum class Depth { children, everything };

  /// What is passed by reference outlives this. `hiddenTest` is that of `folders`.
  LinkNames(const ItemContext& context, const std::vector<URL>& folders, Depth depth,
            const HiddenTest& hiddenTest);

  /// Whether the object there has names besides this one. Reads it through the URL's cache; what
  /// cannot be read has none.
  [[nodiscard]] bool hasSeveral(const URL& url) const;
  /// Where the container shows the object that has names besides `url`; nothing when it does not.
  /// Errors: those of `FileObjects::pathsOfFileID`.
  [[nodiscard]] Result<std::optional<URL>> shownName(const URL& url);
  /// Whether a listing that comes by `entry`, which is not hidden, passes it over because the
  /// object is shown under another name.
  [[nodiscard]] Result<bool> isShownElsewhere(const URL& entry);

 private:
  /// Names are shown in the order of this.
  struct Rank {
    bool isInTrash;
    bool isOutsideStorage;
    friend auto operator<=>(const Rank&, const Rank&) = default;
  };
  [[nodiscard]] Result<std::vector<URL>> namesOf(const URL& url);
  [[nodiscard]] Rank rankOf(const URL& name) const;
  [[nodiscard]] bool isListed(const URL& name) const;

  ItemContext context_;
  std::vector<URL> folders_;  // canonical
  URL storage_;               // canonical
  Depth depth_;
  const HiddenTest& hiddenTest_;
  ResourceReader reader_;
  SharedURLs urls_;
};

}  // namespace mirabel
