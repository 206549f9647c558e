#pragma once

#include <cstdint>
#include <expected>
#include <string>
#include <vector>

#include "platform/IconService.h"

namespace mirabel {

/// A box in pixels.
struct PixelBox {
  int wide = 0;
  int high = 0;
};

/// The largest box of the proportions of `picture` that fits into `box`; at least one pixel in
/// either direction. Neither may be empty.
[[nodiscard]] PixelBox fitted(const PixelBox& picture, const PixelBox& box);

/// The endings of the files that can be read on this machine, the best first: SVG takes a loader
/// that is installed apart.
[[nodiscard]] std::vector<std::string> readableIconEndings();

/// A PNG or SVG file drawn anew as a PNG file that fits into the box. What claims more than 4096
/// pixels in a direction is refused before it is decoded. The failure names its step; its errors
/// are POSIX errors: EILSEQ for a file that is neither or is damaged, EFBIG, ENOMEM.
[[nodiscard]] std::expected<Data, IconFailure> drawnAsPNG(const Data& file, const PixelBox& box);

}  // namespace mirabel
