// What the kernel's records say to look at, and bytes that no kernel writes.
#include <cstring>
#include <gtest/gtest.h>
#include <span>
#include <string>
#include <sys/fanotify.h>
#include <sys/inotify.h>
#include <vector>

#include "linux/watch/FanotifyRecords.h"
#include "linux/watch/InotifyRecords.h"

namespace mirabel {
namespace {

using Bytes = std::string;

std::span<const std::byte> bytesOf(const Bytes& bytes) {
  return std::as_bytes(std::span(bytes));
}

template <class T>
void put(Bytes& bytes, const T& value) {
  bytes.append(reinterpret_cast<const char*>(&value), sizeof(value));
}

// A handle of type 1 as `handleAt` gives it: its type, and 8 bytes.
std::string handle(char which) {
  return std::string("\1\0\0\0", 4) + std::string(8, which);
}

struct Info {
  std::uint8_t type;
  char which;
  const char* name;  // null: none
};

Bytes fanotifyRecord(std::uint64_t mask, const std::vector<Info>& infos) {
  Bytes body;
  for (const Info& info : infos) {
    Bytes one;
    put(one, fanotify_event_info_header{info.type, 0, 0});
    put(one, std::uint64_t{0});  // the file system
    put(one, std::uint32_t{8});
    one += handle(info.which);
    if (info.name != nullptr) one.append(info.name).push_back('\0');
    one.resize((one.size() + 3) / 4 * 4);
    const auto length = static_cast<std::uint16_t>(one.size());
    std::memcpy(one.data() + offsetof(fanotify_event_info_header, len), &length, sizeof(length));
    body += one;
  }
  Bytes bytes;
  put(bytes, fanotify_event_metadata{
                 static_cast<std::uint32_t>(sizeof(fanotify_event_metadata) + body.size()),
                 FANOTIFY_METADATA_VERSION, 0, sizeof(fanotify_event_metadata), mask, FAN_NOFD, 0});
  return bytes + body;
}

// Folder A is watched as 1, B as 2; C is not.
std::optional<std::uint64_t> watched(std::string_view which) {
  if (which == handle('A')) return 1;
  if (which == handle('B')) return 2;
  return std::nullopt;
}

// What each record says is tested with the kernel's own.
TEST(FanotifyRecords, AreMergedByPlaceAndTellOfAnOverflowAndOfNothingElsewhere) {
  constexpr std::uint8_t place = FAN_EVENT_INFO_TYPE_DFID_NAME, target = FAN_EVENT_INFO_TYPE_FID;
  constexpr std::uint8_t from = FAN_EVENT_INFO_TYPE_OLD_DFID_NAME;
  constexpr std::uint8_t to = FAN_EVENT_INFO_TYPE_NEW_DFID_NAME;
  const std::vector<Info> infos{{place, 'A', "f"}, {target, 'x', nullptr}};
  const Bytes bytes = fanotifyRecord(FAN_CREATE, infos) + fanotifyRecord(FAN_Q_OVERFLOW, {}) +
                      fanotifyRecord(FAN_MODIFY | FAN_DELETE, infos) +
                      fanotifyRecord(FAN_RENAME, {{from, 'C', "f"}, {to, 'B', "g"}}) +
                      fanotifyRecord(FAN_CREATE, {{place, 'C', "f"}}) +
                      fanotifyRecord(FAN_CREATE, {{99, 'B', "f"}});
  LookList looks;
  int lost = 0;
  EXPECT_TRUE(decodeFanotify(bytesOf(bytes), [&](const auto& record) {
    if (!addLooks(record, watched, looks)) ++lost;
  }));
  EXPECT_EQ(lost, 1);
  ASSERT_EQ(looks.folders().size(), 2u);
  const Look& look = looks.folders().at(1).at("f");
  EXPECT_TRUE(look.entryChanged && look.contentChanged);
  EXPECT_EQ(look.unlinked, std::vector{handle('x')});
  EXPECT_TRUE(looks.folders().at(2).at("g").entryChanged);
  EXPECT_EQ(looks.folders().at(2).size(), 1u);
}

TEST(FanotifyRecords, ThatNoKernelWritesAreRefusedWithinTheirBounds) {
  const Bytes whole = fanotifyRecord(FAN_RENAME, {{FAN_EVENT_INFO_TYPE_OLD_DFID_NAME, 'A', "from"},
                                                  {FAN_EVENT_INFO_TYPE_NEW_DFID_NAME, 'B', "to"}});
  const auto decode = [](const Bytes& bytes) {
    return decodeFanotify(bytesOf(bytes), [](const FanotifyRecord& record) {
      LookList looks;
      static_cast<void>(addLooks(record, watched, looks));
    });
  };
  ASSERT_TRUE(decode(whole));
  for (std::size_t length = 1; length < whole.size(); ++length)
    EXPECT_FALSE(decode(whole.substr(0, length)));
  // Whatever a damaged byte makes of it, nothing beyond the bytes is read.
  for (std::size_t at = 0; at < whole.size(); ++at) {
    for (const int flip : {0x01, 0x80, 0xFF}) {
      Bytes damaged = whole;
      damaged[at] = static_cast<char>(damaged[at] ^ flip);
      static_cast<void>(decode(damaged));
    }
  }
}

TEST(InotifyRecords, TellOfAnOverflowAndOfWhatWasUnlinked) {
  struct Case {
    std::vector<std::uint32_t> masks;
    bool isHeard = true, isUnlinked = false;
  };
  const Case cases[] = {
      {{IN_DELETE}, true, true},
      // What is deleted at last is not what the name stood for at first.
      {{IN_MOVED_TO, IN_DELETE}},
      {{IN_CREATE, IN_Q_OVERFLOW}, false},
  };
  for (const Case& one : cases) {
    Bytes bytes;
    for (const std::uint32_t mask : one.masks) {
      put(bytes, inotify_event{3, mask, 0, 16});
      bytes += 'f' + std::string(15, '\0');
    }
    LookList looks;
    bool isHeard = true;
    EXPECT_TRUE(decodeInotify(bytesOf(bytes), [&](const InotifyRecord& record) {
      EXPECT_EQ(record.watch, 3);
      if (!addLook(record, 7, looks)) isHeard = false;
    }));
    EXPECT_EQ(isHeard, one.isHeard);
    EXPECT_EQ(!looks.folders().at(7).at("f").unlinked.empty(), one.isUnlinked);
    for (std::size_t length = 1; length < sizeof(inotify_event); ++length)
      EXPECT_FALSE(decodeInotify(bytesOf(bytes).first(length), [](const auto&) {}));
  }
}

}  // namespace
}  // namespace mirabel
