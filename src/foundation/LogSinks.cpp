#include "foundation/LogSinks.h"

#include <cerrno>
#include <string>
#include <unistd.h>

namespace mirabel {

void StandardErrorSink::write(LogLevel, std::string_view, std::string_view, std::string_view line) {
  std::string whole;
  whole.reserve(line.size() + 1);
  whole.append(line).push_back('\n');

  // Logging between a failed call and the look at its errno must not change what is seen there.
  const int savedErrno = errno;
  std::string_view rest = whole;
  while (!rest.empty()) {
    const ssize_t written = ::write(descriptor_, rest.data(), rest.size());
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) break;
    rest.remove_prefix(static_cast<std::size_t>(written));
  }
  errno = savedErrno;
}

}  // namespace mirabel
