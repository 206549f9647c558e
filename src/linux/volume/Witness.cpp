#include "linux/volume/Witness.h"

#include <array>
#include <bit>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <string_view>
#include <sys/stat.h>

namespace mirabel {
namespace {

constexpr std::string_view magic = "MRBWITN1";
constexpr std::size_t witnessSize = 80;
constexpr std::size_t digestOffset = 72;
using Bytes = std::array<unsigned char, witnessSize>;

// Finds out accidents, not attackers: whoever can write here can write the documents as well.
class Digest {
 public:
  void add(const unsigned char* bytes, std::size_t count) {
    std::size_t i = 0;
    for (; i + 8 <= count; i += 8) {
      std::uint64_t word = 0;
      std::memcpy(&word, bytes + i, 8);
      mix(word);
    }
    std::uint64_t tail = 0;
    std::memcpy(&tail, bytes + i, count - i);
    if (i < count) mix(tail);
    length_ += count;
  }
  [[nodiscard]] std::uint64_t value() {
    mix(length_);
    const std::uint64_t result = state_ ^ (state_ >> 29);
    return result == 0 ? 1 : result;
  }

 private:
  void mix(std::uint64_t word) {
    state_ = std::rotl((state_ ^ word) * 0x9E3779B97F4A7C15ULL, 31) + 0xD6E8FEB86659FD93ULL;
  }
  std::uint64_t state_ = 0x2545F4914F6CDD1DULL;
  std::uint64_t length_ = 0;
};

void put(Bytes& bytes, std::size_t offset, std::uint64_t value) {
  for (std::size_t i = 0; i < 8; ++i) {
    bytes[offset + i] = static_cast<unsigned char>(value >> (8 * i));
  }
}

std::uint64_t get(const Bytes& bytes, std::size_t offset) {
  std::uint64_t value = 0;
  for (std::size_t i = 0; i < 8; ++i)
    value |= std::uint64_t{bytes[offset + i]} << (8 * i);
  return value;
}

std::uint64_t digestOf(const Bytes& bytes) {
  Digest digest;
  digest.add(bytes.data(), digestOffset);
  return digest.value();
}

}  // namespace

std::optional<Witness> Witness::read(const StateFolder& folder) {
  UniqueFd file(::openat(folder.descriptor(), "witness", O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
  if (!file) return std::nullopt;
  Bytes bytes;
  if (::read(file.get(), bytes.data(), bytes.size()) != static_cast<ssize_t>(bytes.size()) ||
      std::memcmp(bytes.data(), magic.data(), magic.size()) != 0 ||
      get(bytes, digestOffset) != digestOf(bytes)) {
    return std::nullopt;
  }
  Witness witness;
  std::memcpy(witness.history.bytes.data(), bytes.data() + 8, 16);
  witness.session = get(bytes, 24);
  witness.documentLimit = get(bytes, 32);
  witness.fileLimit = get(bytes, 40);
  witness.closedSize = get(bytes, 48);
  witness.closedTime = static_cast<std::int64_t>(get(bytes, 56));
  witness.closedDigest = get(bytes, 64);
  return witness;
}

Result<void> Witness::write(const StateFolder& folder) const {
  Bytes bytes{};
  std::memcpy(bytes.data(), magic.data(), magic.size());
  std::memcpy(bytes.data() + 8, history.bytes.data(), 16);
  put(bytes, 24, session);
  put(bytes, 32, documentLimit);
  put(bytes, 40, fileLimit);
  put(bytes, 48, closedSize);
  put(bytes, 56, static_cast<std::uint64_t>(closedTime));
  put(bytes, 64, closedDigest);
  put(bytes, digestOffset, digestOf(bytes));

  const int directory = folder.descriptor();
  UniqueFd file(::openat(directory, "witness.new",
                         O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!file) return fail(Error::posix(errno, folder.file("witness")));
  errno = EIO;
  if (::write(file.get(), bytes.data(), bytes.size()) != static_cast<ssize_t>(bytes.size()) ||
      ::fsync(file.get()) != 0 || ::close(file.release()) != 0 ||
      ::renameat(directory, "witness.new", directory, "witness") != 0 || ::fsync(directory) != 0) {
    return fail(Error::posix(errno, folder.file("witness")));
  }
  return {};
}

Result<std::uint64_t> digestOfFile(const std::string& path) {
  UniqueFd file(::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
  if (!file) return fail(Error::posix(errno));
  constexpr std::size_t capacity = 1u << 20;
  auto buffer = std::make_unique_for_overwrite<unsigned char[]>(capacity);
  Digest digest;
  while (true) {
    const ssize_t count = ::read(file.get(), buffer.get(), capacity);
    if (count < 0) return fail(Error::posix(errno));
    if (count == 0) return digest.value();
    digest.add(buffer.get(), static_cast<std::size_t>(count));
  }
}

}  // namespace mirabel
