#pragma once

#include <optional>
#include <utility>

#include "foundation/KeyedArchive.h"

namespace mirabel {

/// What an attribute is to hold: the archive of the value. Nothing for no value and for one that
/// no archive holds, which both remove the attribute.
template <class T>
[[nodiscard]] std::optional<Data> attributePayload(const std::optional<T>& value,
                                                   Result<Data> (*archive)(const T&)) {
  if (!value) return {};
  Result<Data> bytes = archive(*value);
  if (!bytes) return {};
  return *std::move(bytes);
}

}  // namespace mirabel
