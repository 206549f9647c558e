#include "soak/ServedHome.h"

#include <csignal>
#include <stdexcept>

namespace mirabel::testing {

void ServedHome::start() {
  service_ = std::make_unique<Running>(
      std::vector<std::string>{MIRABEL_PROGRAM, "--home", home_, "serve"});
  const std::string line = service_->errors().line();
  if (!line.starts_with("mirabel: serving ")) throw std::runtime_error("no service: " + line);
}

void ServedHome::kill() {
  service_->send(SIGKILL);
  static_cast<void>(service_->end());
}

}  // namespace mirabel::testing
