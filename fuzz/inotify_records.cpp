// Any bytes as one read of inotify returned them: what is understood lies within them, and is the
// same when the kernel's records are written from it again.

#include <sys/inotify.h>
#include <vector>

#include "Require.h"
#include "linux/watch/InotifyRecords.h"

using namespace mirabel;

namespace {

using Bytes = std::vector<std::byte>;

Bytes written(const InotifyRecord& record) {
  // The kernel pads names with NULs to a multiple of the record's size.
  const std::size_t room = record.name.empty() ? 0
                                               : (record.name.size() / sizeof(inotify_event) + 1) *
                                                     sizeof(inotify_event);
  const inotify_event event{record.watch, record.mask, 0, static_cast<std::uint32_t>(room)};
  const auto* raw = reinterpret_cast<const std::byte*>(&event);
  Bytes bytes(raw, raw + sizeof(event));
  for (const char c : record.name)
    bytes.push_back(static_cast<std::byte>(c));
  bytes.resize(sizeof(event) + room);
  return bytes;
}

void requireSameAgain(const InotifyRecord& record) {
  const Bytes again = written(record);
  std::size_t count = 0;
  require(decodeInotify(again, [&](const InotifyRecord& read) {
    require(read.watch == record.watch && read.mask == record.mask && read.name == record.name);
    ++count;
  }));
  require(count == 1);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::span bytes(reinterpret_cast<const std::byte*>(data), size);
  const auto* begin = reinterpret_cast<const char*>(data);
  LookList looks;
  std::size_t count = 0;
  const bool isSound = decodeInotify(bytes, [&](const InotifyRecord& record) {
    ++count;
    require(record.name.empty() || (record.name.data() >= begin &&
                                    record.name.data() + record.name.size() <= begin + size));
    require(record.name.find('\0') == std::string_view::npos);
    requireSameAgain(record);
    const auto folder =
        record.watch % 3 == 0 ? std::nullopt : std::optional(std::uint64_t(record.watch & 3));
    const bool isWhole = addLook(record, folder, looks);
    require(isWhole == ((record.mask & IN_Q_OVERFLOW) == 0));
  });
  require(count * sizeof(inotify_event) <= size);
  require(!isSound || count > 0 || size == 0);
  std::size_t places = 0;
  for (const auto& [folder, names] : looks.folders())
    places += names.size();
  require(places <= count);
  return 0;
}
