#include "ChildProcess.h"

#include <array>
#include <csignal>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include "BenchHome.h"

namespace mirabel::bench {

ChildProcess::ChildProcess(const std::vector<std::string>& arguments) {
  std::array<int, 2> in{};
  std::array<int, 2> out{};
  require(::pipe2(in.data(), O_CLOEXEC) == 0 && ::pipe2(out.data(), O_CLOEXEC) == 0,
          "a pipe can be made");
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, in[0], STDIN_FILENO);
  posix_spawn_file_actions_adddup2(&actions, out[1], STDOUT_FILENO);
  std::vector<char*> pointers;
  for (const std::string& argument : arguments)
    pointers.push_back(const_cast<char*>(argument.c_str()));
  pointers.push_back(nullptr);
  if (::posix_spawnp(&id_, pointers[0], &actions, nullptr, pointers.data(), environ) != 0) id_ = -1;
  posix_spawn_file_actions_destroy(&actions);
  ::close(in[0]);
  ::close(out[1]);
  input_ = in[1];
  output_ = out[0];
}

std::vector<std::string> ChildProcess::role(std::vector<std::string> arguments) {
  arguments.insert(arguments.begin(), {"/proc/self/exe", "--role"});
  return arguments;
}

ChildProcess::~ChildProcess() {
  ::close(input_);
  ::close(output_);
  if (!hasStarted()) return;
  ::kill(id_, SIGTERM);
  ::waitpid(id_, nullptr, 0);
}

void ChildProcess::tell(const std::string& line) const {
  const std::string text = line + "\n";
  require(::write(input_, text.data(), text.size()) == std::ssize(text), "a child can be told");
}

std::string ChildProcess::hear() const {
  std::string line;
  char next = 0;
  while (::read(output_, &next, 1) == 1 && next != '\n')
    line += next;
  return line;
}

}  // namespace mirabel::bench
