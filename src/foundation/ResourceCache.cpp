#include <algorithm>
#include <utility>

#include "foundation/URL.h"

namespace mirabel {
namespace {

std::optional<std::uint64_t> overriddenNumber(const std::map<ResourceKey, ResourceValue>& overrides,
                                              ResourceKey key) {
  const auto found = overrides.find(key);
  if (found == overrides.end()) return std::nullopt;
  const Number* number = std::get_if<Number>(&found->second);
  return number == nullptr ? std::nullopt : number->asUnsigned();
}

}  // namespace

std::optional<ResourceValue> ResourceCache::value(ResourceKey key, std::string_view name) const {
  const std::lock_guard lock(mutex_);
  if (overrides_ != nullptr) {
    const auto found = overrides_->find(key);
    if (found != overrides_->end()) return found->second;
  }
  if (!values_) return std::nullopt;
  return resourceValue(*values_, key, name);
}

bool ResourceCache::isFilled() const {
  const std::lock_guard lock(mutex_);
  return values_.has_value();
}

void ResourceCache::fill(ResourceValues values) {
  const std::lock_guard lock(mutex_);
  values_ = std::move(values);
}

void ResourceCache::set(ResourceKey key, ResourceValue value) {
  const std::lock_guard lock(mutex_);
  // Hardly any URL has overrides, so their map is made for the one that does.
  if (overrides_ == nullptr) overrides_ = std::make_unique<std::map<ResourceKey, ResourceValue>>();
  overrides_->insert_or_assign(key, std::move(value));
}

std::optional<bool> ResourceCache::hasAttribute(std::string_view name) const {
  const std::lock_guard lock(mutex_);
  if (!attributeNames_) return std::nullopt;
  return std::ranges::find(*attributeNames_, name) != attributeNames_->end();
}

void ResourceCache::setAttributeNames(std::vector<std::string> names) {
  const std::lock_guard lock(mutex_);
  attributeNames_ = std::move(names);
}

std::optional<ResourceValues> ResourceCache::snapshot() const {
  const std::lock_guard lock(mutex_);
  std::optional<ResourceValues> values = values_;
  if (!values || overrides_ == nullptr) return values;
  values->fileID =
      overriddenNumber(*overrides_, ResourceKey::fileIdentifier).value_or(values->fileID);
  values->documentID = static_cast<std::uint32_t>(
      overriddenNumber(*overrides_, ResourceKey::documentIdentifier).value_or(values->documentID));
  return values;
}

void ResourceCache::clear() {
  const std::lock_guard lock(mutex_);
  values_.reset();
  attributeNames_.reset();
  overrides_.reset();
}

}  // namespace mirabel
