#include <array>
#include <csignal>
#include <cstdio>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include "cli/CommandLineFixture.h"
#include "cli/Session.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;
using ::testing::MatchesRegex;

class Processes : public CommandLineFixture {
 protected:
  std::unique_ptr<Session> hold() const {
    Session::Options options;
    options.home = home.path();
    return Session::open(std::move(options)).value();
  }
};

/// The built program, running, with its standard error to read from.
class Running {
 public:
  explicit Running(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), MIRABEL_PROGRAM);
    std::vector<char*> words;
    words.reserve(arguments.size() + 1);
    for (std::string& argument : arguments)
      words.push_back(argument.data());
    words.push_back(nullptr);
    std::array<int, 2> ends{};
    if (::pipe2(ends.data(), O_CLOEXEC) != 0) throw std::runtime_error("pipe2");
    posix_spawn_file_actions_t actions;
    ::posix_spawn_file_actions_init(&actions);
    ::posix_spawn_file_actions_adddup2(&actions, ends[1], STDERR_FILENO);
    ::posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
    const int failure =
        ::posix_spawn(&process_, MIRABEL_PROGRAM, &actions, nullptr, words.data(), environ);
    ::posix_spawn_file_actions_destroy(&actions);
    ::close(ends[1]);
    if (failure != 0) throw std::runtime_error("posix_spawn");
    errors_ = ::fdopen(ends[0], "r");
  }
  ~Running() { ::fclose(errors_); }
  Running(const Running&) = delete;
  Running& operator=(const Running&) = delete;

  /// Waits for it to say a line.
  std::string line() {
    std::array<char, 512> text{};
    return ::fgets(text.data(), text.size(), errors_) == nullptr ? "" : text.data();
  }
  void send(int signal) const { ::kill(process_, signal); }
  /// Its wait status.
  int end() const {
    int status = 0;
    ::waitpid(process_, &status, 0);
    return status;
  }

 private:
  pid_t process_ = -1;
  std::FILE* errors_ = nullptr;
};

TEST_F(Processes, IdentitiesOutliveThem) {
  const Answer answer = shell(R"(
    cd "$documents"; echo 1 >a; mkdir b; "$mirabel" --home "$home" id a
    mv a b/c; "$mirabel" --home "$home" path did=1
    echo 2 >b/.c.tmp; mv b/.c.tmp b/c; "$mirabel" --home "$home" id b/c
    rm b/c; echo 3 >d; "$mirabel" --home "$home" path did=1; echo $?)");
  EXPECT_EQ(answer.out, "did=1\n" + home.at("b/c") + "\ndid=1\n3\n");
  EXPECT_EQ(answer.err, "mirabel: can't find did=1; no item has this identifier\n");
}

TEST_F(Processes, WaitForEachOtherAndGiveUpWithExitCodeSeven) {
  home.writeFile("doc");
  auto held = hold();
  const Answer impatient = run({"--timeout", "0", "ls"});
  expectFailure(impatient, 7, "wait longer with --timeout");
  const Answer patient = run({"--json", "--timeout", "0.05", "ls"});
  EXPECT_EQ(patient.code, 7);
  EXPECT_THAT(patient.err, MatchesRegex("\\{\"notice\":\"waiting .*\n\\{\"error\":.*\n"));
  // It does not make the volume sick.
  EXPECT_EQ(run({"--timeout", "0", "doctor"}).code, 0);

  Running waiting({"--home", home.path(), "--timeout", "60", "ls", "--pages", "1"});
  EXPECT_THAT(waiting.line(), HasSubstr("waiting for another process"));
  held.reset();
  EXPECT_EQ(waiting.end(), 0);
}

TEST_F(Processes, AnInterruptEndsTheWaiting) {
  const auto held = hold();
  for (const int signal : {SIGINT, SIGTERM}) {
    Running waiting({"--home", home.path(), "--timeout", "60", "ls"});
    EXPECT_THAT(waiting.line(), HasSubstr("waiting"));
    waiting.send(signal);
    const int status = waiting.end();
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == signal) << status;
  }
}

TEST_F(Processes, AReaderThatLeavesEndsThemQuietly) {
  for (int i = 0; i < 3000; ++i)
    home.writeFile(std::to_string(i));
  const Answer answer = shell(
      "{ \"$mirabel\" --home \"$home\" ls; echo $? >\"$home/code\"; } | head -n 1 >/dev/null\n"
      "cat \"$home/code\"");
  EXPECT_EQ(answer.out, std::to_string(128 + SIGPIPE) + "\n");
  EXPECT_EQ(answer.err, "");
}

TEST_F(Processes, AnAnswerThatCannotBeWrittenIsAFailure) {
  home.writeFile("doc");
  for (const char* output : {">/dev/full", ">&-"}) {
    const Answer answer = shell("\"$mirabel\" --home \"$home\" ls " + std::string(output));
    expectFailure(answer, 1, "can't write the answer");
  }
  EXPECT_EQ(run({"id", home.at("doc")}).err, "");  // nothing was written into the database
}

TEST_F(Processes, LogLinesAreShownOnRequestOnly) {
  const std::string command = "\"$mirabel\" --home \"$home\" path did=7";
  EXPECT_THAT(shell(command).err, ::testing::Not(HasSubstr("[ERROR]")));
  EXPECT_THAT(shell(command + " --verbose").err, HasSubstr("[ERROR] item lookup failed"));
}

}  // namespace
}  // namespace mirabel::testing
