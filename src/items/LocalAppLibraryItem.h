#pragma once

#include <memory>

#include "items/LocalItem.h"

namespace mirabel {

/// The document folder of an installed application. Its identity, parent and name come from the
/// application registry; hidden entries of the folder are not counted as children.
class LocalAppLibraryItem : public LocalItem {
 public:
  /// Nothing, with an error line, for a proxy without a data container or whose folder cannot
  /// be made an item.
  static std::shared_ptr<LocalAppLibraryItem> create(const ItemContext& context,
                                                     const BundleProxy& proxy);

  bool vs_isContainer() const override { return true; }
  std::string description() const override;

 protected:
  using LocalItem::LocalItem;

 private:
  void leaveOutHiddenEntries();
};

}  // namespace mirabel
