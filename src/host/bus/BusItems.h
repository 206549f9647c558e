#pragma once

#include <initializer_list>
#include <map>
#include <optional>
#include <sdbus-c++/Message.h>
#include <sdbus-c++/Types.h>
#include <string>
#include <string_view>
#include <vector>

#include "mirabel/Documents.h"
#include "mirabel/ItemRecord.h"
#include "mirabel/StatusReport.h"
#include "mirabel/Values.h"

namespace mirabel::bus {

// Items as they go over the bus: a{sv} with the keys of the command line's JSON, where what an item
// does not have is absent. 64-bit numbers are t, dates (xu): seconds since 1970 in UTC and
// nanoseconds. A name or an identifier that is not UTF-8 comes as its bytes (ay) under the same key
// with "Bytes" behind it, beside a text that only shows it; paths are always bytes. What a reader
// does not know it passes over.

void write(sdbus::Message& message, const ItemRecord& item);
void write(sdbus::Message& message, const std::vector<ItemRecord>& items);
[[nodiscard]] ItemRecord readItem(sdbus::Message& message);
[[nodiscard]] std::vector<ItemRecord> readItems(sdbus::Message& message);

/// Bytes as ay.
void write(sdbus::Message& message, const Data& bytes);
[[nodiscard]] Data readBytes(sdbus::Message& message);
/// A list of texts, as; those that are not UTF-8 are left out.
void write(sdbus::Message& message, const std::vector<std::string>& texts);

/// a{sv} too.
void write(sdbus::Message& message, const StatusReport& status);
[[nodiscard]] StatusReport readStatus(sdbus::Message& message);

/// a(say(xu)): identifiers, empty for what has none, paths, and dates.
void write(sdbus::Message& message, const std::vector<TrashedItem>& items);
[[nodiscard]] std::vector<TrashedItem> readTrashedItems(sdbus::Message& message);

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
