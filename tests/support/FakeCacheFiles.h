#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <string_view>

#include "platform/CacheFiles.h"
#include "support/FaultScript.h"

namespace mirabel::testing {

/// Files by path, kept apart from the volume. What "processes" share is what shares this.
class FakeCacheFiles final : public CacheFiles {
 public:
  explicit FakeCacheFiles(FaultScript& faults) : faults_(faults) {}

  const URL& applicationSupportURL() const override { return applicationSupport_; }
  Result<std::optional<Data>> read(const URL& file, std::size_t limit) override;
  Result<void> createDirectory(const URL& folder) override;
  Result<void> replace(const URL& file, const Data& bytes) override;
  Result<std::uint64_t> claimVersion(std::string_view name, std::uint64_t after) override;

  std::map<std::string, Data> files;
  std::set<std::string> folders;
  std::map<std::string, std::uint64_t, std::less<>> versions;
  /// Runs once, between the claim of a number and what the process that claimed it does next.
  std::function<void()> afterClaim;

 private:
  FaultScript& faults_;
  std::mutex mutex_;
  URL applicationSupport_ = URL::fileURL("/home/me/.local/share");
};

}  // namespace mirabel::testing
