#include "linux/watch/FanotifyRecords.h"

#include <cstring>
#include <sys/fanotify.h>

namespace mirabel {
namespace {

constexpr std::size_t headerSize = sizeof(fanotify_event_info_header);
constexpr std::size_t fileSystemSize = sizeof(fanotify_event_info_fid::fsid);
// The fields of the kernel's file_handle before its bytes: their count and the handle's type.
constexpr std::size_t countSize = sizeof(std::uint32_t);
constexpr std::size_t typeSize = sizeof(std::int32_t);

template <class T>
T read(std::span<const std::byte> bytes, std::size_t offset) {
  T value;
  std::memcpy(&value, bytes.data() + offset, sizeof(value));
  return value;
}

std::string_view text(std::span<const std::byte> bytes) {
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

// A handle, and behind it, where there is one, a name that ends with a NUL.
std::optional<FanotifyRecord::Name> handleAndName(std::span<const std::byte> info) {
  if (info.size() < headerSize + fileSystemSize + countSize + typeSize) return std::nullopt;
  info = info.subspan(headerSize + fileSystemSize);
  const std::size_t count = read<std::uint32_t>(info, 0);
  info = info.subspan(countSize);
  if (info.size() < typeSize || count > info.size() - typeSize) return std::nullopt;
  const std::string_view rest = text(info.subspan(typeSize + count));
  return FanotifyRecord::Name{text(info.first(typeSize + count)), rest.substr(0, rest.find('\0'))};
}

bool decodeInfo(std::span<const std::byte> info, FanotifyRecord& record) {
  const auto type = static_cast<std::uint8_t>(info[0]);
  if (type != FAN_EVENT_INFO_TYPE_FID && type != FAN_EVENT_INFO_TYPE_DFID &&
      type != FAN_EVENT_INFO_TYPE_DFID_NAME && type != FAN_EVENT_INFO_TYPE_OLD_DFID_NAME &&
      type != FAN_EVENT_INFO_TYPE_NEW_DFID_NAME) {
    return true;  // later kernels may add what is not asked for
  }
  const auto decoded = handleAndName(info);
  if (!decoded) return false;
  if (type == FAN_EVENT_INFO_TYPE_FID) {
    record.target = decoded->folder;
  } else if (type == FAN_EVENT_INFO_TYPE_OLD_DFID_NAME) {
    record.from = decoded;
  } else if (type == FAN_EVENT_INFO_TYPE_NEW_DFID_NAME) {
    record.to = decoded;
  } else {
    record.place = decoded;
  }
  return true;
}

bool decodeRecord(std::span<const std::byte> bytes, FanotifyRecord& record) {
  const auto metadata = read<fanotify_event_metadata>(bytes, 0);
  record.mask = metadata.mask;
  if (metadata.metadata_len < sizeof(metadata) || metadata.metadata_len > bytes.size()) {
    return false;
  }
  bytes = bytes.subspan(metadata.metadata_len);
  while (!bytes.empty()) {
    if (bytes.size() < headerSize) return false;
    const std::size_t length = read<fanotify_event_info_header>(bytes, 0).len;
    if (length < headerSize || length > bytes.size()) return false;
    if (!decodeInfo(bytes.first(length), record)) return false;
    bytes = bytes.subspan(length);
  }
  return true;
}

// A file that is written to has a record for each write, mostly one after the other.
void note(std::string_view object, Look& look) {
  if (object.empty() || (!look.objects.empty() && look.objects.back() == object)) return;
  look.objects.emplace_back(object);
}

}  // namespace

bool decodeFanotify(std::span<const std::byte> bytes,
                    const std::function<void(const FanotifyRecord&)>& visit) {
  while (!bytes.empty()) {
    if (bytes.size() < sizeof(fanotify_event_metadata)) return false;
    const auto metadata = read<fanotify_event_metadata>(bytes, 0);
    if (metadata.vers != FANOTIFY_METADATA_VERSION || metadata.event_len < sizeof(metadata) ||
        metadata.event_len > bytes.size()) {
      return false;
    }
    FanotifyRecord record;
    if (!decodeRecord(bytes.first(metadata.event_len), record)) return false;
    visit(record);
    bytes = bytes.subspan(metadata.event_len);
  }
  return true;
}

bool addLooks(const FanotifyRecord& record, const WatchedFolder& watched, LookList& looks) {
  if ((record.mask & FAN_Q_OVERFLOW) != 0) return false;
  constexpr std::uint64_t entryBits =
      FAN_CREATE | FAN_DELETE | FAN_RENAME | FAN_DELETE_SELF | FAN_MOVE_SELF;
  constexpr std::uint64_t contentBits = FAN_MODIFY | FAN_ATTRIB | FAN_CLOSE_WRITE;
  for (const auto& place : {record.place, record.from, record.to}) {
    if (!place) continue;
    const auto folder = watched(place->folder);
    if (!folder) continue;
    Look& look = looks.at(*folder, place->name == "." ? std::string_view() : place->name);
    if ((record.mask & entryBits) != 0) look.entryChanged = true;
    if ((record.mask & entryBits) != 0 && (record.mask & FAN_ONDIR) != 0) look.isOfFolder = true;
    if ((record.mask & contentBits) != 0) look.contentChanged = true;
    if ((record.mask & (FAN_CREATE | FAN_DELETE | contentBits)) != 0) note(record.target, look);
    if ((record.mask & FAN_DELETE) != 0) look.unlinked.emplace_back(record.target);
  }
  return true;
}

}  // namespace mirabel
