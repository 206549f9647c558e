#include "applibrary/BundleProxyArchive.h"

#include <string_view>
#include <utility>

namespace mirabel {
namespace {

constexpr std::string_view bundleIdentifierKey = "bundleIdentifier";
constexpr std::string_view dataContainerKey = "dataContainerURL";
constexpr std::string_view localizedNameKey = "localizedName";

void add(PropertyList::Dictionary& record, std::string_view key,
         const std::optional<std::string>& value) {
  if (value) record.emplace_back(std::string(key), PropertyList::ofBytes(*value));
}

/// False where there is something else than bytes.
bool take(std::optional<std::string>& value, const PropertyList& record, std::string_view key) {
  const PropertyList* stored = record.find(key);
  if (stored == nullptr) return true;
  value = stored->bytes();
  return value.has_value();
}

std::optional<BundleProxy> unarchived(const PropertyList& record) {
  if (record.as<PropertyList::Dictionary>() == nullptr) return {};
  BundleProxy proxy;
  std::optional<std::string> container;
  if (!take(proxy.bundleIdentifier, record, bundleIdentifierKey) ||
      !take(container, record, dataContainerKey) ||
      !take(proxy.localizedName, record, localizedNameKey)) {
    return {};
  }
  if (!container) return proxy;
  proxy.dataContainerURL = URL::fileURL(*container);
  if (proxy.dataContainerURL->path().empty()) return {};
  return proxy;
}

}  // namespace

PropertyList archivedBundleProxies(const std::vector<BundleProxy>& records) {
  PropertyList::Array array;
  array.reserve(records.size());
  for (const BundleProxy& proxy : records) {
    PropertyList::Dictionary record;
    add(record, bundleIdentifierKey, proxy.bundleIdentifier);
    if (proxy.dataContainerURL) add(record, dataContainerKey, proxy.dataContainerURL->path());
    add(record, localizedNameKey, proxy.localizedName);
    array.emplace_back(std::move(record));
  }
  return PropertyList(std::move(array));
}

std::optional<std::vector<BundleProxy>> unarchivedBundleProxies(const PropertyList& value) {
  const auto* array = value.as<PropertyList::Array>();
  if (array == nullptr) return {};
  std::vector<BundleProxy> records;
  records.reserve(array->size());
  for (const PropertyList& element : *array) {
    auto record = unarchived(element);
    if (!record) return {};
    records.push_back(*std::move(record));
  }
  return records;
}

}  // namespace mirabel
