#pragma once

#include <array>
#include <functional>
#include <sdbus-c++/sdbus-c++.h>
#include <string>
#include <string_view>

#include "ByteSource.h"
#include "host/bus/BusText.h"

namespace sdbus {

// The library's variants are made of such messages, but no header of it declares this.
PlainMessage createPlainMessage();

}  // namespace sdbus

namespace mirabel {

/// Makes messages of bytes: whatever types and values another program may send. It writes what the
/// bus would let through, so texts are text.
class BusMessages {
 public:
  explicit BusMessages(ByteSource& source) : source_(source) {}

  /// A message as it is received.
  static sdbus::PlainMessage sent(const std::function<void(sdbus::Message&)>& write) {
    sdbus::PlainMessage message = sdbus::createPlainMessage();
    write(message);
    message.seal();
    message.rewind(true);
    return message;
  }

  /// a{sv} whose keys are mostly those that are given.
  template <class Keys>
  void dictionary(sdbus::Message& message, const Keys& keys) {
    message.openContainer("{sv}");
    for (std::size_t left = source_.below(mostEntries); left > 0 && !source_.isEmpty(); --left) {
      message.openDictEntry("sv");
      const std::size_t which = source_.below(std::size(keys) + 1);
      message << (which < std::size(keys) ? std::string(keys[which]) : text());
      variant(message);
      message.closeDictEntry();
    }
    message.closeContainer();
  }
  /// A value of a type of its own choice.
  void variant(sdbus::Message& message) {
    const char* const signature = signatures[source_.below(signatures.size())];
    message.openVariant(signature);
    value(message, signature);
    message.closeVariant();
  }
  std::string text() { return bus::shown(source_.bytes()); }

 private:
  static constexpr std::size_t mostEntries = 32;
  static constexpr std::array signatures{"s",     "ay", "x", "t", "d", "q", "b",     "(xu)", "as",
                                         "a(ss)", "u",  "i", "n", "y", "v", "a{sv}", "aay",  "(s)"};

  void value(sdbus::Message& message, std::string_view signature) {
    if (signature == "s") return put(message, text());
    if (signature == "x") return put(message, source_.integer<std::int64_t>());
    if (signature == "t") return put(message, source_.integer<std::uint64_t>());
    if (signature == "d") return put(message, real());
    if (signature == "q") return put(message, source_.integer<std::uint16_t>());
    if (signature == "b") return put(message, source_.flag());
    if (signature == "u") return put(message, source_.integer<std::uint32_t>());
    if (signature == "i") return put(message, source_.integer<std::int32_t>());
    if (signature == "n") return put(message, source_.integer<std::int16_t>());
    if (signature == "y") return put(message, source_.byte());
    if (signature == "v") return variantWithin(message);
    if (signature == "ay") return list(message, signature, source_.byte());
    if (signature.starts_with('a')) return list(message, signature, source_.below(4));
    structure(message, signature);
  }

  template <class Value>
  static void put(sdbus::Message& message, const Value& value) {
    message << value;
  }
  double real() {
    const auto bits = source_.integer<std::uint64_t>();
    double number = 0;
    static_assert(sizeof(number) == sizeof(bits));
    std::copy_n(reinterpret_cast<const char*>(&bits), sizeof(bits),
                reinterpret_cast<char*>(&number));
    return number;
  }
  void variantWithin(sdbus::Message& message) {
    message.openVariant("s");
    message << text();
    message.closeVariant();
  }
  void list(sdbus::Message& message, std::string_view signature, std::size_t count) {
    const std::string element(signature.substr(1));
    message.openContainer(element);
    for (; count > 0; --count) {
      if (element == "{sv}") {
        message.openDictEntry("sv");
        message << text();
        variantWithin(message);
        message.closeDictEntry();
      } else {
        value(message, element);
      }
    }
    message.closeContainer();
  }
  /// Of basic types.
  void structure(sdbus::Message& message, std::string_view signature) {
    const std::string_view fields = signature.substr(1, signature.size() - 2);
    message.openStruct(std::string(fields));
    for (std::size_t i = 0; i < fields.size(); ++i)
      value(message, fields.substr(i, 1));
    message.closeStruct();
  }

  ByteSource& source_;
};

}  // namespace mirabel
