#include <clocale>
#include <csignal>
#include <iostream>
#include <string>
#include <unistd.h>
#include <vector>

#include "cli/CommandLine.h"

int main(int count, char** arguments) {
  std::setlocale(LC_ALL, "");
  // A reader that has seen enough ends the pipe; that is no failure to tell of.
  std::signal(SIGPIPE, SIG_DFL);
  std::ios::sync_with_stdio(false);
  const std::vector<std::string> words(arguments + 1, arguments + count);
  const mirabel::Streams streams{std::cout, std::cerr, ::isatty(STDOUT_FILENO) == 1};
  const int code = mirabel::runCommandLine(words, streams);
  std::cout.flush();
  if (!std::cout) {
    std::cerr << "mirabel: can't write the answer\n";
    return 1;
  }
  return code;
}
