#include "linux/kernel/MountTable.h"

#include <array>
#include <fcntl.h>
#include <poll.h>
#include <sstream>
#include <string>
#include <unistd.h>
#include <utility>

namespace mirabel {
namespace {

constexpr const char* table = "/proc/thread-self/mountinfo";
constexpr int wordOfMountPoint = 5;

/// Blanks and the like are written as a backslash and three octal digits.
std::string unescaped(std::string_view text) {
  constexpr std::size_t digits = 3;
  std::string path;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '\\' || text.size() - i <= digits) {
      path += text[i];
      continue;
    }
    unsigned code = 0;
    for (std::size_t digit = 0; digit < digits; ++digit)
      code = 8 * code + static_cast<unsigned>(text[++i] - '0');
    path += static_cast<char>(code);
  }
  return path;
}

}  // namespace

MountTable::MountTable() : file_(::open(table, O_RDONLY | O_CLOEXEC)) {}

bool MountTable::hasChanged(const IsConcerned& isConcerned) {
  const bool isFirst = !std::exchange(hasLooked_, true);
  pollfd look{file_.get(), POLLPRI, 0};
  const bool isNew = ::poll(&look, 1, 0) > 0;
  if (!isNew && !isFirst) return false;
  const bool holds = holdsConcerned(isConcerned);
  const bool held = std::exchange(heldConcerned_, holds);
  // One that was replaced by another at its place looks the same: it counts that there is any.
  return !isFirst && (holds || held);
}

bool MountTable::holdsConcerned(const IsConcerned& isConcerned) const {
  std::string text;
  std::array<char, 4096> buffer;
  if (!file_ || ::lseek(file_.get(), 0, SEEK_SET) != 0) return false;
  for (ssize_t count = 0; (count = ::read(file_.get(), buffer.data(), buffer.size())) > 0;)
    text.append(buffer.data(), static_cast<std::size_t>(count));
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    std::istringstream words(line);
    std::string word;
    for (int i = 0; i < wordOfMountPoint; ++i)
      words >> word;
    if (isConcerned(unescaped(word))) return true;
  }
  return false;
}

}  // namespace mirabel
