#include <bit>

#include "foundation/PropertyListFormat.h"
#include "foundation/Unicode.h"

namespace mirabel {
namespace {

using bplist::Kind;
using Bytes = std::span<const std::uint8_t>;

std::unexpected<Error> malformed(std::string_view detail) {
  return fail(Error::propertyList(std::string(detail)));
}

/// Up to eight bytes, the most significant first.
std::uint64_t bigEndian(Bytes bytes) {
  std::uint64_t value = 0;
  for (const std::uint8_t byte : bytes) {
    value = value << 8 | byte;
  }
  return value;
}

bool isTableIntegerSize(std::size_t size) {
  return size >= 1 && size <= 8;
}

/// The trailer and the offset table, checked against the length of the whole.
struct Layout {
  Bytes objects;  ///< from the first byte of the file up to the offset table
  Bytes offsets;
  std::size_t offsetSize = 0;
  std::size_t referenceSize = 0;
  std::uint64_t count = 0;
  std::uint64_t top = 0;

  [[nodiscard]] std::uint64_t offset(std::uint64_t object) const {
    return bigEndian(offsets.subspan(object * offsetSize, offsetSize));
  }
};

Result<Layout> readLayout(Bytes bytes) {
  const std::string_view magic = bplist::magic;
  if (bytes.size() < magic.size() + bplist::trailerSize) return malformed("too short");
  if (!std::equal(magic.begin(), magic.end(), bytes.begin())) return malformed("wrong header");

  const Bytes trailer = bytes.last(bplist::trailerSize);
  Layout layout;
  layout.offsetSize = trailer[bplist::offsetSizeField];
  layout.referenceSize = trailer[bplist::referenceSizeField];
  layout.count = bigEndian(trailer.subspan(bplist::objectCountField, 8));
  layout.top = bigEndian(trailer.subspan(bplist::topObjectField, 8));
  if (!isTableIntegerSize(layout.offsetSize) || !isTableIntegerSize(layout.referenceSize)) {
    return malformed("integers of the tables have an impossible size");
  }

  const std::uint64_t tableStart = bigEndian(trailer.subspan(bplist::offsetTableField, 8));
  const std::size_t tableEnd = bytes.size() - bplist::trailerSize;
  if (tableStart < magic.size() || tableStart > tableEnd) {
    return malformed("offset table outside the list");
  }
  layout.objects = bytes.first(tableStart);
  layout.offsets = bytes.subspan(tableStart, tableEnd - tableStart);
  // By division: a product of what the trailer claims could wrap around.
  if (layout.offsets.size() % layout.offsetSize != 0 ||
      layout.count != layout.offsets.size() / layout.offsetSize) {
    return malformed("offset table of another size than the objects need");
  }
  if (layout.top >= layout.count) return malformed("no such top object");
  return layout;
}

Result<void> checkOffsets(const Layout& layout) {
  for (std::uint64_t object = 0; object < layout.count; ++object) {
    const std::uint64_t offset = layout.offset(object);
    if (offset < bplist::magic.size() || offset >= layout.objects.size()) {
      return malformed("object outside the list");
    }
  }
  return {};
}

class Reader {
 public:
  Reader(const Layout& layout, const PropertyList::Limits& limits)
      : layout_(layout), budget_(limits), open_(layout.count) {}

  Result<PropertyList> top() {
    if (!budget_.takeObjects(1)) return malformed("too many objects");
    return object(layout_.top);
  }

 private:
  /// An object's first byte, taken apart, and all that follows it up to the offset table.
  struct Head {
    Kind kind;
    std::uint8_t low;
    Bytes rest;
  };

  Result<PropertyList> object(std::uint64_t index) {
    if (index >= layout_.count) return malformed("no such object");
    if (open_[index]) return malformed("an object contains itself");
    if (!budget_.enter()) return malformed("nested too deeply");
    open_[index] = true;
    Result<PropertyList> value = valueAt(index);
    open_[index] = false;
    budget_.leave();
    return value;
  }

  [[nodiscard]] Head headOf(std::uint64_t index) const {
    const Bytes bytes = layout_.objects.subspan(layout_.offset(index));
    return {static_cast<Kind>(bytes[0] >> 4), static_cast<std::uint8_t>(bytes[0] & 0x0F),
            bytes.subspan(1)};
  }

  Result<PropertyList> valueAt(std::uint64_t index) {
    const Head head = headOf(index);
    switch (head.kind) {
      case Kind::constant:
        return constant(head);
      case Kind::integer:
        return wrapped(integer(head));
      case Kind::real:
        return real(head);
      case Kind::date:
        return date(head);
      case Kind::data:
        return data(head);
      case Kind::asciiText:
      case Kind::utf16Text:
        return wrapped(text(head));
      case Kind::array:
        return array(head);
      case Kind::dictionary:
        return dictionary(head);
    }
    return malformed("an object of a type that is not supported");
  }

  template <class T>
  static Result<PropertyList> wrapped(Result<T> value) {
    if (!value) return fail(std::move(value.error()));
    return PropertyList(*std::move(value));
  }

  static Result<PropertyList> constant(const Head& head) {
    if (head.low == bplist::falseMarker) return PropertyList(false);
    if (head.low == bplist::trueMarker) return PropertyList(true);
    return malformed("an object of a type that is not supported");
  }

  static Result<Bytes> payload(const Head& head, std::size_t size) {
    if (size > head.rest.size()) return malformed("an object goes beyond the list");
    return head.rest.first(size);
  }

  static Result<Number> integer(const Head& head) {
    if (head.low > 4) return malformed("an integer of an impossible size");
    const auto bytes = payload(head, std::size_t{1} << head.low);
    if (!bytes) return fail(bytes.error());
    const std::uint64_t value = bigEndian(bytes->last(std::min<std::size_t>(8, bytes->size())));
    const auto asSigned = static_cast<std::int64_t>(value);
    // Only the sizes from 8 bytes on have a sign.
    if (bytes->size() <= 8) return Number::of(asSigned);
    const std::uint64_t high = bigEndian(bytes->first(8));
    if (high == 0) return asSigned < 0 ? Number::of(value) : Number::of(asSigned);
    if (high == ~std::uint64_t{0} && asSigned < 0) return Number::of(asSigned);
    return malformed("an integer that does not fit 64 bits");
  }

  static Result<PropertyList> real(const Head& head) {
    if (head.low != 2 && head.low != 3) return malformed("a real of an impossible size");
    const auto bytes = payload(head, std::size_t{1} << head.low);
    if (!bytes) return fail(bytes.error());
    const std::uint64_t bits = bigEndian(*bytes);
    if (head.low == 3) return PropertyList(Number::of(std::bit_cast<double>(bits)));
    const auto single = std::bit_cast<float>(static_cast<std::uint32_t>(bits));
    return PropertyList(Number::of(double{single}));
  }

  static Result<PropertyList> date(const Head& head) {
    if (head.low != (bplist::dateMarker & 0x0F)) return malformed("a date of an impossible size");
    const auto bytes = payload(head, 8);
    if (!bytes) return fail(bytes.error());
    const auto value = Date::fromReferenceSeconds(std::bit_cast<double>(bigEndian(*bytes)));
    if (!value) return malformed("a date outside the calendar");
    return PropertyList(*value);
  }

  /// The payload of an object with a count, whose elements have `elementSize` bytes each.
  static Result<Bytes> counted(const Head& head, std::size_t elementSize) {
    std::uint64_t count = head.low;
    Bytes rest = head.rest;
    if (head.low == bplist::countFollows) {
      if (rest.empty() || static_cast<Kind>(rest[0] >> 4) != Kind::integer) {
        return malformed("an object without a count");
      }
      const std::uint8_t low = rest[0] & 0x0F;
      const auto number = integer({Kind::integer, low, rest.subspan(1)});
      if (!number) return fail(number.error());
      const auto value = number->asUnsigned();
      if (!value) return malformed("a negative count");
      count = *value;
      rest = rest.subspan(1 + (std::size_t{1} << low));
    }
    if (count > rest.size() / elementSize) return malformed("an object goes beyond the list");
    return rest.first(count * elementSize);
  }

  Result<PropertyList> data(const Head& head) {
    const auto bytes = counted(head, 1);
    if (!bytes) return fail(bytes.error());
    if (!budget_.takeBytes(bytes->size())) return malformed("too many bytes");
    return PropertyList(Data(bytes->begin(), bytes->end()));
  }

  Result<std::string> text(const Head& head) {
    auto result = head.kind == Kind::asciiText ? asciiText(head) : utf16Text(head);
    if (result && !budget_.takeBytes(result->size())) return malformed("too many bytes");
    return result;
  }

  static Result<std::string> asciiText(const Head& head) {
    const auto bytes = counted(head, 1);
    if (!bytes) return fail(bytes.error());
    if (std::ranges::any_of(*bytes, [](std::uint8_t byte) { return byte >= 0x80; })) {
      return malformed("ASCII text with other characters");
    }
    return std::string(bytes->begin(), bytes->end());
  }

  static Result<std::string> utf16Text(const Head& head) {
    const auto bytes = counted(head, 2);
    if (!bytes) return fail(bytes.error());
    std::u16string units(bytes->size() / 2, u'\0');
    for (std::size_t i = 0; i < units.size(); ++i) {
      units[i] = static_cast<char16_t>(bigEndian(bytes->subspan(2 * i, 2)));
    }
    auto text = utf8FromUTF16(units);
    if (!text) return malformed("a surrogate without its other half");
    return *std::move(text);
  }

  [[nodiscard]] std::uint64_t reference(Bytes references, std::size_t position) const {
    const std::size_t size = layout_.referenceSize;
    return bigEndian(references.subspan(position * size, size));
  }

  Result<PropertyList> array(const Head& head) {
    const auto references = counted(head, layout_.referenceSize);
    if (!references) return fail(references.error());
    const std::size_t count = references->size() / layout_.referenceSize;
    // Before memory is set aside for them.
    if (!budget_.takeObjects(count)) return malformed("too many objects");
    PropertyList::Array elements;
    elements.reserve(count);
    for (std::size_t i = 0; i < count; ++i) {
      auto element = object(reference(*references, i));
      if (!element) return element;
      elements.push_back(*std::move(element));
    }
    return PropertyList(std::move(elements));
  }

  Result<PropertyList> dictionary(const Head& head) {
    const auto references = counted(head, 2 * layout_.referenceSize);
    if (!references) return fail(references.error());
    const std::size_t count = references->size() / layout_.referenceSize / 2;
    if (!budget_.takeObjects(2 * count)) return malformed("too many objects");
    PropertyList::Dictionary entries;
    entries.reserve(count);
    for (std::size_t i = 0; i < count; ++i) {
      auto name = key(reference(*references, i));
      if (!name) return fail(name.error());
      entries.emplace_back(*std::move(name), PropertyList());
    }
    if (bplist::hasDuplicates(entries)) return malformed("a key stands twice");
    for (std::size_t i = 0; i < count; ++i) {
      auto value = object(reference(*references, count + i));
      if (!value) return value;
      entries[i].second = *std::move(value);
    }
    return PropertyList(std::move(entries));
  }

  Result<std::string> key(std::uint64_t index) {
    if (index >= layout_.count) return malformed("no such object");
    const Head head = headOf(index);
    if (head.kind != Kind::asciiText && head.kind != Kind::utf16Text) {
      return malformed("a key that is no text");
    }
    return text(head);
  }

  const Layout& layout_;
  bplist::Budget budget_;
  std::vector<bool> open_;  // the objects around the one that is being read
};

}  // namespace

Result<PropertyList> PropertyList::decode(std::span<const std::uint8_t> bytes,
                                          const Limits& limits) {
  const auto layout = readLayout(bytes);
  if (!layout) return fail(layout.error());
  if (const auto checked = checkOffsets(*layout); !checked) return fail(checked.error());
  return Reader(*layout, limits).top();
}

}  // namespace mirabel
