// Any bytes: no desktop entry, or an application that is the same when it is written and read
// again. The path of an entry is the first line; it has an identifier where it is one by its name.

#include <string>
#include <vector>

#include "ByteSource.h"
#include "Require.h"
#include "foundation/Unicode.h"
#include "linux/apps/ApplicationIdentifier.h"
#include "linux/apps/DesktopEntry.h"

using namespace mirabel;

namespace {

constexpr std::size_t longestName = 1024;

void add(std::string& text, const char* key, const std::optional<bool>& value) {
  if (value) text += std::string(key) + (*value ? "=true\n" : "=false\n");
}

/// A value as key files hold it: spaces at its beginning and controls have escapes.
std::string escaped(std::string_view value) {
  constexpr std::string_view special = " \n\t\r\\";
  std::string text;
  for (const char c : value) {
    const std::size_t which = special.find(c);
    if (which == std::string_view::npos) {
      text += c;
    } else {
      text += '\\';
      text += "sntr\\"[which];
    }
  }
  return text;
}

std::string written(const DesktopEntry& entry) {
  std::string text = "[Desktop Entry]\n";
  text += entry.isApplication ? "Type=Application\n" : "Type=Link\n";
  if (entry.localizedName) text += "Name=" + escaped(*entry.localizedName) + "\n";
  add(text, "X-Vessel-SupportsDocumentBrowser", entry.supportsDocumentBrowser);
  add(text, "X-Vessel-SupportsOpenInPlace", entry.supportsOpenInPlace);
  add(text, "X-Vessel-FileSharingEnabled", entry.fileSharingEnabled);
  text += entry.opensFiles ? "Exec=program %%f %f\nMimeType=text/plain;\n" : "Exec=program %%f\n";
  return text;
}

bool areEqual(const DesktopEntry& a, const DesktopEntry& b) {
  return a.isApplication == b.isApplication && a.localizedName == b.localizedName &&
         a.supportsDocumentBrowser == b.supportsDocumentBrowser &&
         a.supportsOpenInPlace == b.supportsOpenInPlace &&
         a.fileSharingEnabled == b.fileSharingEnabled && a.opensFiles == b.opensFiles;
}

void checkEntry(std::string_view bytes, const std::vector<std::string>& languages) {
  const auto entry = DesktopEntry::parse(bytes, languages);
  if (!entry) return;
  require(entry->isApplication || areEqual(*entry, DesktopEntry()));
  if (const auto& name = entry->localizedName)
    require(!name->empty() && name->size() <= longestName && isUTF8(*name));
  const auto again = DesktopEntry::parse(written(*entry), languages);
  require(again && areEqual(*again, *entry));
}

void checkIdentifier(std::string_view path) {
  const auto identifier = identifierOfEntry(path);
  require(identifier.has_value() == path.ends_with(desktopEntrySuffix));
  if (!identifier || !isApplicationIdentifier(*identifier)) return;
  // It names a folder, below whatever it is put, and an entry of its own.
  require(identifier->find('/') == std::string::npos && *identifier != "." && *identifier != "..");
  require(identifierOfEntry(*identifier + std::string(desktopEntrySuffix)) == identifier);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const auto german = languagesOf({"de_AT.UTF-8", "C"});
  static const auto english = languagesOf({"C"});
  std::string_view bytes(reinterpret_cast<const char*>(data), size);
  checkIdentifier(takeUpTo(bytes, '\n'));
  checkEntry(bytes, german);
  checkEntry(bytes, english);
  return 0;
}
