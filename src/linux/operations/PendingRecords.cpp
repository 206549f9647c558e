#include "linux/operations/PendingRecords.h"

#include <algorithm>
#include <string_view>

#include "foundation/PropertyList.h"
#include "linux/volume/Digest.h"

namespace mirabel {
namespace {

// What is half right could have something removed that should not be.
constexpr std::string_view magic = "MRBPEND2";

// Each record is an array of fields in the order of its struct, a folder being two of them. Both
// directions walk the same list of fields.

class FieldWriter {
 public:
  void field(const std::string& text) { fields_.push_back(PropertyList::ofBytes(text)); }
  void field(std::uint64_t number) { fields_.emplace_back(Number::of(number)); }
  [[nodiscard]] PropertyList record() && { return PropertyList(std::move(fields_)); }

 private:
  PropertyList::Array fields_;
};

class FieldReader {
 public:
  explicit FieldReader(const PropertyList& record) : fields_(record.as<PropertyList::Array>()) {}

  void field(std::string& text) {
    const PropertyList* const next = take();
    auto bytes = next ? next->bytes() : std::nullopt;
    isGood_ = isGood_ && bytes;
    if (isGood_) text = *std::move(bytes);
  }
  void field(std::uint64_t& number) {
    const PropertyList* const next = take();
    const Number* const value = next ? next->as<Number>() : nullptr;
    const auto taken = value ? value->asUnsigned() : std::nullopt;
    isGood_ = isGood_ && taken;
    if (isGood_) number = *taken;
  }
  [[nodiscard]] bool isGood() const { return isGood_ && fields_ && position_ == fields_->size(); }

 private:
  const PropertyList* take() {
    if (!fields_ || position_ == fields_->size()) return nullptr;
    return &(*fields_)[position_++];
  }

  const PropertyList::Array* fields_;
  std::size_t position_ = 0;
  bool isGood_ = true;
};

template <class Fields, class Folder>
void walkFolder(Fields& fields, Folder& folder) {
  fields.field(folder.path);
  fields.field(folder.fileID);
}

template <class Fields>
void walk(Fields& fields, auto& record) requires requires {
  record.prefix;
}
{
  walkFolder(fields, record.folder);
  fields.field(record.prefix);
}

template <class Fields>
void walk(Fields& fields, auto& record) requires requires {
  record.copy;
}
{
  walkFolder(fields, record.sourceFolder);
  fields.field(record.sourceName);
  fields.field(record.hiddenSource);
  walkFolder(fields, record.folder);
  fields.field(record.name);
  fields.field(record.copy.inode);
  fields.field(record.copy.handle);
  fields.field(record.copy.birthTime);
}

template <class Fields>
void walk(Fields& fields, auto& record) requires requires {
  record.to;
}
{
  walkFolder(fields, record.folder);
  fields.field(record.from);
  fields.field(record.hidden);
  fields.field(record.to);
}

template <class Record>
PropertyList listOf(const std::vector<Record>& records) {
  PropertyList::Array list;
  for (const Record& record : records) {
    FieldWriter fields;
    walk(fields, record);
    list.push_back(std::move(fields).record());
  }
  return PropertyList(std::move(list));
}

template <class Record>
bool readList(const PropertyList& root, std::string_view key, std::vector<Record>& records) {
  const PropertyList* const list = root.find(key);
  const auto* const array = list ? list->as<PropertyList::Array>() : nullptr;
  if (!array) return false;
  for (const PropertyList& item : *array) {
    FieldReader fields(item);
    walk(fields, records.emplace_back());
    if (!fields.isGood()) return false;
  }
  return true;
}

}  // namespace

Result<Data> PendingRecords::encode() const {
  auto list = PropertyList(PropertyList::Dictionary{{"removals", listOf(removals)},
                                                    {"moves", listOf(moves)},
                                                    {"renames", listOf(renames)}})
                  .encode();
  if (!list) return list;
  Data bytes(magic.begin(), magic.end());
  for (std::uint64_t digest = digestOf(*list), i = 0; i < sizeof digest; ++i)
    bytes.push_back(static_cast<std::uint8_t>(digest >> (8 * i)));
  bytes.insert(bytes.end(), list->begin(), list->end());
  return bytes;
}

std::optional<PendingRecords> PendingRecords::decode(std::span<const std::uint8_t> bytes) {
  constexpr std::size_t headerSize = magic.size() + sizeof(std::uint64_t);
  if (bytes.size() < headerSize || !std::ranges::equal(bytes.first(magic.size()), magic)) return {};
  std::uint64_t digest = 0;
  for (std::size_t i = 0; i < sizeof digest; ++i)
    digest |= std::uint64_t{bytes[magic.size() + i]} << (8 * i);
  const auto list = bytes.subspan(headerSize);
  if (digestOf(list) != digest) return {};
  const auto root = PropertyList::decode(list);
  PendingRecords records;
  if (!root || !readList(*root, "removals", records.removals) ||
      !readList(*root, "moves", records.moves) || !readList(*root, "renames", records.renames)) {
    return {};
  }
  return records;
}

}  // namespace mirabel
