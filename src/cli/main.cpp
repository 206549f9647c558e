#include <clocale>
#include <csignal>
#include <fcntl.h>
#include <iostream>
#include <poll.h>
#include <string>
#include <unistd.h>
#include <vector>

#include "cli/CommandLine.h"

namespace {

// A program started without standard streams would get their numbers for its own files, and write
// its answer into one of them. Opened like this, writing there fails.
void occupyStandardStreams() {
  for (int stream = STDIN_FILENO; stream <= STDERR_FILENO; ++stream) {
    if (::fcntl(stream, F_GETFD) < 0) static_cast<void>(::open("/dev/null", O_RDONLY));
  }
}

bool readerHasLeft() {
  pollfd output{STDOUT_FILENO, 0, 0};
  return ::poll(&output, 1, 0) == 1 && (output.revents & (POLLERR | POLLHUP)) != 0;
}

// A reader that has seen enough ends the pipe: no failure to tell of. The program ends like any
// other that writes to such a pipe, but only now that what it keeps is closed in order.
int endWithoutReader() {
  std::signal(SIGPIPE, SIG_DFL);
  std::raise(SIGPIPE);
  return 1;
}

}  // namespace

int main(int count, char** arguments) {
  occupyStandardStreams();
  // Numbers on the command line and in JSON have a point in every language.
  std::setlocale(LC_CTYPE, "");
  std::signal(SIGPIPE, SIG_IGN);
  std::ios::sync_with_stdio(false);
  const std::vector<std::string> words(arguments + (count > 0 ? 1 : 0), arguments + count);
  const mirabel::Streams streams{std::cout, std::cerr, ::isatty(STDOUT_FILENO) == 1, STDOUT_FILENO};
  const int code = mirabel::runCommandLine(words, streams);
  std::cout.flush();
  if (std::cout) return code;
  if (readerHasLeft()) return endWithoutReader();
  std::cerr << "mirabel: can't write the answer\n";
  return 1;
}
