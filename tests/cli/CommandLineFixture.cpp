#include "cli/CommandLineFixture.h"

#include <cstdlib>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <sys/wait.h>

#include "cli/CommandLine.h"

namespace mirabel::testing {
namespace {

std::string contentsOf(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(file), {});
}

}  // namespace

nlohmann::json Answer::jsonLine(const std::string& text) {
  if (text.find('\n') + 1 != text.size()) throw std::runtime_error("not one line: " + text);
  return nlohmann::json::parse(text);
}

Answer CommandLineFixture::run(std::vector<std::string> arguments, Output output) const {
  arguments.insert(arguments.begin(), {"--home", home.path()});
  std::ostringstream out;
  std::ostringstream err;
  const int code = runCommandLine(arguments, {out, err, output == Output::terminal});
  return {code, out.str(), err.str()};
}

nlohmann::json CommandLineFixture::done(std::vector<std::string> arguments) const {
  arguments.insert(arguments.begin(), "--json");
  const Answer answer = run(std::move(arguments));
  EXPECT_EQ(answer.code, 0) << answer.err;
  return answer.code == 0 ? answer.json() : nlohmann::json();
}

Answer CommandLineFixture::shell(const std::string& script) const {
  const std::string out = home.path() + "/out";
  const std::string err = home.path() + "/err";
  const std::string prologue = "mirabel='" MIRABEL_PROGRAM "'; home='" + home.path() +
                               "'; documents='" + home.documents() + "'; state='" +
                               home.stateFolder() + "'; exec >'" + out + "' 2>'" + err + "'\n";
  const int status = std::system((prologue + script).c_str());
  return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, contentsOf(out), contentsOf(err)};
}

void CommandLineFixture::expectFailure(const Answer& answer, int code,
                                       const std::string& inMessage) const {
  EXPECT_EQ(answer.code, code) << answer.err;
  EXPECT_EQ(answer.out, "");
  EXPECT_EQ(answer.err.find('\n') + 1, answer.err.size()) << answer.err;
  EXPECT_THAT(answer.err, ::testing::StartsWith("mirabel: "));
  EXPECT_THAT(answer.err, ::testing::HasSubstr(inMessage));
}

}  // namespace mirabel::testing
