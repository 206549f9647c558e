#include "linux/files/TypeTable.h"

#include <gio/gio.h>
#include <memory>
#include <mutex>
#include <sys/stat.h>

#include "linux/files/PackageTypes.h"

namespace mirabel {
namespace {

// Names with a random ending would fill the memory; past this many the table starts over.
constexpr std::size_t mostEndings = 4096;
constexpr std::size_t longestEnding = 32;

struct FreeString {
  void operator()(char* text) const { g_free(text); }
};
using OwnedString = std::unique_ptr<char, FreeString>;

const std::string& typeOfSpecialFile(std::uint16_t mode) {
  static const std::string fifo = "inode/fifo";
  static const std::string socket = "inode/socket";
  static const std::string character = "inode/chardevice";
  static const std::string block = "inode/blockdevice";
  static const std::string unknown = "application/octet-stream";
  switch (mode & S_IFMT) {
    case S_IFIFO:
      return fifo;
    case S_IFSOCK:
      return socket;
    case S_IFCHR:
      return character;
    case S_IFBLK:
      return block;
    default:
      return unknown;
  }
}

}  // namespace

TypeTable::TypeTable() {
  const auto readFrom = [this](const char* dataFolder) {
    patterns_.read(std::string(dataFolder) + "/mime/globs2");
  };
  readFrom(g_get_user_data_dir());
  for (const char* const* folder = g_get_system_data_dirs(); *folder != nullptr; ++folder) {
    readFrom(*folder);
  }
}

const std::string& TypeTable::typeOf(std::string_view name, const ObjectStatus& status) {
  static const std::string folder = "inode/directory";
  static const std::string symbolicLink = "inode/symlink";
  switch (status.kind) {
    case FileKind::regular:
      return fileType(name);
    case FileKind::symbolicLink:
      return symbolicLink;
    case FileKind::other:
      return typeOfSpecialFile(status.mode);
    case FileKind::folder:
      break;
  }
  const std::string_view package = PackageTypes::typeOf(name);
  return package.empty() ? folder : kept(std::string(package));
}

const std::string& TypeTable::fileType(std::string_view name) {
  if (patterns_.needsWholeName(name)) return askDatabase(name);
  const std::string_view ending = NamePatterns::endingOf(name);
  const auto known = typeForEnding(ending);
  if (known && *known != nullptr) return **known;
  const std::string& type = askDatabase(name);
  if (!known) keep(ending, patterns_.isAmbiguousEnding(ending) ? nullptr : &type);
  return type;
}

std::optional<const std::string*> TypeTable::typeForEnding(std::string_view ending) {
  const std::shared_lock lock(mutex_);
  const auto found = endings_.find(ending);
  return found == endings_.end() ? std::nullopt : std::optional(found->second);
}

const std::string& TypeTable::askDatabase(std::string_view name) {
  const OwnedString guess(g_content_type_guess(std::string(name).c_str(), nullptr, 0, nullptr));
  const OwnedString type(g_content_type_get_mime_type(guess.get()));
  return kept(type ? type.get() : "application/octet-stream");
}

const std::string& TypeTable::kept(std::string type) {
  {
    const std::shared_lock lock(mutex_);
    const auto found = types_.find(type);
    if (found != types_.end()) return *found;
  }
  const std::lock_guard lock(mutex_);
  return *types_.insert(std::move(type)).first;
}

void TypeTable::keep(std::string_view ending, const std::string* type) {
  if (ending.size() > longestEnding) return;
  const std::lock_guard lock(mutex_);
  if (endings_.size() >= mostEndings) endings_.clear();
  endings_.emplace(ending, type);
}

}  // namespace mirabel
