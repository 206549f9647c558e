#pragma once

#include <nlohmann/json_fwd.hpp>
#include <string>
#include <string_view>

namespace mirabel {

struct ItemRecord;

/// The item's record: keys are its property names, 64-bit numbers are strings, dates RFC 3339 in
/// UTC, and what the item does not have is absent. A name that is not UTF-8 comes with
/// "filenameBytes" in base64, a path with "pathBytes".
[[nodiscard]] nlohmann::json itemJSON(const ItemRecord& item);

/// Sets `key` to text; where the bytes are not UTF-8, `key` + "Bytes" holds them in base64.
void setText(nlohmann::json& object, const std::string& key, std::string_view bytes);

}  // namespace mirabel
