#include "cli/Program.h"

#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/Printing.h"

namespace mirabel {

Session* Program::session() {
  if (session_) return session_.get();
  Session::Options options;
  options.home = options_.home;
  options.timeout = options_.timeout;
  options.notice = [this](std::string_view text) { note(text); };
  auto opened = Session::open(std::move(options));
  if (!opened) {
    exitCode_ = report(opened.error(), "can't open the documents");
    // A home that is not there is no missing item: nothing was looked up yet.
    if (exitCode_ == ExitCode::noSuchItem) exitCode_ = ExitCode::failed;
    return nullptr;
  }
  session_ = std::move(*opened);
  return session_.get();
}

void Program::note(std::string_view text) const {
  streams_.err << "mirabel: " << printable(text) << '\n';
}

ExitCode Program::report(const Error& error, std::string_view what) {
  std::string message(what);
  if (!message.empty()) message += "; ";
  message += error.description();
  if (options_.json) {
    const nlohmann::json line = {{"error",
                                  {{"domain", domainName(error.domain)},
                                   {"code", error.code},
                                   {"message", utf8Lossy(message)}}}};
    streams_.err << line.dump() << '\n';
  } else {
    streams_.err << "mirabel: " << printable(message) << '\n';
  }
  return exitCodeFor(error);
}

}  // namespace mirabel
