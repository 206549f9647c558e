#pragma once

#include <string>

#include "linux/operations/OperationContext.h"

namespace mirabel {

/// Moves an item to a place where a rename can't bring it: another file system. It is copied under
/// a hidden name, compared, given its name, and then taken away from where it was, in an order in
/// which it is whole in one of the places at any time; where a crash leaves it in both, the next
/// start finishes or undoes the move. What was written to it meanwhile undoes it, with EAGAIN.
class CrossMove {
 public:
  explicit CrossMove(const OperationContext& context) : context_(context) {}

  /// POSIX errors, EEXIST for a name that is taken.
  [[nodiscard]] Result<void> run(const ItemPlace& item, const OpenFolder& folder,
                                 const std::string& name) const;

 private:
  [[nodiscard]] Result<void> mayBeTakenAway(const ItemPlace& item) const;
  [[nodiscard]] Result<PendingMove> recordOf(const ItemPlace& item, const OpenFolder& folder,
                                             const std::string& name,
                                             const std::string& copy) const;
  [[nodiscard]] Result<void> exchange(const ItemPlace& item, const OpenFolder& folder,
                                      const std::string& copy, const PendingMove& record) const;
  void takeBack(const OpenFolder& folder, const std::string& name, const std::string& copy) const;

  const OperationContext& context_;
};

}  // namespace mirabel
