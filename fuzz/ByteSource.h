#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

namespace mirabel {

/// What a target makes its values of: the bytes of an input from the front. Zeros once they are
/// used up, so that every input says something.
class ByteSource {
 public:
  ByteSource(const std::uint8_t* data, std::size_t size)
      : rest_(reinterpret_cast<const char*>(data), size) {}

  [[nodiscard]] bool isEmpty() const { return rest_.empty(); }
  std::string_view rest() { return take(rest_.size()); }

  std::uint8_t byte() {
    const std::string_view one = take(1);
    return one.empty() ? std::uint8_t{0} : static_cast<std::uint8_t>(one.front());
  }
  /// 0 to `count` - 1.
  std::size_t below(std::size_t count) { return byte() % count; }
  bool flag() { return (byte() & 1) != 0; }

  /// Little endian.
  template <class Integer>
  Integer integer() {
    std::uint64_t value = 0;
    for (std::size_t i = 0; i < sizeof(Integer); ++i)
      value |= std::uint64_t{byte()} << (8 * i);
    return static_cast<Integer>(value);
  }
  /// A byte with its length, then so many; for text that is to be read in a seed.
  std::string_view bytes() { return take(byte()); }

 private:
  std::string_view take(std::size_t count) {
    const std::string_view taken = rest_.substr(0, count);
    rest_.remove_prefix(taken.size());
    return taken;
  }

  std::string_view rest_;
};

/// Takes the text up to the separator off, and the separator.
inline std::string_view takeUpTo(std::string_view& rest, char separator) {
  const std::string_view taken = rest.substr(0, rest.find(separator));
  rest.remove_prefix(std::min(rest.size(), taken.size() + 1));
  return taken;
}

}  // namespace mirabel
