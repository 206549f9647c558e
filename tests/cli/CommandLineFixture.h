#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "support/TempHome.h"

namespace mirabel::testing {

/// What a run of the program left behind.
struct Answer {
  int code = 0;
  std::string out;
  std::string err;

  /// The only line of the answer, as JSON. Throws where there is another number of lines.
  [[nodiscard]] nlohmann::json json() const { return jsonLine(out); }
  [[nodiscard]] nlohmann::json error() const { return jsonLine(err).at("error"); }

 private:
  [[nodiscard]] static nlohmann::json jsonLine(const std::string& text);
};

/// Runs commands on a temporary home: in this process, or the built program in one of its own.
class CommandLineFixture : public ::testing::Test {
 protected:
  enum class Output { file, terminal };

  /// --home is said in front of the arguments.
  Answer run(std::vector<std::string> arguments, Output output = Output::file) const;
  /// The one line that a command answers to programs, which must succeed.
  nlohmann::json done(std::vector<std::string> arguments) const;
  std::string anchor(const std::string& container = "root") const {
    return done({"anchor", container}).at("anchor");
  }
  /// Runs a shell script, in which $mirabel is the program, $home, $documents and $state are set.
  Answer shell(const std::string& script) const;

  /// A failure must be told in one line, on standard error, and leave no answer.
  void expectFailure(const Answer& answer, int code, const std::string& inMessage) const;

  TempHome home;
};

}  // namespace mirabel::testing
