#include "cli/Program.h"

#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/Printing.h"
#include "host/ErrorText.h"

namespace mirabel {

Documents* Program::documents() {
  if (documents_) return documents_.get();
  SessionOptions options;
  options.home = options_.home;
  options.timeout = options_.timeout;
  options.embedded = options_.embedded;
  options.notice = [this](std::string_view text) { note(text); };
  auto opened = openDocuments(std::move(options));
  if (!opened) {
    exitCode_ = report(opened.error(), "can't open the documents");
    // A home that is not there is no missing item: nothing was looked up yet.
    if (exitCode_ == ExitCode::noSuchItem) exitCode_ = ExitCode::failed;
    return nullptr;
  }
  documents_ = std::move(*opened);
  return documents_.get();
}

bool Program::canWrite() const {
  return streams_.out.good();
}

void Program::note(std::string_view text) const {
  if (options_.json) {
    streams_.err << nlohmann::json{{"notice", utf8Lossy(text)}}.dump() << '\n';
  } else {
    streams_.err << "mirabel: " << printable(text) << '\n';
  }
}

void Program::showProgress(std::string_view text) const {
  streams_.err << "\r\033[K" << text << std::flush;
}

ExitCode Program::report(const Error& error, std::string_view what) {
  const std::string message = std::string(what) + "; " + explanation(error);
  reportFailure(streams_.err, options_.json, domainName(error.domain), error.code, message);
  return exitCodeFor(error);
}

ExitCode Program::reportUsage(std::string_view text) {
  constexpr ExitCode code = ExitCode::usage;
  reportFailure(streams_.err, options_.json, "usage", static_cast<int>(code), text);
  return code;
}

ExitCode Program::reportFailed(std::string_view text) {
  constexpr ExitCode code = ExitCode::failed;
  reportFailure(streams_.err, options_.json, "mirabel", static_cast<int>(code), text);
  return code;
}

void reportFailure(std::ostream& err, bool asJSON, std::string_view domain, std::int64_t code,
                   std::string_view message) {
  if (!asJSON) {
    err << "mirabel: " << printable(message) << '\n';
    return;
  }
  const nlohmann::json line = {
      {"error", {{"domain", domain}, {"code", code}, {"message", utf8Lossy(message)}}}};
  err << line.dump() << '\n';
}

}  // namespace mirabel
