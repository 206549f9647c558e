#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "mirabel/Error.h"

namespace mirabel {

/// Why an entry cannot be called that: EINVAL for a name that is empty, "." or "..", or holds "/"
/// or NUL; ENAMETOOLONG. Nothing for a name that can be had.
[[nodiscard]] std::optional<Error> whyNoName(std::string_view name);

/// How a name is divided when another is made from it: "report" and ".tar.gz". The extension is
/// empty for a name that has none, and is not more than a part of the name that begins with ".".
struct NameParts {
  std::string_view stem;
  std::string_view extension;
};
enum class NameOf { file, plainFolder };
[[nodiscard]] NameParts partsOf(std::string_view name, NameOf kind);

/// The `number`th name made from `name`: "report 2.txt". It is never longer than a name may be:
/// the stem is cut where it has to be, not within a character.
[[nodiscard]] std::string numberedName(std::string_view name, std::uint64_t number, NameOf kind);

}  // namespace mirabel
