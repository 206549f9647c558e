#pragma once

#include <sdbus-c++/Message.h>
#include <string>
#include <vector>

#include "mirabel/ItemRecord.h"
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

}  // namespace mirabel::bus
