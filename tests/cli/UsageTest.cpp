#include <fstream>
#include <iterator>
#include <regex>
#include <sstream>

#include "cli/CommandLineFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;
using Usage = CommandLineFixture;

TEST_F(Usage, WrongUsageOfAnyKindIsOneLineAndExitCodeTwo) {
  std::istringstream lines(
      "unknown;id;id a b;--bogus;ls --bogus;ls --page;ls --pages 0;ls --pages 1.5;ls --pages many;"
      "--timeout soon ls;--timeout nan ls;--timeout -1 ls;--timeout 1e9 ls;--home / ls;--home= ls;"
      "doctor argument;mv did=1 fid=2 --name=;container;icon root;watch --since;ls a doctor b");
  for (std::string line; std::getline(lines, line, ';');) {
    SCOPED_TRACE(line);
    std::istringstream text(line);
    std::vector<std::string> arguments{std::istream_iterator<std::string>(text), {}};
    expectFailure(run(arguments), 2, "--help");
    arguments.insert(arguments.begin(), "--json");
    const Answer programs = run(arguments);
    EXPECT_EQ(programs.code, 2);
    EXPECT_EQ(programs.error().at("domain"), "usage");
    EXPECT_EQ(programs.error().at("code"), 2);
  }
  EXPECT_EQ(run({}).code, 2);
  EXPECT_EQ(run({"--json"}).error().at("code"), 2);
}

TEST_F(Usage, WhatIsWrongIsSaidInWordsThatHelp) {
  const std::pair<std::vector<std::string>, const char*> cases[] = {
      {{"unknown"}, "there is no command unknown; see mirabel --help"},
      {{"id"}, "PATH is missing; see mirabel id --help"},
      {{"id", "a", "b]"}, "\"b]\" is one argument too many; see mirabel id --help"},
      {{"id", "-x"}, "there is no option -x; a name that begins with a dash follows --; see mir"},
      {{"ls", "--page"}, "--page has no value; see mirabel ls --help"},
      {{"ls", "--page", "a", "--page", "b"}, "--page is given more than once"},
      {{"ls", "--pages", "0"}, "--pages takes a number from 1; see"},
      {{"changes"}, "--since is missing; see"},
      {{"tag", "f", "a", "--clear"}, "LABEL and --clear don't go together"},
      {{"completion", "tcsh"}, "SHELL is bash, zsh or fish"},
      // The help of the command does not have the options that all commands share.
      {{"--timeout", "x", "id", "."}, "--timeout takes a number; see mirabel --help"},
      {{"--timeout", "-1", "id", "."}, "--timeout takes 0 to 86400 seconds; see mirabel --help"},
      {{"id", ".", "--json=x"}, "--json takes no value; see mirabel --help"}};
  for (const auto& [arguments, text] : cases)
    expectFailure(run(arguments), 2, text);
  expectFailure(run({"id", ""}), 3, "can't identify \"\"; no such file or folder");
}

TEST_F(Usage, TheUsageLineHasWhatMustBeGiven) {
  const std::pair<const char*, const char*> cases[] = {
      {"mkdir", "mirabel mkdir [OPTIONS] --in ITEM NAME"},
      {"import", "--in ITEM FILE"},
      {"changes", "--since ANCHOR"},
      {"icon", "--output FILE"},
      {"expire", "--older-than DATE|AGE"}};
  for (const auto& [command, usage] : cases)
    EXPECT_THAT(run({command, "--help"}).out, HasSubstr(usage));
  EXPECT_THAT(run({"expire", "--help"}).out, ::testing::Not(HasSubstr("ITEM")));
  EXPECT_THAT(run({"ls", "--help"}).out, HasSubstr("workingset"));
  EXPECT_THAT(run({"--version"}).out, HasSubstr("mirabel "));
}

TEST_F(Usage, TheManualKnowsEveryOptionAndCommandOfTheHelp) {
  std::ifstream file(MIRABEL_MANUAL);
  const std::string manual(std::istreambuf_iterator<char>(file), {});
  const std::regex word("--[a-z-]+|\\n  ([a-z]+) ");
  int count = 0;
  for (const char* command :
       {"",        "id",     "path",   "info",     "ls",   "anchor", "changes",
        "watch",   "mkdir",  "import", "rename",   "mv",   "rm",     "trash",
        "restore", "expire", "tag",    "favorite", "used", "apps",   "container",
        "icon",    "status", "doctor", "demo"}) {
    const std::string help = *command == '\0' ? run({"--help"}).out : run({command, "--help"}).out;
    for (std::sregex_iterator it(help.begin(), help.end(), word), end; it != end; ++it, ++count) {
      const std::string found = (*it)[1].matched ? (*it)[1].str() : it->str();
      EXPECT_THAT(manual, HasSubstr("*" + found + "*")) << command;
    }
  }
  EXPECT_GT(count, 40);
}

TEST_F(Usage, TheCompletionKnowsWhatStandsWhere) {
  // The words as bash takes them apart, of which the last is being completed; and what is offered.
  const std::pair<const char*, const char*> cases[] = {
      {"mirabel --home d", "docs"},
      {"mirabel --home = d", "docs"},
      {"mirabel icon -o ''", "docs file"},
      {"mirabel mkdir new --in r", "root"},
      {"mirabel ls --page ''", ""},
      {"mirabel --home ls st", "status"},
      {"mirabel --home = ls completion ''", "bash fish zsh"},
      {"mirabel rm -- --h", ""},
      {"mirabel id --h", "--help --home"},
      {"mirabel watch ''", "alldirs docs file root workingset"},
      {"mirabel search ''", ""}};
  std::string script =
      "cd \"$home\" && mkdir work && cd work && mkdir docs && touch file\n"
      "\"$mirabel\" completion bash > \"$home/completion\"\n"
      "exec bash -c '. \"$0\"; while read -r line; do eval \"COMP_WORDS=($line)\"; "
      "COMP_CWORD=$((${#COMP_WORDS[@]} - 1)) COMPREPLY=(); _mirabel; "
      "echo $(printf \"%s\\n\" \"${COMPREPLY[@]}\" | LC_ALL=C sort); done' \"$home/completion\" << "
      "'END'\n";
  std::string offered;
  for (const auto& [words, answer] : cases) {
    script += std::string(words) + "\n";
    offered += std::string(answer) + "\n";
  }
  EXPECT_EQ(shell(script + "END\n").out, offered);
}

TEST_F(Usage, GlobalOptionsMayFollowTheCommandAndPathsMayLookLikeOptions) {
  for (const char* name : {"-x", "--json", "ls", "[a]", "\"b\"", "{c}", "a=b", "%%", "@"}) {
    home.writeFile(name);
    EXPECT_EQ(run({"info", "--json", "--", home.at(name)}).json().at("filename"), name);
  }
  const Answer relative = shell("cd \"$documents\" && \"$mirabel\" --home \"$home\" id -- --json");
  EXPECT_THAT(relative.out, HasSubstr("did=")) << relative.err;
  EXPECT_THAT(shell("cd \"$documents\" && \"$mirabel\" --home \"$home\" id ls").out,
              HasSubstr("did="));
}

TEST_F(Usage, TextsAreTakenLetterForLetter) {
  const std::vector<std::string> labels = {"[a,b]", "[]", "[[x]]", "{}",
                                           "%%",    "a]", "\"q\"", "x,y"};
  home.writeFile("doc");
  std::vector<std::string> arguments = {"tag", "--json", home.at("doc")};
  arguments.insert(arguments.end(), labels.begin(), labels.end());
  EXPECT_EQ(run(arguments).json().at("tags"), labels);
  EXPECT_EQ(run({"tag", "--json", home.at("doc"), "{}"}).json().at("tags"),
            std::vector<std::string>{"{}"});

  home.writeFile("a");
  home.writeFile("b");
  home.writeFile("[a,b]");
  EXPECT_EQ(run({"rm", "[a,b]"}).code, 3) << "there is none in the working folder";
  EXPECT_EQ(shell("cd \"$documents\" && \"$mirabel\" --home \"$home\" rm '[a,b]'").code, 0);
  EXPECT_THAT(run({"ls"}).out, AllOf(HasSubstr(" a\n"), HasSubstr(" b\n")));
  EXPECT_THAT(run({"ls"}).out, ::testing::Not(HasSubstr("[a,b]")));
  home.makeFolder("folder");
  expectFailure(run({"mv", home.at("doc"), home.at("folder"), "--name", ""}), 1, "is no name");
}

TEST_F(Usage, AnOptionThatMayBeGivenAgainTakesOneValueEachTime) {
  for (const char* name : {"report", "letter"}) {
    home.writeFile(name);
    ASSERT_EQ(run({"tag", home.at(name), "red", "blue"}).code, 0);
  }
  EXPECT_EQ(run({"search", "--json", "--tag", "red", "rep", "--tag", "blue"}).json().at("filename"),
            "report");
}

}  // namespace
}  // namespace mirabel::testing
