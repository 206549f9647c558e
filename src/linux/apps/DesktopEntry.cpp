#include "linux/apps/DesktopEntry.h"

#include <algorithm>
#include <cstddef>
#include <glib.h>
#include <iterator>
#include <memory>

#include "foundation/Unicode.h"

namespace mirabel {
namespace {

constexpr std::size_t longestName = 1024;
constexpr const char* group = G_KEY_FILE_DESKTOP_GROUP;

struct FreeKeyFile {
  void operator()(GKeyFile* file) const { g_key_file_free(file); }
};
struct FreeMemory {
  void operator()(char* text) const { g_free(text); }
};
using OwnedString = std::unique_ptr<char, FreeMemory>;

std::string_view trimmed(std::string_view text) {
  constexpr std::string_view spaces = " \t\r";
  const std::size_t start = text.find_first_not_of(spaces);
  if (start == std::string_view::npos) return {};
  return text.substr(start, text.find_last_not_of(spaces) + 1 - start);
}

bool isKeyThatCounts(std::string_view key) {
  constexpr std::string_view keys[] = {"Type", "Hidden", "Name", "Exec", "MimeType"};
  const std::string_view plain = trimmed(key.substr(0, key.find('[')));
  return plain.starts_with("X-Vessel-") || std::ranges::find(keys, plain) != std::end(keys);
}

// Most of an entry is translations and actions that nobody asks for here, and taking them in would
// cost more than all the rest. What is malformed stays, for the parser to refuse.
std::string linesThatCount(std::string_view bytes) {
  std::string lines;
  bool isInGroup = false;
  while (!bytes.empty()) {
    const std::string_view line = bytes.substr(0, bytes.find('\n'));
    bytes.remove_prefix(std::min(bytes.size(), line.size() + 1));
    const std::string_view content = trimmed(line);
    if (content.empty() || content.starts_with('#')) continue;
    if (content.starts_with('[')) {
      if (isInGroup) break;
      isInGroup = content.substr(1, content.size() - 2) == group;
    } else if (const auto end = content.find('='); isInGroup && end != std::string_view::npos) {
      if (!isKeyThatCounts(content.substr(0, end))) continue;
    }
    lines.append(line).append(1, '\n');
  }
  return lines;
}

class KeyFile {
 public:
  [[nodiscard]] bool load(std::string_view bytes) {
    OwnedString valid;
    if (!isUTF8(bytes)) {
      valid.reset(g_utf8_make_valid(bytes.data(), static_cast<gssize>(bytes.size())));
      bytes = valid.get();
    }
    // All translations: the environment's languages need not be those that are asked for.
    return g_key_file_load_from_data(file_.get(), bytes.data(), bytes.size(),
                                     G_KEY_FILE_KEEP_TRANSLATIONS, nullptr) != 0 &&
           g_key_file_has_group(file_.get(), group) != 0;
  }

  [[nodiscard]] std::optional<std::string> text(const std::string& key) const {
    const OwnedString value(g_key_file_get_string(file_.get(), group, key.c_str(), nullptr));
    if (!value) return std::nullopt;
    return std::string(value.get());
  }

  [[nodiscard]] std::optional<bool> boolean(const char* key) const {
    if (g_key_file_has_key(file_.get(), group, key, nullptr) == 0) return std::nullopt;
    return g_key_file_get_boolean(file_.get(), group, key, nullptr) != 0;
  }

 private:
  std::unique_ptr<GKeyFile, FreeKeyFile> file_{g_key_file_new()};
};

std::string cut(std::string name) {
  if (name.size() <= longestName) return name;
  std::size_t end = longestName;
  while (end > 0 && (static_cast<unsigned char>(name[end]) & 0xC0) == 0x80)
    --end;
  name.resize(end);
  return name;
}

std::optional<std::string> nameIn(const KeyFile& file, std::span<const std::string> languages) {
  std::optional<std::string> name;
  for (const std::string& language : languages) {
    // What is not translated is in this language.
    if (language == "C" || language == "POSIX") break;
    name = file.text("Name[" + language + "]");
    if (name && !name->empty()) return cut(std::move(*name));
  }
  name = file.text(G_KEY_FILE_DESKTOP_KEY_NAME);
  if (!name || name->empty()) return std::nullopt;
  return cut(std::move(*name));
}

// A field code that stands for files or URLs; "%%" is a percent sign.
bool takesFiles(std::string_view command) {
  for (std::size_t i = 0; i + 1 < command.size(); ++i) {
    if (command[i] != '%') continue;
    if (std::string_view("fFuU").find(command[++i]) != std::string_view::npos) return true;
  }
  return false;
}

bool namesTypes(std::string_view types) {
  return types.find_first_not_of("; \t") != std::string_view::npos;
}

}  // namespace

std::optional<DesktopEntry> DesktopEntry::parse(std::string_view bytes,
                                                std::span<const std::string> languages) {
  KeyFile file;
  if (bytes.find('\0') != std::string_view::npos || !file.load(linesThatCount(bytes)))
    return std::nullopt;
  DesktopEntry entry;
  entry.isApplication =
      file.text(G_KEY_FILE_DESKTOP_KEY_TYPE) == G_KEY_FILE_DESKTOP_TYPE_APPLICATION &&
      !file.boolean(G_KEY_FILE_DESKTOP_KEY_HIDDEN).value_or(false);
  if (!entry.isApplication) return entry;
  entry.localizedName = nameIn(file, languages);
  entry.supportsDocumentBrowser = file.boolean("X-Vessel-SupportsDocumentBrowser");
  entry.supportsOpenInPlace = file.boolean("X-Vessel-SupportsOpenInPlace");
  entry.fileSharingEnabled = file.boolean("X-Vessel-FileSharingEnabled");
  entry.opensFiles = takesFiles(file.text(G_KEY_FILE_DESKTOP_KEY_EXEC).value_or("")) &&
                     namesTypes(file.text(G_KEY_FILE_DESKTOP_KEY_MIME_TYPE).value_or(""));
  return entry;
}

std::vector<std::string> languagesOf(const std::vector<std::string>& locales) {
  std::vector<std::string> languages;
  const auto add = [&](const char* const* names) {
    for (; *names != nullptr; ++names)
      if (std::ranges::find(languages, *names) == languages.end()) languages.emplace_back(*names);
  };
  if (locales.empty()) add(g_get_language_names());
  for (const std::string& locale : locales) {
    char** variants = g_get_locale_variants(locale.c_str());
    add(variants);
    g_strfreev(variants);
  }
  return languages;
}

}  // namespace mirabel
