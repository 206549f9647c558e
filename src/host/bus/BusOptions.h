#pragma once

#include <initializer_list>
#include <map>
#include <optional>
#include <sdbus-c++/Types.h>
#include <string>
#include <string_view>

#include "mirabel/Values.h"

namespace mirabel::bus {

/// a{sv} of options: texts, bytes, numbers. Asked by key.
using Options = std::map<std::string, sdbus::Variant>;
/// An option that a method knows, and the signature of its value.
struct KnownOption {
  std::string_view key;
  std::string_view signature;
};
/// Says which of the known options has a value of another type; such an option would count for
/// nothing. What nobody knows is passed over.
[[nodiscard]] std::optional<std::string> mistypedOption(const Options& options,
                                                        std::initializer_list<KnownOption> known);
[[nodiscard]] std::optional<std::string> textOption(const Options& options, const std::string& key);
/// The text under the key, or the bytes under the key with "Bytes" behind it.
[[nodiscard]] std::optional<std::string> nameOption(const Options& options, const std::string& key);
void setNameOption(Options& options, const std::string& key, const std::string& name);

}  // namespace mirabel::bus
