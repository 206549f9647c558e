// Any bytes: no token, or one that is the same after it was written and read again.

#include "Require.h"
#include "SilentLog.h"
#include "fs/FSChangeToken.h"

using namespace mirabel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  silenceLog();
  const auto token = FSChangeToken::decode(std::span(data, size));
  if (!token) return 0;
  const Data written = token->encode();
  require(FSChangeToken::decode(std::span<const std::uint8_t>(written)) == token);
  return 0;
}
