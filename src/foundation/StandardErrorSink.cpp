#include "foundation/StandardErrorSink.h"

#include <cerrno>
#include <string>

namespace mirabel {

void StandardErrorSink::write(LogLevel, std::string_view, std::string_view, std::string_view line) {
  std::string whole;
  whole.reserve(line.size() + 1);
  whole.append(line).push_back('\n');

  // Logging between a failed call and the look at its errno must not change what is seen there.
  const int savedErrno = errno;
  std::fwrite(whole.data(), 1, whole.size(), file_);
  std::fflush(file_);
  errno = savedErrno;
}

}  // namespace mirabel
