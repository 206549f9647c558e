#include "linux/volume/Witness.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <linux/magic.h>
#include <span>
#include <string_view>
#include <sys/vfs.h>
#include <utility>

#include "linux/kernel/ObjectStatus.h"
#include "linux/volume/Digest.h"

namespace mirabel {
namespace {

constexpr std::string_view witnessMagic = "MRBWITN2";
constexpr std::size_t historyOffset = 8;
constexpr std::size_t handleOffset = 56;
constexpr std::size_t birthTimeOffset = 64;
constexpr std::size_t notesOffset = 72;
constexpr std::size_t witnessDigestOffset = 88;

void put(std::span<unsigned char> bytes, std::size_t offset, std::uint64_t value) {
  for (std::size_t i = 0; i < 8; ++i) {
    bytes[offset + i] = static_cast<unsigned char>(value >> (8 * i));
  }
}

std::uint64_t get(std::span<const unsigned char> bytes, std::size_t offset) {
  std::uint64_t value = 0;
  for (std::size_t i = 0; i < 8; ++i)
    value |= std::uint64_t{bytes[offset + i]} << (8 * i);
  return value;
}

// 0 where a handle does not outlive the mount: a file system in user space numbers its files anew.
std::uint64_t handleOf(int file) {
  struct statfs system {};
  if (::fstatfs(file, &system) != 0 || system.f_type == FUSE_SUPER_MAGIC) return 0;
  const auto handle = handleAt(file, "");
  if (!handle) return 0;
  return digestOf({reinterpret_cast<const unsigned char*>(handle->data()), handle->size()});
}

std::uint64_t birthTimeOf(int file) {
  const auto status = statusAt(file, "");
  return status && status->hasBirthTime ? static_cast<std::uint64_t>(status->birthTime) : 0;
}

// Known of both, and different.
bool differ(std::uint64_t noted, std::uint64_t found) {
  return noted != 0 && found != 0 && noted != found;
}

}  // namespace

std::optional<Witness> Witness::read(const StateFolder& folder) {
  UniqueFd file(::openat(folder.descriptor(), "witness", O_RDWR | O_NOFOLLOW | O_CLOEXEC));
  if (!file) return std::nullopt;
  Witness witness;
  Bytes& bytes = witness.bytes_;
  if (::pread(file.get(), bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size()) ||
      std::memcmp(bytes.data(), witnessMagic.data(), witnessMagic.size()) != 0 ||
      get(bytes, witnessDigestOffset) != digestOf(std::span(bytes).first(witnessDigestOffset))) {
    return std::nullopt;
  }
  if (differ(get(bytes, handleOffset), handleOf(file.get())) ||
      differ(get(bytes, birthTimeOffset), birthTimeOf(file.get()))) {
    return std::nullopt;
  }
  std::memcpy(witness.history.bytes.data(), bytes.data() + historyOffset, 16);
  witness.documentLimit = get(bytes, 24);
  witness.fileLimit = get(bytes, 32);
  witness.closedSize = get(bytes, 40);
  witness.closedTime = static_cast<std::int64_t>(get(bytes, 48));
  witness.foldings = get(bytes, notesOffset);
  witness.commits = get(bytes, notesOffset + 8);
  witness.file_ = std::move(file);
  return witness;
}

Result<void> Witness::write(const StateFolder& folder) {
  const int directory = folder.descriptor();
  // Always another file than all that were there before, so that none of those passes for it.
  ::unlinkat(directory, "witness.new", 0);
  UniqueFd file(::openat(directory, "witness.new", O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (!file) return fail(Error::posix(errno, folder.file("witness")));
  Bytes bytes{};
  std::memcpy(bytes.data(), witnessMagic.data(), witnessMagic.size());
  std::memcpy(bytes.data() + historyOffset, history.bytes.data(), 16);
  put(bytes, 24, documentLimit);
  put(bytes, 32, fileLimit);
  put(bytes, 40, closedSize);
  put(bytes, 48, static_cast<std::uint64_t>(closedTime));
  put(bytes, handleOffset, handleOf(file.get()));
  put(bytes, birthTimeOffset, birthTimeOf(file.get()));
  putNotes(bytes);
  errno = EIO;
  if (::write(file.get(), bytes.data(), bytes.size()) != static_cast<ssize_t>(bytes.size()) ||
      ::fsync(file.get()) != 0 || ::renameat(directory, "witness.new", directory, "witness") != 0) {
    return fail(Error::posix(errno, folder.file("witness")));
  }
  bytes_ = bytes;
  file_ = std::move(file);
  if (::fsync(directory) != 0) return fail(Error::posix(errno, folder.file("witness")));
  return {};
}

Result<void> Witness::note() {
  if (!file_) return {};
  putNotes(bytes_);
  const std::span<const unsigned char> notes = std::span(bytes_).subspan(notesOffset);
  errno = EIO;
  if (::pwrite(file_.get(), notes.data(), notes.size(), notesOffset) !=
      static_cast<ssize_t>(notes.size())) {
    return fail(Error::posix(errno));
  }
  return {};
}

void Witness::putNotes(Bytes& bytes) const {
  put(bytes, notesOffset, foldings);
  put(bytes, notesOffset + 8, commits);
  put(bytes, witnessDigestOffset, digestOf(std::span(bytes).first(witnessDigestOffset)));
}

}  // namespace mirabel
