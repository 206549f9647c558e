// Any bytes as a name: however it is shown it is text without controls, stays what it is when it is
// shown again, and is given back by what claims to hold its bytes.

#include "Require.h"
#include "cli/Printing.h"
#include "foundation/Unicode.h"
#include "host/bus/BusText.h"

using namespace mirabel;

namespace {

bool hasControls(std::string_view text) {
  for (const char c : text)
    if (static_cast<unsigned char>(c) < 0x20 || c == 0x7F) return true;
  return false;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  const bool isText = isUTF8(bytes);

  const std::string printed = printable(bytes);
  require(isUTF8(printed) && !hasControls(printed) && printable(printed) == printed);
  require(printed.size() <= 4 * size);
  const std::string lossy = utf8Lossy(bytes);
  require(isUTF8(lossy) && utf8Lossy(lossy) == lossy && (lossy == bytes) == isText);

  require(fromBase64(base64(bytes)) == bytes);
  if (const auto decoded = fromBase64(bytes)) require(base64(*decoded) == bytes);
  const std::size_t width = displayWidth(printed);
  require(displayWidth(padded(printed, width + 3, Align::right)) == width + 3);

  const std::string shown = bus::shown(bytes);
  require(bus::isBusText(shown) && bus::shown(shown) == shown);
  require((shown == bytes) == bus::isBusText(bytes));
  require(isText || !bus::isBusText(bytes));
  const std::string escaped = bus::escaped(bytes);
  require(bus::isBusText(escaped) && (escaped == bytes) == bus::isBusText(bytes));
  return 0;
}
