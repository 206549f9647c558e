#include <csignal>
#include <sys/wait.h>

#include "cli/CommandLineFixture.h"
#include "cli/Running.h"
#include "host/LocalDocuments.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;
using ::testing::MatchesRegex;

class Processes : public CommandLineFixture {
 protected:
  std::unique_ptr<LocalDocuments> hold() const {
    return LocalDocuments::open({.home = home.path()}).value();
  }
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
  // It asks several times in that time, and says once that it waits.
  const Answer patient = run({"--json", "--timeout", "0.6", "ls"});
  EXPECT_EQ(patient.code, 7);
  EXPECT_THAT(patient.err, MatchesRegex("\\{\"notice\":\"waiting [^\n]*\n\\{\"error\":[^\n]*\n"));
  // It does not make the volume sick.
  EXPECT_EQ(run({"--timeout", "0", "doctor"}).code, 0);

  Running waiting({MIRABEL_PROGRAM, "--home", home.path(), "--timeout", "60", "ls"});
  EXPECT_THAT(waiting.errors().line(), HasSubstr("waiting for another process"));
  held.reset();
  EXPECT_EQ(waiting.end(), 0);
}

TEST_F(Processes, AnInterruptEndsTheWaiting) {
  const auto held = hold();
  for (const char* command : {"ls", "watch"}) {
    for (const int signal : {SIGINT, SIGTERM}) {
      Running waiting({MIRABEL_PROGRAM, "--home", home.path(), "--timeout", "60", command});
      EXPECT_THAT(waiting.errors().line(), HasSubstr("waiting"));
      waiting.send(signal);
      const int status = waiting.end();
      EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == signal) << command << status;
    }
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
