// Any text as what a sandbox says of itself: the application that it names is a line of it, and is
// found again where it stands alone.

#include <string>

#include "Require.h"
#include "host/bus/CallerIdentity.h"

using namespace mirabel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  const std::string application = bus::applicationOfSandbox(text);
  if (application.empty()) return 0;
  require(text.find("[Application]") < text.rfind(application));
  require(application.find('\n') == std::string::npos);
  require(bus::applicationOfSandbox("[Application]\nname=" + application + "\n") == application);
  // Nothing that comes later takes its place.
  require(bus::applicationOfSandbox(text + "\n[Application]\nname=other\n") == application);
  return 0;
}
