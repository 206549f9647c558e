#include <bit>
#include <cmath>
#include <limits>
#include <unordered_map>
#include <utility>

#include "foundation/PropertyListFormat.h"
#include "foundation/Unicode.h"

namespace mirabel {
namespace {

using bplist::Kind;

std::unexpected<Error> refused(std::string_view detail) {
  return fail(Error::propertyList(std::string(detail)));
}

/// The bytes that an integer takes: 1, 2, 4 or 8.
std::size_t integerSize(std::uint64_t value) {
  if (value <= 0xFF) return 1;
  if (value <= 0xFFFF) return 2;
  return value <= 0xFFFF'FFFF ? 4 : 8;
}

/// Bytes under construction; integers are written with the most significant byte first.
struct Output {
  std::string bytes;

  void byte(std::uint8_t value) { bytes.push_back(static_cast<char>(value)); }
  void marker(Kind kind, std::uint8_t low) {
    byte(static_cast<std::uint8_t>(static_cast<unsigned>(kind) << 4 | low));
  }
  void bigEndian(std::uint64_t value, std::size_t size) {
    for (std::size_t i = size; i-- > 0;) {
      byte(static_cast<std::uint8_t>(value >> (8 * i)));
    }
  }
  /// Sizes below 8 bytes have no sign, so that they serve values that are not negative.
  void integer(std::int64_t value) {
    const auto bits = static_cast<std::uint64_t>(value);
    const std::size_t size = integerSize(bits);
    marker(Kind::integer, static_cast<std::uint8_t>(std::countr_zero(size)));
    bigEndian(bits, size);
  }
  void countedMarker(Kind kind, std::size_t count) {
    if (count < bplist::countFollows) return marker(kind, static_cast<std::uint8_t>(count));
    marker(kind, bplist::countFollows);
    integer(static_cast<std::int64_t>(count));
  }
};

std::string encoded(bool value) {
  return std::string(1, static_cast<char>(value ? bplist::trueMarker : bplist::falseMarker));
}

struct NumberEncoder {
  Output out;

  void operator()(std::int64_t value) { out.integer(value); }
  void operator()(std::uint64_t value) {
    if (std::in_range<std::int64_t>(value)) return out.integer(static_cast<std::int64_t>(value));
    out.marker(Kind::integer, 4);
    out.bigEndian(0, 8);
    out.bigEndian(value, 8);
  }
  void operator()(double value) {
    // A conversion of what is beyond a float's range has no defined result.
    const bool isInRange = std::abs(value) <= double{std::numeric_limits<float>::max()};
    if (isInRange && double{static_cast<float>(value)} == value) {
      out.marker(Kind::real, 2);
      return out.bigEndian(std::bit_cast<std::uint32_t>(static_cast<float>(value)), 4);
    }
    out.marker(Kind::real, 3);
    out.bigEndian(std::bit_cast<std::uint64_t>(value), 8);
  }
};

/// Writes in two steps: objects are numbered first, because the size of a reference depends on
/// how many there are. Scalars whose bytes are equal share a number.
class Writer {
 public:
  explicit Writer(const PropertyList::Limits& limits) : budget_(limits) {}

  Result<std::size_t> add(const PropertyList& value) {
    if (!budget_.takeObjects(1)) return refused("too many objects");
    if (!budget_.enter()) return refused("nested too deeply");
    auto number = std::visit([this](const auto& v) { return addValue(v); }, value.value());
    budget_.leave();
    return number;
  }

  [[nodiscard]] Data finish(std::size_t top) const {
    Output out{std::string(bplist::magic)};
    const std::size_t referenceSize = integerSize(objects_.size() - 1);
    std::vector<std::size_t> offsets;
    offsets.reserve(objects_.size());
    for (const Object& object : objects_) {
      offsets.push_back(out.bytes.size());
      write(object, referenceSize, out);
    }
    const std::size_t tableStart = out.bytes.size();
    const std::size_t offsetSize = integerSize(offsets.back());
    for (const std::size_t offset : offsets) {
      out.bigEndian(offset, offsetSize);
    }
    out.bytes.append(bplist::offsetSizeField, '\0');
    out.byte(static_cast<std::uint8_t>(offsetSize));
    out.byte(static_cast<std::uint8_t>(referenceSize));
    out.bigEndian(objects_.size(), 8);
    out.bigEndian(top, 8);
    out.bigEndian(tableStart, 8);
    return dataFromString(out.bytes);
  }

 private:
  struct Object {
    const std::string* scalar = nullptr;  // its bytes; null for the other two
    Kind kind = Kind::array;
    std::vector<std::size_t> references;  // of a dictionary: the keys, then the values
  };

  static void write(const Object& object, std::size_t referenceSize, Output& out) {
    if (object.scalar != nullptr) {
      out.bytes.append(*object.scalar);
      return;
    }
    const std::size_t perEntry = object.kind == Kind::dictionary ? 2 : 1;
    out.countedMarker(object.kind, object.references.size() / perEntry);
    for (const std::size_t reference : object.references) {
      out.bigEndian(reference, referenceSize);
    }
  }

  std::size_t addScalar(std::string bytes) {
    const auto [entry, isNew] = scalars_.try_emplace(std::move(bytes), objects_.size());
    if (isNew) objects_.push_back({&entry->first, Kind::constant, {}});
    return entry->second;
  }

  Result<std::size_t> addValue(bool value) { return addScalar(encoded(value)); }

  Result<std::size_t> addValue(const Number& value) {
    NumberEncoder encoder;
    std::visit(encoder, value.value);
    return addScalar(std::move(encoder.out.bytes));
  }

  Result<std::size_t> addValue(const Date& value) {
    // The last moments of the calendar round up to a double that is beyond it.
    const double seconds = value.referenceSeconds();
    if (value.nanoseconds > Date::latest.nanoseconds || !Date::fromReferenceSeconds(seconds)) {
      return refused("a date outside the calendar");
    }
    Output out;
    out.byte(bplist::dateMarker);
    out.bigEndian(std::bit_cast<std::uint64_t>(seconds), 8);
    return addScalar(std::move(out.bytes));
  }

  Result<std::size_t> addValue(const Data& value) {
    if (!budget_.takeBytes(value.size())) return refused("too many bytes");
    Output out;
    out.countedMarker(Kind::data, value.size());
    out.bytes.append(stringView(value));
    return addScalar(std::move(out.bytes));
  }

  Result<std::size_t> addValue(const std::string& value) {
    if (!budget_.takeBytes(value.size())) return refused("too many bytes");
    const auto units = utf16FromUTF8(value);
    if (!units) return refused("text that is not UTF-8");
    Output out;
    if (units->size() == value.size()) {
      out.countedMarker(Kind::asciiText, value.size());
      out.bytes.append(value);
      return addScalar(std::move(out.bytes));
    }
    out.countedMarker(Kind::utf16Text, units->size());
    for (const char16_t unit : *units) {
      out.bigEndian(unit, 2);
    }
    return addScalar(std::move(out.bytes));
  }

  /// A container gets its number before its contents, so that the root is object 0.
  std::size_t reserveNumber(Kind kind) {
    objects_.push_back({nullptr, kind, {}});
    return objects_.size() - 1;
  }

  Result<std::size_t> addValue(const PropertyList::Array& value) {
    const std::size_t number = reserveNumber(Kind::array);
    std::vector<std::size_t> references;
    references.reserve(value.size());
    for (const PropertyList& element : value) {
      const auto reference = add(element);
      if (!reference) return reference;
      references.push_back(*reference);
    }
    objects_[number].references = std::move(references);
    return number;
  }

  Result<std::size_t> addValue(const PropertyList::Dictionary& value) {
    if (bplist::hasDuplicates(value)) return refused("a key stands twice");
    const std::size_t number = reserveNumber(Kind::dictionary);
    std::vector<std::size_t> references;
    references.reserve(2 * value.size());
    for (const auto& entry : value) {
      if (!budget_.takeObjects(1)) return refused("too many objects");
      const auto key = addValue(entry.first);
      if (!key) return key;
      references.push_back(*key);
    }
    for (const auto& entry : value) {
      const auto reference = add(entry.second);
      if (!reference) return reference;
      references.push_back(*reference);
    }
    objects_[number].references = std::move(references);
    return number;
  }

  bplist::Budget budget_;
  std::vector<Object> objects_;
  std::unordered_map<std::string, std::size_t> scalars_;
};

}  // namespace

Result<Data> PropertyList::encode(const Limits& limits) const {
  Writer writer(limits);
  const auto top = writer.add(*this);
  if (!top) return fail(top.error());
  return writer.finish(*top);
}

}  // namespace mirabel
