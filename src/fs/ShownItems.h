#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "fs/HiddenTest.h"
#include "fs/ItemLook.h"
#include "fs/LinkNames.h"
#include "identity/AppLibraryRoots.h"

namespace mirabel {

/// What listings show now, of one container and of everything else, and under which name. Asked
/// anew each time, so that the changes that are told are those that a fresh listing would show.
///
/// Used by one thread at a time, for one batch of changes.
class ShownItems {
 public:
  /// `folders` are those of the container, at least one; with `Depth::children` it is the first
  /// whose entries a listing of it shows. What is passed by reference outlives this.
  ShownItems(const ItemContext& context, const AppLibraryRoots& roots,
             const std::vector<URL>& folders, LinkNames::Depth depth);

  /// The item if a listing of the container, or of any other, shows it; null when none does.
  /// Errors: those of `FileObjectURLs::findItem`, `ItemLook::at` and `FileObjects::pathsOfFileID`,
  /// as with all of these.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> ofIdentifier(const std::string& identifier);
  /// The item under the name that it is shown under; null when it is shown nowhere.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> asShown(const std::shared_ptr<LocalItem>& item);
  /// What lies at `url`, shown or not; see `ItemLook::at`.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> at(const URL& url) const {
    return look_.at(url);
  }

  /// Whether a listing, of whichever container, comes by `url`.
  [[nodiscard]] bool isInSight(const URL& url) const;
  /// Whether `url` lies in the folders of the container.
  [[nodiscard]] bool isOfContainer(const URL& url) const;

 private:
  /// Where the object at `url` is shown: under its name in the container, or else under the one
  /// that it has anywhere in sight. Nothing when it is shown nowhere.
  [[nodiscard]] Result<std::optional<URL>> placeOf(const URL& url);

  ItemContext context_;
  HiddenTest containerSight_;
  HiddenTest everywhereSight_;
  ItemLook look_;
  LinkNames containerNames_;
  LinkNames everywhereNames_;
};

}  // namespace mirabel
