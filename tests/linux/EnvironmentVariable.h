#pragma once

#include <cstdlib>
#include <optional>
#include <string>

namespace mirabel::testing {

/// Sets a variable of the environment, or takes it away (null), as long as it lives.
class EnvironmentVariable {
 public:
  EnvironmentVariable(const char* name, const char* value) : name_(name) {
    if (const char* before = std::getenv(name)) before_ = before;
    set(value);
  }
  ~EnvironmentVariable() { set(before_ ? before_->c_str() : nullptr); }
  EnvironmentVariable(const EnvironmentVariable&) = delete;
  EnvironmentVariable& operator=(const EnvironmentVariable&) = delete;

  void set(const char* value) const {
    value == nullptr ? ::unsetenv(name_) : ::setenv(name_, value, 1);
  }

 private:
  const char* name_;
  std::optional<std::string> before_;
};

}  // namespace mirabel::testing
