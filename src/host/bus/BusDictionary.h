#pragma once

#include <algorithm>
#include <array>
#include <optional>
#include <sdbus-c++/Message.h>
#include <sdbus-c++/Types.h>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <variant>
#include <vector>

#include "host/bus/BusItems.h"
#include "host/bus/BusText.h"
#include "mirabel/Values.h"

namespace mirabel::bus {

// How records are written as dictionaries a{sv}, and read from them by a table of their properties.

inline constexpr const char* dictionaryEntry = "sv";
inline constexpr std::string_view numberTypes = "xtd";

inline bool isAtEnd(sdbus::Message& message) {
  std::string type;
  std::string contents;
  message.peekType(type, contents);
  return type.empty() || type.front() == 0;
}

inline void write(sdbus::Message& message, const Date& date) {
  message.openStruct("xu");
  message << date.seconds << date.nanoseconds;
  message.closeStruct();
}

/// Writes one dictionary a{sv}.
class DictionaryWriter {
 public:
  explicit DictionaryWriter(sdbus::Message& message) : message_(message) {
    message_.openContainer("{sv}");
  }
  void end() { message_.closeContainer(); }

  template <class Value>
  void add(const char* key, const char* signature, const Value& value) {
    open(key, signature);
    message_ << value;
    close();
  }
  void addDate(const char* key, const std::optional<Date>& date) {
    if (!date) return;
    addWritten(key, "(xu)", [&](sdbus::Message& message) { write(message, *date); });
  }
  void addNumber(const char* key, const std::optional<Number>& number) {
    if (!number) return;
    if (const auto* whole = std::get_if<std::int64_t>(&number->value)) return add(key, "x", *whole);
    if (const auto* large = std::get_if<std::uint64_t>(&number->value))
      return add(key, "t", *large);
    add(key, "d", std::get<double>(number->value));
  }
  void addBytes(const char* key, std::string_view bytes) { add(key, "ay", dataFromString(bytes)); }
  void addText(const char* key, const std::string& text) {
    if (isBusText(text)) return add(key, "s", text);
    add(key, "s", shown(text));
    addBytes((std::string(key) + "Bytes").c_str(), text);
  }
  /// `write` puts in a value of that type.
  template <class Write>
  void addWritten(const char* key, const char* signature, const Write& write) {
    open(key, signature);
    write(message_);
    close();
  }

 private:
  void open(const char* key, const char* signature) {
    message_.openDictEntry(dictionaryEntry);
    message_ << key;
    message_.openVariant(signature);
  }
  void close() {
    message_.closeVariant();
    message_.closeDictEntry();
  }

  sdbus::Message& message_;
};

inline Date readDate(sdbus::Message& message) {
  Date date;
  message.enterStruct("xu");
  message >> date.seconds >> date.nanoseconds;
  message.exitStruct();
  // Whatever prints or compares dates relies on it.
  if (date.nanoseconds < 1'000'000'000) return date;
  throw sdbus::Error("org.freedesktop.DBus.Error.InconsistentMessage",
                     "the nanoseconds of a date are more than a second");
}

template <class Value>
Value readValue(sdbus::Message& message) {
  Value value{};
  message >> value;
  return value;
}

inline std::string readByteString(sdbus::Message& message) {
  return std::string(stringView(readBytes(message)));
}

inline Number readNumber(sdbus::Message& message, std::string_view signature) {
  if (signature == "x") return Number::of(readValue<std::int64_t>(message));
  if (signature == "t") return Number::of(readValue<std::uint64_t>(message));
  return Number::of(readValue<double>(message));
}

/// How the value under a key is read, if it is of one of the types that are expected there.
template <class Record>
struct Property {
  std::string_view key;
  std::string_view signatures;  ///< the type, or those of numbers
  void (*read)(sdbus::Message& message, std::string_view signature, Record& record);
};

template <class Record>
bool isExpected(const Property<Record>& property, std::string_view key,
                std::string_view signature) {
  if (property.key != key) return false;
  if (property.signatures == signature) return true;
  return property.signatures == numberTypes && signature.size() == 1 &&
         numberTypes.find(signature) != std::string_view::npos;
}

/// Reads a dictionary a{sv}; what no property expects is passed over.
template <class Record, std::size_t count>
Record readDictionary(sdbus::Message& message, const std::array<Property<Record>, count>& known) {
  Record record;
  message.enterContainer("{sv}");
  while (message.enterDictEntry(dictionaryEntry)) {
    const auto key = readValue<std::string>(message);
    std::string type;
    std::string signature;
    message.peekType(type, signature);
    const auto property = std::find_if(known.begin(), known.end(), [&](const auto& candidate) {
      return isExpected(candidate, key, signature);
    });
    if (property == known.end()) {
      sdbus::Variant ignored;
      message >> ignored;
    } else {
      message.enterVariant(signature);
      property->read(message, signature, record);
      message.exitVariant();
    }
    message.exitDictEntry();
  }
  message.clearFlags();
  message.exitContainer();
  return record;
}

template <auto member>
void readMember(sdbus::Message& message, std::string_view signature, auto& record) {
  using Value = std::remove_cvref_t<decltype(record.*member)>;
  if constexpr (std::is_same_v<Value, std::optional<Number>>) {
    record.*member = readNumber(message, signature);
  } else if constexpr (std::is_same_v<Value, std::optional<Date>>) {
    record.*member = readDate(message);
  } else if constexpr (std::is_same_v<Value, std::optional<Data>>) {
    record.*member = readBytes(message);
  } else if constexpr (std::is_same_v<Value, std::string> ||
                       std::is_same_v<Value, std::optional<std::string>>) {
    record.*member = signature == "s" ? readValue<std::string>(message) : readByteString(message);
  } else if constexpr (requires { typename Value::value_type; }) {
    record.*member = readValue<typename Value::value_type>(message);
  } else {
    record.*member = readValue<Value>(message);
  }
}

}  // namespace mirabel::bus
