#include "mirabel/Values.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <random>
#include <type_traits>
#include <utility>

namespace mirabel {

Data dataFromString(std::string_view bytes) {
  return {bytes.begin(), bytes.end()};
}

std::string_view stringView(const Data& data) {
  return {reinterpret_cast<const char*>(data.data()), data.size()};
}

namespace {

// The first double that is too large for the type: both are powers of two, and exact.
constexpr double signedEnd = 0x1p63;
constexpr double unsignedEnd = 0x1p64;

std::optional<std::int64_t> exactSigned(double v) {
  if (!(v >= -signedEnd && v < signedEnd) || v != std::trunc(v)) return std::nullopt;
  return static_cast<std::int64_t>(v);
}

std::optional<std::uint64_t> exactUnsigned(double v) {
  if (!(v >= 0 && v < unsignedEnd) || v != std::trunc(v)) return std::nullopt;
  return static_cast<std::uint64_t>(v);
}

bool isEqual(double a, double b) {
  return a == b || (std::isnan(a) && std::isnan(b));
}
// The integer is never converted: beyond 2^53 its neighbours share one double.
bool isEqual(std::int64_t a, double b) {
  return exactSigned(b) == a;
}
bool isEqual(std::uint64_t a, double b) {
  return exactUnsigned(b) == a;
}
bool isEqual(double a, std::int64_t b) {
  return isEqual(b, a);
}
bool isEqual(double a, std::uint64_t b) {
  return isEqual(b, a);
}
template <class A, class B>
requires std::is_integral_v<A> && std::is_integral_v<B>
bool isEqual(A a, B b) {
  return std::cmp_equal(a, b);
}

template <class T>
std::string shortestText(T v) {
  std::array<char, 32> text;
  const auto end = std::to_chars(text.data(), text.data() + text.size(), v).ptr;
  return {text.data(), end};
}

}  // namespace

std::optional<std::uint64_t> Number::asUnsigned() const {
  if (const auto* u = std::get_if<std::uint64_t>(&value)) return *u;
  if (const auto* d = std::get_if<double>(&value)) return exactUnsigned(*d);
  const std::int64_t i = std::get<std::int64_t>(value);
  if (i < 0) return std::nullopt;
  return static_cast<std::uint64_t>(i);
}

double Number::asDouble() const {
  return std::visit([](auto v) { return static_cast<double>(v); }, value);
}

std::string Number::description() const {
  return std::visit([](auto v) { return shortestText(v); }, value);
}

bool operator==(const Number& a, const Number& b) {
  return std::visit([](auto x, auto y) { return isEqual(x, y); }, a.value, b.value);
}

namespace {

constexpr std::size_t uuidTextLength = 36;

bool isHyphenPosition(std::size_t i) {
  return i == 8 || i == 13 || i == 18 || i == 23;
}

std::optional<std::uint8_t> hexDigit(char c) {
  if (c >= '0' && c <= '9') return static_cast<std::uint8_t>(c - '0');
  if (c >= 'a' && c <= 'f') return static_cast<std::uint8_t>(c - 'a' + 10);
  if (c >= 'A' && c <= 'F') return static_cast<std::uint8_t>(c - 'A' + 10);
  return std::nullopt;
}

}  // namespace

UUID UUID::random() {
  std::random_device source;
  UUID uuid;
  for (std::size_t i = 0; i < uuid.bytes.size(); i += 4) {
    const std::uint32_t word = source();
    for (std::size_t j = 0; j < 4; ++j) {
      uuid.bytes[i + j] = static_cast<std::uint8_t>(word >> (8 * j));
    }
  }
  uuid.bytes[6] = static_cast<std::uint8_t>((uuid.bytes[6] & 0x0F) | 0x40);  // version 4
  uuid.bytes[8] = static_cast<std::uint8_t>((uuid.bytes[8] & 0x3F) | 0x80);  // variant 1
  return uuid;
}

std::optional<UUID> UUID::fromString(std::string_view text) {
  if (text.size() != uuidTextLength) return std::nullopt;
  UUID uuid;
  std::size_t digits = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (isHyphenPosition(i)) {
      if (text[i] != '-') return std::nullopt;
      continue;
    }
    const auto digit = hexDigit(text[i]);
    if (!digit) return std::nullopt;
    std::uint8_t& byte = uuid.bytes[digits / 2];
    byte = static_cast<std::uint8_t>(byte << 4 | *digit);
    ++digits;
  }
  return uuid;
}

std::string UUID::description() const {
  static constexpr std::string_view digits = "0123456789ABCDEF";
  std::string text;
  text.reserve(uuidTextLength);
  for (const std::uint8_t byte : bytes) {
    if (isHyphenPosition(text.size())) text.push_back('-');
    text.push_back(digits[byte >> 4]);
    text.push_back(digits[byte & 0x0F]);
  }
  return text;
}

}  // namespace mirabel
