// Any bytes: what is drawn of them is the same each time, and can be drawn from again.

#include <cstddef>
#include <cstdint>

#include "Require.h"
#include "linux/icons/IconPicture.h"

using namespace mirabel;

// What these libraries keep for good once a picture holds text is no leak of ours.
extern "C" const char* __lsan_default_suppressions() {
  return "leak:libfontconfig\nleak:libxml2\n";
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const PixelBox box{32, 16};
  const Data file(data, data + size);
  const auto drawn = drawnAsPNG(file, box);
  require(drawnAsPNG(file, box) == drawn);
  require(!drawn || drawnAsPNG(*drawn, box).has_value());
  return 0;
}
