#include "support/FakeApplications.h"

#include <algorithm>
#include <utility>

namespace mirabel::testing {

std::optional<BundleProxy> FakeApplications::proxyForBundleIdentifier(std::string_view identifier) {
  const auto found = std::ranges::find_if(
      installed, [&](const BundleProxy& proxy) { return proxy.bundleIdentifier == identifier; });
  return found == installed.end() ? std::nullopt : std::optional(*found);
}

std::optional<BundleProxy> FakeApplications::proxyAt(const URL& url) {
  for (const BundleProxy& proxy : installed) {
    if (!proxy.dataContainerURL) continue;
    const URL documents = proxy.dataContainerURL->appendingPathComponent("Documents");
    if (documents.properURL() == url.properURL()) return proxy;
  }
  return {};
}

Result<void> FakeApplications::enumerateApplicationsOfType(ApplicationType type,
                                                           const EnumerationBlock& block) {
  const auto error = faults_.hit(Op::enumerateApplications);
  std::vector<std::optional<BundleProxy>> reported;
  if (type == ApplicationType::user) reported.resize(unreadable);
  const auto& applications = type == ApplicationType::user ? installed : ofSystem;
  reported.insert(reported.end(), applications.begin(), applications.end());
  if (error) reported.resize(reported.size() / 2);
  for (const auto& application : reported)
    block(application);
  if (error) return fail(*error);
  return {};
}

std::optional<PropertyList> FakeApplications::infoDictionaryValues(
    const BundleProxy& application, std::span<const std::string_view> keys) {
  const std::string identifier = application.bundleIdentifier.value_or("");
  if (faults_.hit(Op::infoDictionary) || withoutInfoDictionary.contains(identifier)) return {};
  PropertyList::Dictionary values;
  const auto found = infoDictionaries.find(identifier);
  if (found == infoDictionaries.end()) return PropertyList(std::move(values));
  for (const auto& [key, value] : found->second)
    if (std::ranges::find(keys, key) != keys.end()) values.emplace_back(key, value);
  return PropertyList(std::move(values));
}

}  // namespace mirabel::testing
