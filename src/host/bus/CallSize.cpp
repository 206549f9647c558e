#include "host/bus/CallSize.h"

#include <cstdint>
#include <cstring>
#include <string_view>
#include <systemd/sd-bus.h>

namespace mirabel::bus {
namespace {

constexpr std::string_view numbers = "ynqiuxtd";
constexpr std::string_view texts = "sog";
constexpr std::string_view containers = "avre";
// Of a text beside its characters, or of a number, with what aligns it.
constexpr std::size_t sizeOfBasic = 8;

/// The library reads arrays of bytes one by one, which for a large one holds up everybody; what it
/// stands on hands them out as they lie there.
struct Lower : sdbus::Message {
  static sd_bus_message* of(sdbus::Message& call) {
    return static_cast<sd_bus_message*>(call.*(&Lower::msg_));
  }
};

/// What can't be read is left to whoever reads it for good.
class ArgumentSum {
 public:
  ArgumentSum(sd_bus_message* call, std::size_t most) : call_(call), most_(most) {}

  /// Up to the end of the container that was entered.
  bool add() {
    char type = 0;
    const char* contents = nullptr;
    while (sum_ <= most_ && sd_bus_message_peek_type(call_, &type, &contents) > 0)
      if (!addOne(type, contents)) return false;
    return sum_ <= most_;
  }
  [[nodiscard]] std::size_t value() const { return sum_; }

 private:
  static bool isOneOf(std::string_view types, char type) {
    return types.find(type) != std::string_view::npos;
  }

  bool addOne(char type, const char* contents) {
    if (type == SD_BUS_TYPE_ARRAY && isOneOf(numbers, contents[0])) return addNumbers(contents[0]);
    if (isOneOf(containers, type)) {
      sum_ += sizeOfBasic;
      return sd_bus_message_enter_container(call_, type, contents) > 0 && add() &&
             sd_bus_message_exit_container(call_) >= 0;
    }
    if (isOneOf(texts, type)) return addText(type);
    sum_ += sizeOfBasic;
    std::uint64_t number = 0;
    return sd_bus_message_read_basic(call_, type, &number) > 0;
  }

  bool addNumbers(char type) {
    const void* place = nullptr;
    std::size_t size = 0;
    if (sd_bus_message_read_array(call_, type, &place, &size) < 0) return false;
    sum_ += sizeOfBasic + size;
    return true;
  }

  bool addText(char type) {
    const char* text = nullptr;
    if (sd_bus_message_read_basic(call_, type, static_cast<void*>(&text)) <= 0) return false;
    sum_ += sizeOfBasic + std::strlen(text);
    return true;
  }

  sd_bus_message* call_;
  const std::size_t most_;
  std::size_t sum_ = 0;
};

}  // namespace

std::size_t sizeOfArguments(sdbus::Message& call, std::size_t most) {
  ArgumentSum sum(Lower::of(call), most);
  static_cast<void>(sum.add());
  call.rewind(true);
  return sum.value();
}

}  // namespace mirabel::bus
