#include "provider/AppThumbnails.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "foundation/FatalError.h"
#include "foundation/Log.h"
#include "fs/LogText.h"

namespace mirabel {
namespace {

constexpr double mostPixels = 4096;
constexpr const char* thumbnailType = "image/png";

/// 0 for what is no size, which the icon service refuses.
std::uint32_t pixelsFor(double points, double scale) {
  const double pixels = std::ceil(points * scale);
  if (!(pixels > 0)) return 0;
  return static_cast<std::uint32_t>(std::min(pixels, mostPixels));
}

IconVariant variantFor(const ThumbnailSize& size, const DeviceInformation& device) {
  const bool isScale = std::isfinite(device.mainScreenScale) && device.mainScreenScale > 0;
  const double scale = isScale ? device.mainScreenScale : 1;
  return {pixelsFor(size.width, scale), pixelsFor(size.height, scale), scale,
          device.deviceClassNumber};
}

std::string textOf(const IconFailure& failure) {
  switch (failure.step) {
    case IconStep::primaryIconData:
      return ": can't get primary icon data; " + failure.error.description();
    case IconStep::cachedBitmap:
      return ": can't create icon from cached bitmap";
    case IconStep::newData:
      return ": can't create new data";
    case IconStep::newImage:
      return ": can't create image from new data";
    case IconStep::finalization:
      return ": can't finalize image";
  }
  fatalError("an icon failed at no known step");
}

}  // namespace

void AppThumbnails::fetchThumbnailsForItemIdentifiers(
    const std::vector<std::string>& identifiers, const ThumbnailSize& requestedSize,
    const PerThumbnailHandler& perThumbnailCompletionHandler,
    const CompletionHandler& completionHandler) const {
  {
    const LogSection section("fetching thumbnails for " + listOfTexts(identifiers));
    const IconVariant variant = variantFor(requestedSize, icons_.deviceInformation());
    for (const std::string& identifier : identifiers) {
      auto image = thumbnail(identifier, variant);
      if (image) {
        perThumbnailCompletionHandler(identifier, *std::move(image), std::nullopt);
      } else {
        perThumbnailCompletionHandler(identifier, std::nullopt, std::move(image.error()));
      }
    }
  }
  completionHandler(std::nullopt);
}

void AppThumbnails::fetchThumbnailsForItemIdentifiers(
    const std::vector<std::string>& identifiers, const ThumbnailSize& requestedSize,
    const PerTypedThumbnailHandler& perThumbnailCompletionHandlerWithType,
    const CompletionHandler& completionHandler) const {
  const PerThumbnailHandler handler = [&](std::string_view identifier, std::optional<Data> image,
                                          std::optional<Error> error) {
    std::optional<std::string> type;
    if (image) type = thumbnailType;
    perThumbnailCompletionHandlerWithType(identifier, std::move(image), std::move(type),
                                          std::move(error));
  };
  fetchThumbnailsForItemIdentifiers(identifiers, requestedSize, handler, completionHandler);
}

/// Nothing for what is no app library.
Result<std::optional<Data>> AppThumbnails::thumbnail(const std::string& identifier,
                                                     const IconVariant& variant) const {
  if (!identifier.starts_with('#')) {
    logDebug([&] { return identifier + ": no app library, so there is no thumbnail"; });
    return std::nullopt;
  }
  const std::string bundleIdentifier = identifier.substr(1);
  const auto proxy = applications_.proxyForBundleIdentifier(bundleIdentifier);
  if (!proxy) {
    logError(identifier + ": can't get app proxy for " + bundleIdentifier);
    return fail(Error::nonExistentItem(identifier));
  }
  auto icon = icons_.primaryIcon(*proxy, variant);
  if (icon) return *std::move(icon);
  logError(identifier + textOf(icon.error()));
  return fail(std::move(icon.error().error));
}

}  // namespace mirabel
