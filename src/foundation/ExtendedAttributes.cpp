#include "foundation/ExtendedAttributes.h"

#include <cerrno>
#include <utility>

#include "foundation/Log.h"
#include "foundation/URL.h"

namespace mirabel {
namespace {

/// Files come and go under a reader, so a missing one is no news.
LogLevel levelOfReadFailure(const Error& error) {
  return error.isPosix(ENOENT) ? LogLevel::debug : LogLevel::error;
}

/// People own files that they may not write.
LogLevel levelOfWriteFailure(const Error& error) {
  return error.isPosix(EACCES) ? LogLevel::debug : LogLevel::error;
}

/// False only when the file is known not to have the attribute.
bool mayHaveAttribute(ExtendedAttributeStore& store, std::string_view name, const URL& url) {
  ResourceCache& cache = url.resources();
  if (const std::optional<bool> known = cache.hasAttribute(name)) return *known;
  Result<std::vector<std::string>> names = store.names(url);
  // A failure is left to the look at the attribute itself, which says what is wrong with it.
  if (!names) return true;
  cache.setAttributeNames(std::move(*names));
  return cache.hasAttribute(name).value_or(true);
}

}  // namespace

std::optional<Data> extendedAttribute(ExtendedAttributeStore& store, std::string_view name,
                                      const URL& url) {
  if (!mayHaveAttribute(store, name, url)) return std::nullopt;

  const Result<std::size_t> size = store.size(name, url);
  if (!size) {
    if (size.error().isPosix(ENODATA)) return std::nullopt;
    logMessage(levelOfReadFailure(size.error()),
               "can't get xattr " + std::string(name) + "; " + size.error().description());
    return std::nullopt;
  }

  Result<Data> value = store.read(name, url, *size);
  if (!value) {
    logMessage(levelOfReadFailure(value.error()), "can't copy data for xattr " + std::string(name) +
                                                      "; " + value.error().description());
    return std::nullopt;
  }
  return std::move(*value);
}

std::optional<Error> setExtendedAttribute(AttributeTarget& target, const std::optional<Data>& value,
                                          std::string_view name) {
  Result<void> outcome = value ? target.set(name, *value) : target.remove(name);
  if (outcome) return std::nullopt;
  if (!value && outcome.error().isPosix(ENODATA)) return std::nullopt;

  const std::string_view verb = value ? "set" : "remove";
  logMessage(levelOfWriteFailure(outcome.error()), "can't " + std::string(verb) + " xattr \"" +
                                                       std::string(name) + "\"; " +
                                                       outcome.error().description());
  return std::move(outcome.error());
}

}  // namespace mirabel
