#include "linux/icons/LinuxIconService.h"

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <utility>

#include "linux/icons/BoundedFile.h"
#include "linux/icons/DesktopEntryIcon.h"
#include "linux/icons/IconLookup.h"
#include "linux/icons/IconPicture.h"

namespace mirabel {
namespace {

constexpr std::size_t largestFile = 8u << 20;
constexpr std::uint32_t mostPixelsAsked = 4096;
constexpr double largestScaleAsked = 16;

/// The size that themes know the box by.
IconSize sizeFor(const IconVariant& variant) {
  const double scale = std::isfinite(variant.scale)
                           ? std::clamp(std::ceil(variant.scale), 1.0, largestScaleAsked)
                           : 1;
  const double points = std::min(variant.pixelsWide, variant.pixelsHigh) / scale;
  return {std::max(1, static_cast<int>(std::lround(points))), static_cast<int>(scale)};
}

bool isIconBox(const IconVariant& variant) {
  const auto isSide = [](std::uint32_t pixels) { return pixels > 0 && pixels <= mostPixelsAsked; };
  return isSide(variant.pixelsWide) && isSide(variant.pixelsHigh);
}

}  // namespace

std::expected<Data, IconFailure> LinuxIconService::primaryIcon(const BundleProxy& application,
                                                               const IconVariant& variant) {
  const auto file = iconFile(application, variant);
  if (!file) return std::unexpected(IconFailure{IconStep::primaryIconData, file.error()});
  return drawnAsPNG(*file,
                    {static_cast<int>(variant.pixelsWide), static_cast<int>(variant.pixelsHigh)});
}

Result<Data> LinuxIconService::iconFile(const BundleProxy& application,
                                        const IconVariant& variant) const {
  if (!isIconBox(variant)) return fail(Error::posix(EINVAL, "no size for an icon"));
  const auto icon =
      iconOfDesktopEntry(options_.folders.applications, application.bundleIdentifier.value_or(""));
  if (!icon) return fail(icon.error());
  if (icon->starts_with('/')) return readBoundedFile(*icon, largestFile);
  IconLookup lookup(options_.folders, readableIconEndings());
  const auto path = lookup.find(*icon, sizeFor(variant), options_.theme);
  if (!path) return fail(Error::posix(ENOENT, "no icon theme has this icon"));
  return readBoundedFile(*path, largestFile);
}

}  // namespace mirabel
