#include "linux/watch/InotifyRecords.h"

#include <cstring>
#include <sys/inotify.h>

namespace mirabel {

bool decodeInotify(std::span<const std::byte> bytes,
                   const std::function<void(const InotifyRecord&)>& visit) {
  while (!bytes.empty()) {
    if (bytes.size() < sizeof(inotify_event)) return false;
    inotify_event header;
    std::memcpy(&header, bytes.data(), sizeof(header));
    if (header.len > bytes.size() - sizeof(header)) return false;
    const auto* padded = reinterpret_cast<const char*>(bytes.data()) + sizeof(header);
    const std::string_view name(padded, ::strnlen(padded, header.len));
    visit({header.wd, header.mask, name});
    bytes = bytes.subspan(sizeof(header) + header.len);
  }
  return true;
}

bool addLook(const InotifyRecord& record, std::optional<std::uint64_t> folder, LookList& looks) {
  if ((record.mask & IN_Q_OVERFLOW) != 0) return false;
  if (!folder || (record.mask & IN_IGNORED) != 0) return true;
  constexpr std::uint32_t entryBits =
      IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_DELETE_SELF;
  constexpr std::uint32_t contentBits = IN_MODIFY | IN_ATTRIB | IN_CLOSE_WRITE;
  Look& look = looks.at(*folder, record.name);
  // Which object was unlinked is not said. It is the one that the name stood for before all these
  // records only when nothing else has happened to the name yet.
  if ((record.mask & IN_DELETE) != 0 && !look.entryChanged) look.unlinked.emplace_back("?");
  if ((record.mask & entryBits) != 0) look.entryChanged = true;
  if ((record.mask & entryBits) != 0 && (record.mask & IN_ISDIR) != 0) look.isOfFolder = true;
  if ((record.mask & contentBits) != 0) look.contentChanged = true;
  return true;
}

}  // namespace mirabel
