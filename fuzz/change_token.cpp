// Any bytes: no token, or one that is the same after it was written and read again.

#include "Require.h"
#include "foundation/Log.h"
#include "fs/FSChangeToken.h"

using namespace mirabel;

namespace {

class Silence : public LogSink {
 public:
  void write(LogLevel, std::string_view, std::string_view, std::string_view) override {}
};

/// The error line of each refused input would cost more than reading it.
void silenceLog() {
  static const bool done = [] {
    Log::shared().setSink(std::make_shared<Silence>(), LogLevel::error);
    return true;
  }();
  static_cast<void>(done);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  silenceLog();
  const auto token = FSChangeToken::decode(std::span(data, size));
  if (!token) return 0;
  const Data written = token->encode();
  require(FSChangeToken::decode(std::span<const std::uint8_t>(written)) == token);
  return 0;
}
