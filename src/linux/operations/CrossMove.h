#pragma once

#include <string>

#include "linux/operations/OperationContext.h"

namespace mirabel {

/// Moves an item to a place where a rename can't bring it: another file system. It is copied under
/// a hidden name; then the item itself gets a hidden name, so that nobody comes by its own to it
/// any more, and is compared with its copy; then the copy gets its name, and the item is removed.
/// The copy is seen only when nothing can undo it any more. What was written to the item meanwhile
/// undoes the move, with EAGAIN. Where the process is killed, the next start gives the item its
/// name back, or removes it when its copy has one.
class CrossMove {
 public:
  explicit CrossMove(const OperationContext& context) : context_(context) {}

  /// POSIX errors, EEXIST for a name that is taken.
  [[nodiscard]] Result<void> run(const ItemPlace& item, const OpenFolder& folder,
                                 const std::string& name) const;

 private:
  [[nodiscard]] Result<void> mayBeTakenAway(const ItemPlace& item) const;
  [[nodiscard]] Result<PendingMove> recordOf(const ItemPlace& item, const OpenFolder& folder,
                                             const std::string& name, const TemporaryName& copy,
                                             const TemporaryName& hidden) const;
  [[nodiscard]] Result<void> exchange(const ItemPlace& item, const OpenFolder& folder,
                                      const std::string& copy, const TemporaryName& hidden,
                                      const PendingMove& record) const;
  [[nodiscard]] Result<void> compare(const ItemPlace& item, const OpenFolder& folder,
                                     const std::string& copy, const PendingMove& record) const;

  const OperationContext& context_;
};

}  // namespace mirabel
