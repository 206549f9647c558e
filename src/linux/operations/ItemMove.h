#pragma once

#include <optional>
#include <string>

#include "linux/operations/OperationContext.h"
#include "platform/FileOperations.h"

namespace mirabel {

/// Gives an item another name or another folder, and answers where it lies then. On disk when they
/// return. Errors as `FileOperations` says. What is moved to another file system is copied, and
/// taken away once the copy is found to be like it.
class ItemMove {
 public:
  explicit ItemMove(const OperationContext& context) : context_(context) {}

  [[nodiscard]] Result<URL> rename(const URL& item, const std::string& newName) const;
  [[nodiscard]] Result<URL> moveUnder(const URL& item, const URL& folder,
                                      const std::optional<std::string>& newName,
                                      Bouncing bouncing) const;

 private:
  [[nodiscard]] Result<URL> respell(const ItemPlace& item, const std::string& newName) const;
  [[nodiscard]] Result<void> renameTo(const ItemPlace& item, const OpenFolder& folder,
                                      const std::string& name) const;
  [[nodiscard]] Result<std::string> bounce(const ItemPlace& item, const OpenFolder& folder,
                                           const std::string& wanted, NameOf kind) const;
  [[nodiscard]] std::uint64_t firstFreeNumber(const OpenFolder& folder, const std::string& wanted,
                                              std::uint64_t from, NameOf kind) const;

  const OperationContext& context_;
};

}  // namespace mirabel
