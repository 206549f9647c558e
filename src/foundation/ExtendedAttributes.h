#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

class URL;

/// A file that is open so that its attributes can be written. Closed by its destructor.
class AttributeTarget {
 public:
  virtual ~AttributeTarget() = default;
  /// Creates or replaces; on disk when it returns. On failure the old value stays, unless it was
  /// no more that failed than to have the new one on disk.
  [[nodiscard]] virtual Result<void> set(std::string_view name, const Data& value) = 0;
  /// POSIX error ENODATA when there is no such attribute. On disk as above.
  [[nodiscard]] virtual Result<void> remove(std::string_view name) = 0;
};

/// Extended attributes as the platform keeps them, under the names that this system uses. All
/// operations leave a final symbolic link unfollowed and may be called from any thread. Errors
/// are POSIX errors; a missing attribute is ENODATA.
class ExtendedAttributeStore {
 public:
  virtual ~ExtendedAttributeStore() = default;

  [[nodiscard]] virtual Result<std::vector<std::string>> names(const URL& url) = 0;
  [[nodiscard]] virtual Result<std::size_t> size(std::string_view name, const URL& url) = 0;
  /// The value, which must not be longer than `size` bytes (POSIX error ERANGE).
  [[nodiscard]] virtual Result<Data> read(std::string_view name, const URL& url,
                                          std::size_t size) = 0;
  [[nodiscard]] virtual Result<std::unique_ptr<AttributeTarget>> open(const URL& url) = 0;
};

/// The attribute's value. Nothing when it is not there, and after a failure that was logged.
/// The names that the file has are asked for once and kept in the URL's resource cache.
[[nodiscard]] std::optional<Data> extendedAttribute(ExtendedAttributeStore& store,
                                                    std::string_view name, const URL& url);

/// Sets the attribute to `value`, or removes it where there is none; removing what is not there
/// is no error. A failure is logged and returned. Resource caches of the file's URLs keep what
/// they know: the caller clears them.
std::optional<Error> setExtendedAttribute(AttributeTarget& target, const std::optional<Data>& value,
                                          std::string_view name);

}  // namespace mirabel
