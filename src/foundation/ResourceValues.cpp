#include "foundation/ResourceValues.h"

#include <utility>

#include "foundation/Log.h"
#include "foundation/URL.h"

namespace mirabel {
namespace {

ResourceValue dateOrAbsent(const std::optional<Date>& date) {
  if (!date) return {};
  return *date;
}

ResourceValue sizeOrAbsent(const ResourceValues& values) {
  if (values.kind != FileKind::regular && values.kind != FileKind::symbolicLink) return {};
  return Number::of(values.size);
}

ResourceValue documentIDOrAbsent(const ResourceValues& values) {
  if (values.documentID == 0) return {};
  return Number::of(std::uint64_t{values.documentID});
}

ResourceValue typeOrAbsent(const ResourceValues& values) {
  if (values.typeIdentifier.empty()) return {};
  return values.typeIdentifier;
}

/// The value when it is there and of type `T`.
template <class T>
std::optional<T> typedValue(const ResourceReader& reader, ResourceKey key, const URL& url) {
  Result<ResourceValue> value = reader.value(key, url);
  if (!value) {
    logError("can't get resource \"" + std::string(nameOf(key)) + "\" for " + url.description() +
             "; " + value.error().description());
    return std::nullopt;
  }
  T* typed = std::get_if<T>(&*value);
  if (typed == nullptr) return std::nullopt;
  return std::move(*typed);
}

}  // namespace

std::string_view nameOf(ResourceKey key) {
  switch (key) {
    case ResourceKey::name:
      return "name";
    case ResourceKey::typeIdentifier:
      return "typeIdentifier";
    case ResourceKey::fileSize:
      return "fileSize";
    case ResourceKey::creationDate:
      return "creationDate";
    case ResourceKey::contentModificationDate:
      return "contentModificationDate";
    case ResourceKey::isDirectory:
      return "isDirectory";
    case ResourceKey::isPackage:
      return "isPackage";
    case ResourceKey::isWritable:
      return "isWritable";
    case ResourceKey::isReachable:
      return "isReachable";
    case ResourceKey::fileIdentifier:
      return "fileIdentifier";
    case ResourceKey::documentIdentifier:
      return "documentIdentifier";
    case ResourceKey::linkCount:
      return "linkCount";
  }
  return {};
}

ResourceValue resourceValue(const ResourceValues& values, ResourceKey key, std::string_view name) {
  switch (key) {
    case ResourceKey::name:
      return std::string(name);
    case ResourceKey::typeIdentifier:
      return typeOrAbsent(values);
    case ResourceKey::fileSize:
      return sizeOrAbsent(values);
    case ResourceKey::creationDate:
      return dateOrAbsent(values.creationDate);
    case ResourceKey::contentModificationDate:
      return dateOrAbsent(values.contentModificationDate);
    case ResourceKey::isDirectory:
      return values.kind == FileKind::folder;
    case ResourceKey::isPackage:
      return values.isPackage;
    case ResourceKey::isWritable:
      return values.isWritable;
    case ResourceKey::isReachable:
      return true;
    case ResourceKey::fileIdentifier:
      return Number::of(values.fileID);
    case ResourceKey::documentIdentifier:
      return documentIDOrAbsent(values);
    case ResourceKey::linkCount:
      return Number::of(std::uint64_t{values.linkCount});
  }
  return {};
}

Result<ResourceValue> ResourceReader::value(ResourceKey key, const URL& url) const {
  ResourceCache& cache = url.resources();
  const std::string_view name = url.lastPathComponent();
  if (std::optional<ResourceValue> known = cache.value(key, name)) return std::move(*known);

  Result<ResourceValues> values = source_.readValues(url);
  if (!values) return fail(std::move(values.error()));
  // Taken from what was read, not from the cache: somebody may clear that in between.
  ResourceValue answer = resourceValue(*values, key, name);
  cache.fill(std::move(*values));
  return answer;
}

std::optional<std::string> ResourceReader::string(ResourceKey key, const URL& url) const {
  return typedValue<std::string>(*this, key, url);
}

std::optional<Number> ResourceReader::number(ResourceKey key, const URL& url) const {
  return typedValue<Number>(*this, key, url);
}

std::optional<Date> ResourceReader::date(ResourceKey key, const URL& url) const {
  return typedValue<Date>(*this, key, url);
}

std::optional<bool> ResourceReader::boolean(ResourceKey key, const URL& url) const {
  return typedValue<bool>(*this, key, url);
}

std::optional<Data> ResourceReader::data(ResourceKey key, const URL& url) const {
  return typedValue<Data>(*this, key, url);
}

}  // namespace mirabel
