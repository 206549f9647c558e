// Any bytes as one read of fanotify returned them: what is understood lies within them, and is the
// same when the kernel's records are written from it again.

#include <cstring>
#include <sys/fanotify.h>
#include <vector>

#include "Require.h"
#include "linux/watch/FanotifyRecords.h"

using namespace mirabel;

namespace {

using Bytes = std::vector<std::byte>;

template <class T>
void put(Bytes& bytes, const T& value) {
  const auto* raw = reinterpret_cast<const std::byte*>(&value);
  bytes.insert(bytes.end(), raw, raw + sizeof(value));
}

void put(Bytes& bytes, std::string_view text) {
  for (const char c : text)
    bytes.push_back(static_cast<std::byte>(c));
}

/// A handle begins with its type, which the kernel does not count.
void putInfo(Bytes& bytes, std::uint8_t type, std::string_view handle, const std::string* name) {
  const std::size_t start = bytes.size();
  put(bytes, fanotify_event_info_header{type, 0, 0});
  put(bytes, std::uint64_t{0});
  put(bytes, static_cast<std::uint32_t>(handle.size() - sizeof(std::int32_t)));
  put(bytes, handle);
  if (name != nullptr) put(bytes, std::string_view(name->c_str(), name->size() + 1));
  while ((bytes.size() - start) % 4 != 0)
    bytes.push_back({});
  const auto length = static_cast<std::uint16_t>(bytes.size() - start);
  std::memcpy(bytes.data() + start + offsetof(fanotify_event_info_header, len), &length,
              sizeof(length));
}

void putName(Bytes& bytes, std::uint8_t type, const std::optional<FanotifyRecord::Name>& place) {
  if (!place) return;
  const std::string name(place->name);
  putInfo(bytes, type, place->folder, &name);
}

Bytes written(const FanotifyRecord& record) {
  Bytes infos;
  putName(infos, FAN_EVENT_INFO_TYPE_DFID_NAME, record.place);
  putName(infos, FAN_EVENT_INFO_TYPE_OLD_DFID_NAME, record.from);
  putName(infos, FAN_EVENT_INFO_TYPE_NEW_DFID_NAME, record.to);
  if (!record.target.empty()) putInfo(infos, FAN_EVENT_INFO_TYPE_FID, record.target, nullptr);
  Bytes bytes;
  put(bytes,
      fanotify_event_metadata{
          static_cast<std::uint32_t>(sizeof(fanotify_event_metadata) + infos.size()),
          FANOTIFY_METADATA_VERSION, 0, sizeof(fanotify_event_metadata), record.mask, FAN_NOFD, 0});
  bytes.insert(bytes.end(), infos.begin(), infos.end());
  return bytes;
}

/// Lies within the bytes, if it is not empty.
void requireWithin(std::string_view view, std::span<const std::byte> bytes) {
  if (view.empty()) return;
  const auto* begin = reinterpret_cast<const char*>(bytes.data());
  require(view.data() >= begin && view.data() + view.size() <= begin + bytes.size());
}

void requireName(const std::optional<FanotifyRecord::Name>& place,
                 std::span<const std::byte> bytes) {
  if (!place) return;
  requireWithin(place->folder, bytes);
  requireWithin(place->name, bytes);
  require(place->name.find('\0') == std::string_view::npos);
}

bool areEqual(const FanotifyRecord& a, const FanotifyRecord& b) {
  return a.mask == b.mask && a.place == b.place && a.from == b.from && a.to == b.to &&
         a.target == b.target;
}

void requireSameAgain(const FanotifyRecord& record) {
  const Bytes again = written(record);
  std::size_t count = 0;
  require(decodeFanotify(again, [&](const FanotifyRecord& read) {
    require(areEqual(read, record));
    ++count;
  }));
  require(count == 1);
}

std::size_t sizeOf(const LookList& looks) {
  std::size_t size = 0;
  for (const auto& [folder, names] : looks.folders()) {
    for (const auto& [name, look] : names) {
      size += name.size();
      for (const auto* handles : {&look.objects, &look.unlinked})
        for (const std::string& handle : *handles)
          size += handle.size();
    }
  }
  return size;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::span bytes(reinterpret_cast<const std::byte*>(data), size);
  // Two folders in three are watched.
  const auto watched = [](std::string_view handle) -> std::optional<std::uint64_t> {
    const auto last = static_cast<unsigned char>(handle.back());
    return last % 3 == 0 ? std::nullopt : std::optional<std::uint64_t>(last % 3);
  };
  LookList looks;
  std::size_t count = 0;
  const bool isSound = decodeFanotify(bytes, [&](const FanotifyRecord& record) {
    ++count;
    for (const auto& place : {record.place, record.from, record.to})
      requireName(place, bytes);
    requireWithin(record.target, bytes);
    requireSameAgain(record);
    const bool isWhole = addLooks(record, watched, looks);
    require(isWhole == ((record.mask & FAN_Q_OVERFLOW) == 0));
  });
  require(count * sizeof(fanotify_event_metadata) <= size);
  require(!isSound || count > 0 || size == 0);
  // A record notes a name once, and its target with up to three of them, twice.
  require(sizeOf(looks) <= 6 * size);
  return 0;
}
