#include "linux/icons/KeyFile.h"

#include <cerrno>
#include <charconv>
#include <glib.h>
#include <string_view>
#include <utility>

#include "linux/icons/BoundedFile.h"

namespace mirabel {
namespace {

std::string_view trimmed(std::string_view text) {
  constexpr std::string_view blanks = " \t";
  const auto first = text.find_first_not_of(blanks);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

}  // namespace

struct KeyFile::Parsed {
  Parsed() : file(g_key_file_new()) {}
  ~Parsed() { g_key_file_unref(file); }
  Parsed(const Parsed&) = delete;
  Parsed& operator=(const Parsed&) = delete;

  GKeyFile* file;
};

KeyFile::KeyFile(std::unique_ptr<Parsed> parsed) : parsed_(std::move(parsed)) {}
KeyFile::~KeyFile() = default;
KeyFile::KeyFile(KeyFile&&) noexcept = default;
KeyFile& KeyFile::operator=(KeyFile&&) noexcept = default;

Result<KeyFile> KeyFile::read(const std::string& path, std::size_t limit) {
  const auto bytes = readBoundedFile(path, limit);
  if (!bytes) return fail(bytes.error());
  return parse(stringView(*bytes));
}

Result<KeyFile> KeyFile::parse(std::string_view text) {
  auto parsed = std::make_unique<Parsed>();
  if (!g_key_file_load_from_data(parsed->file, text.data(), text.size(), G_KEY_FILE_NONE,
                                 nullptr)) {
    return fail(Error::posix(EILSEQ, "it is no file of keys and values"));
  }
  return KeyFile(std::move(parsed));
}

std::optional<std::string> KeyFile::text(const std::string& group, const char* key) const {
  char* value = g_key_file_get_string(parsed_->file, group.c_str(), key, nullptr);
  if (value == nullptr) return {};
  std::string text(value);
  g_free(value);
  return text;
}

std::optional<int> KeyFile::number(const std::string& group, const char* key) const {
  const auto value = text(group, key);
  if (!value) return {};
  const std::string_view digits = trimmed(*value);
  int number = 0;
  const auto [end, failure] = std::from_chars(digits.data(), digits.data() + digits.size(), number);
  if (failure != std::errc() || end != digits.data() + digits.size()) return {};
  return number;
}

std::vector<std::string> KeyFile::list(const std::string& group, const char* key,
                                       std::size_t most) const {
  std::vector<std::string> parts;
  const auto value = text(group, key);
  std::string_view rest = value ? std::string_view(*value) : std::string_view();
  while (!rest.empty() && parts.size() < most) {
    const std::string_view part = rest.substr(0, rest.find(','));
    rest.remove_prefix(std::min(rest.size(), part.size() + 1));
    if (const auto name = trimmed(part); !name.empty()) parts.emplace_back(name);
  }
  return parts;
}

}  // namespace mirabel
