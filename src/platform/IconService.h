#pragma once

#include <cstdint>
#include <expected>

#include "mirabel/Error.h"
#include "mirabel/Values.h"
#include "platform/ApplicationRegistry.h"

namespace mirabel {

/// What the machine says of itself under the keys "DeviceClassNumber" and "main-screen-scale".
struct DeviceInformation {
  std::int64_t deviceClassNumber = 0;
  double mainScreenScale = 1;  ///< pixels of the main screen in a point
};

/// The icon that is wanted of an application.
struct IconVariant {
  /// The box that the picture is to fill in one direction and not to leave in the other, in pixels.
  std::uint32_t pixelsWide = 0;
  std::uint32_t pixelsHigh = 0;
  /// Small pictures of one size in pixels are drawn differently for screens of different scales.
  double scale = 1;
  std::int64_t deviceClassNumber = 0;
};

/// The steps in which an icon comes about, in their order.
enum class IconStep { primaryIconData, cachedBitmap, newData, newImage, finalization };

/// Where it stopped, and why.
struct IconFailure {
  IconStep step;
  Error error;

  friend bool operator==(const IconFailure&, const IconFailure&) = default;
};

/// The icons of applications. Any thread may call it.
class IconService {
 public:
  virtual ~IconService() = default;
  [[nodiscard]] virtual DeviceInformation deviceInformation() = 0;
  /// The application's primary icon as a PNG file, in its own proportions; the same bytes for the
  /// same icon and variant. Pictures may be anybody's, so an implementation bounds what it reads
  /// and how large a picture it takes. POSIX errors: ENOENT for an application that has no icon,
  /// EINVAL for a box that is empty or larger than any icon.
  [[nodiscard]] virtual std::expected<Data, IconFailure> primaryIcon(
      const BundleProxy& application, const IconVariant& variant) = 0;
};

}  // namespace mirabel
