// What the kernel's records say to look at: tables from bytes to places, and bytes that no kernel
// writes.
#include <algorithm>
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

// "1/name=ec" for each place: e when the entry changed, c when the content did, "X" for each object
// that is said to be what it happened to, and "-X" for each that was unlinked.
std::string text(const LookList& looks) {
  std::vector<std::string> places;
  for (const auto& [folder, names] : looks.folders()) {
    for (const auto& [name, look] : names) {
      std::string place = std::to_string(folder) + "/" + name + "=";
      if (look.entryChanged) place += 'e';
      if (look.contentChanged) place += 'c';
      for (const std::string& object : look.objects)
        place += object.back();
      for (const std::string& object : look.unlinked)
        place += "-" + object.substr(object.size() - 1);
      places.push_back(place);
    }
  }
  std::ranges::sort(places);
  std::string all;
  for (const std::string& place : places)
    all += (all.empty() ? "" : " ") + place;
  return all;
}

// Folder A is watched as 1, B as 2; C is not.
std::optional<std::uint64_t> watched(std::string_view which) {
  if (which == handle('A')) return 1;
  if (which == handle('B')) return 2;
  return std::nullopt;
}

TEST(FanotifyRecords, SayWhereToLook) {
  constexpr std::uint8_t place = FAN_EVENT_INFO_TYPE_DFID_NAME, target = FAN_EVENT_INFO_TYPE_FID;
  constexpr std::uint8_t from = FAN_EVENT_INFO_TYPE_OLD_DFID_NAME;
  constexpr std::uint8_t to = FAN_EVENT_INFO_TYPE_NEW_DFID_NAME;
  struct Case {
    std::uint64_t mask;
    std::vector<Info> infos;
    const char* looks;
  };
  const Case cases[] = {
      {FAN_CREATE, {{place, 'A', "f"}, {target, 'x', nullptr}}, "1/f=ex"},
      {FAN_CREATE | FAN_ONDIR, {{place, 'B', "d"}}, "2/d=e"},
      {FAN_DELETE, {{place, 'A', "f"}, {target, 'x', nullptr}}, "1/f=ex-x"},
      {FAN_MODIFY, {{place, 'A', "f"}, {target, 'x', nullptr}}, "1/f=cx"},
      {FAN_ATTRIB, {{place, 'A', "f"}}, "1/f=c"},
      {FAN_CLOSE_WRITE, {{place, 'A', "f"}}, "1/f=c"},
      {FAN_CREATE | FAN_MODIFY | FAN_DELETE,
       {{place, 'A', "f"}, {target, 'x', nullptr}},
       "1/f=ecx-x"},
      {FAN_ATTRIB | FAN_ONDIR, {{place, 'A', "."}}, "1/=c"},
      {FAN_DELETE_SELF | FAN_ONDIR, {{place, 'A', "."}}, "1/=e"},
      {FAN_RENAME, {{from, 'A', "f"}, {to, 'B', "g"}, {target, 'x', nullptr}}, "1/f=e 2/g=e"},
      {FAN_RENAME, {{from, 'A', "f"}, {to, 'A', "g"}}, "1/f=e 1/g=e"},
      {FAN_RENAME, {{from, 'A', "f"}}, "1/f=e"},
      {FAN_RENAME, {{to, 'B', "g"}}, "2/g=e"},
      {FAN_RENAME, {{from, 'C', "f"}, {to, 'B', "g"}}, "2/g=e"},
      {FAN_CREATE, {{place, 'C', "f"}}, ""},
      {FAN_CREATE, {{99, 'A', "f"}}, ""},
  };
  for (const Case& one : cases) {
    LookList looks;
    bool isHeard = true;
    EXPECT_TRUE(
        decodeFanotify(bytesOf(fanotifyRecord(one.mask, one.infos)),
                       [&](const auto& record) { isHeard = addLooks(record, watched, looks); }));
    EXPECT_TRUE(isHeard);
    EXPECT_EQ(text(looks), one.looks) << std::hex << one.mask;
  }
}

TEST(FanotifyRecords, AreMergedByPlaceAndTellOfAnOverflow) {
  Bytes bytes;
  const std::vector<Info> infos{{FAN_EVENT_INFO_TYPE_DFID_NAME, 'A', "f"},
                                {FAN_EVENT_INFO_TYPE_FID, 'x', nullptr}};
  bytes += (fanotifyRecord(FAN_CREATE, infos));
  bytes += (fanotifyRecord(FAN_Q_OVERFLOW, {}));
  bytes += (fanotifyRecord(FAN_MODIFY, infos));
  LookList looks;
  int lost = 0;
  EXPECT_TRUE(decodeFanotify(bytesOf(bytes), [&](const auto& record) {
    if (!addLooks(record, watched, looks)) ++lost;
  }));
  EXPECT_EQ(lost, 1);
  EXPECT_EQ(text(looks), "1/f=ecx");
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

TEST(InotifyRecords, SayWhereToLook) {
  struct Case {
    std::vector<std::pair<std::uint32_t, const char*>> records;
    const char* looks;
    bool isHeard = true;
  };
  const Case cases[] = {
      {{{IN_CREATE, "f"}}, "7/f=e"},
      {{{IN_DELETE, "f"}}, "7/f=e-?"},
      {{{IN_MODIFY, "f"}, {IN_CLOSE_WRITE, "f"}}, "7/f=c"},
      {{{IN_MOVED_FROM, "f"}, {IN_MOVED_TO, "g"}}, "7/f=e 7/g=e"},
      // What is deleted at last is not what the name stood for at first.
      {{{IN_MOVED_TO, "f"}, {IN_DELETE, "f"}}, "7/f=e"},
      {{{IN_ATTRIB | IN_ISDIR, ""}}, "7/=c"},
      {{{IN_IGNORED, ""}}, ""},
      {{{IN_Q_OVERFLOW, ""}}, "", false},
  };
  for (const Case& one : cases) {
    Bytes bytes;
    for (const auto& [mask, name] : one.records) {
      const std::size_t padded = name[0] == '\0' ? 0 : (std::strlen(name) / 16 + 1) * 16;
      put(bytes, inotify_event{3, mask, 0, static_cast<std::uint32_t>(padded)});
      Bytes text(name);
      text.resize(padded);
      bytes += text;
    }
    LookList looks;
    bool isHeard = true;
    EXPECT_TRUE(decodeInotify(bytesOf(bytes), [&](const InotifyRecord& record) {
      EXPECT_EQ(record.watch, 3);
      if (!addLook(record, 7, looks)) isHeard = false;
    }));
    EXPECT_EQ(isHeard, one.isHeard);
    EXPECT_EQ(text(looks), one.looks);
    for (std::size_t length = 1; length < sizeof(inotify_event); ++length)
      EXPECT_FALSE(decodeInotify(bytesOf(bytes).first(length), [](const auto&) {}));
  }
}

}  // namespace
}  // namespace mirabel
