// A line as the name of an error on the bus, the rest as its message: what a client makes of it
// comes to the same when it is sent on and read again.

#include <string>

#include "ByteSource.h"
#include "Require.h"
#include "host/ErrorText.h"
#include "host/bus/BusErrors.h"
#include "host/bus/BusText.h"

using namespace mirabel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string_view rest(reinterpret_cast<const char*>(data), size);
  const std::string name(takeUpTo(rest, '\n'));
  const Error error = bus::errorFromBus(sdbus::Error(name, std::string(rest)));
  const sdbus::Error sent = bus::errorForBus(error);
  require(bus::isBusText(sent.getMessage()));
  require(sent.getName().starts_with("com.norvane.Vessel1.Error."));
  require(sent.getName().find_first_not_of("ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz"
                                           "0123456789_.") == std::string::npos);
  const Error again = bus::errorFromBus(sent);
  require(again.domain == error.domain && again.code == error.code);
  // A service's own errors come with what it has to say.
  if (name.starts_with("com.norvane.Vessel1.Error."))
    require(sent.getMessage() == bus::escaped(rest) && explanation(again) == sent.getMessage());
  return 0;
}
