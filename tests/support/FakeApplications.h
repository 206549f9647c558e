#pragma once

#include <cstddef>
#include <map>
#include <optional>
#include <set>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ApplicationRegistry.h"
#include "support/FaultScript.h"

namespace mirabel::testing {

/// Installed applications, as the test lists them. An enumeration that is told to fail has
/// reported the first half.
class FakeApplications final : public ApplicationRegistry {
 public:
  explicit FakeApplications(FaultScript& faults) : faults_(faults) {}

  std::optional<BundleProxy> proxyForBundleIdentifier(std::string_view identifier) override;
  std::optional<BundleProxy> proxyAt(const URL& url) override;
  Result<void> enumerateApplicationsOfType(ApplicationType type,
                                           const EnumerationBlock& block) override;
  std::optional<PropertyList> infoDictionaryValues(const BundleProxy& application,
                                                   std::span<const std::string_view> keys) override;

  /// By the user, in the order of their enumeration.
  std::vector<BundleProxy> installed;
  /// Those of the system, which are not found by identifier or place.
  std::vector<BundleProxy> ofSystem;
  /// How many entries of the user can't be read, reported before the others.
  std::size_t unreadable = 0;
  /// By bundle identifier; an empty one for an application that is not named.
  std::map<std::string, PropertyList::Dictionary, std::less<>> infoDictionaries;
  /// Bundle identifiers of those whose dictionary can't be read.
  std::set<std::string, std::less<>> withoutInfoDictionary;

 private:
  FaultScript& faults_;
};

}  // namespace mirabel::testing
