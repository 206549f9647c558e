#include "linux/icons/IconPicture.h"

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstddef>
#include <gdk-pixbuf/gdk-pixbuf.h>
#include <memory>
#include <optional>
#include <string_view>

namespace mirabel {
namespace {

constexpr int mostPixels = 4096;
constexpr int bytesPerPixel = 4;
constexpr int bitsPerSample = 8;
constexpr std::string_view pngSignature = "\x89PNG\r\n\x1a\n";

struct ReleaseObject {
  void operator()(void* object) const { g_object_unref(object); }
};
using OwnedPixbuf = std::unique_ptr<GdkPixbuf, ReleaseObject>;
using OwnedLoader = std::unique_ptr<GdkPixbufLoader, ReleaseObject>;
struct FreeBytes {
  void operator()(void* bytes) const { g_free(bytes); }
};

std::unexpected<IconFailure> failed(IconStep step, int code) {
  return std::unexpected(IconFailure{step, Error::posix(code)});
}

/// What the loader's signals need to know, and what they find out.
struct Decoding {
  PixelBox box;
  bool isSVG = false;
  bool isTooLarge = false;
};

void sizePrepared(GdkPixbufLoader* loader, int wide, int high, gpointer data) {
  auto& decoding = *static_cast<Decoding*>(data);
  decoding.isTooLarge = wide > mostPixels || high > mostPixels;
  // Asked for nothing, the loader ends before it takes memory for the pixels.
  if (decoding.isTooLarge || wide < 1 || high < 1) return gdk_pixbuf_loader_set_size(loader, 0, 0);
  if (!decoding.isSVG) return;
  const PixelBox size = fitted({wide, high}, decoding.box);
  gdk_pixbuf_loader_set_size(loader, size.wide, size.high);
}

void areaPrepared(GdkPixbufLoader* loader, gpointer data) {
  // Rows that a damaged file lacks would show what was in the memory before.
  if (!static_cast<Decoding*>(data)->isSVG) {
    gdk_pixbuf_fill(gdk_pixbuf_loader_get_pixbuf(loader), 0);
  }
}

std::uint32_t bigEndian(std::string_view bytes) {
  std::uint32_t number = 0;
  for (const char byte : bytes.substr(0, 4))
    number = (number << 8) | static_cast<unsigned char>(byte);
  return number;
}

/// Whether the file's chunks lead up to its end: the loader takes what is cut off for a picture.
bool isWholePNG(std::string_view file) {
  constexpr std::size_t aroundContents = 12;  // length and type in front, a checksum behind
  if (!file.starts_with(pngSignature)) return false;
  file.remove_prefix(pngSignature.size());
  while (file.size() >= aroundContents) {
    if (file.substr(4, 4) == "IEND") return true;
    const std::size_t length = bigEndian(file);
    if (length > file.size() - aroundContents) return false;
    file.remove_prefix(length + aroundContents);
  }
  return false;
}

bool looksLikeSVG(std::string_view file) {
  constexpr std::size_t reach = 4096;
  return file.substr(0, reach).find("<svg") != std::string_view::npos;
}

std::expected<OwnedPixbuf, IconFailure> decoded(const Data& file, Decoding decoding) {
  const std::string_view bytes = stringView(file);
  decoding.isSVG = !bytes.starts_with(pngSignature) && looksLikeSVG(bytes);
  if (!decoding.isSVG && !isWholePNG(bytes)) return failed(IconStep::cachedBitmap, EILSEQ);
  // Formats that no icon has are not tried: each decoder is one more that bytes could harm.
  const OwnedLoader loader(
      gdk_pixbuf_loader_new_with_type(decoding.isSVG ? "svg" : "png", nullptr));
  if (!loader) return failed(IconStep::cachedBitmap, EILSEQ);
  g_signal_connect(loader.get(), "size-prepared", G_CALLBACK(sizePrepared), &decoding);
  g_signal_connect(loader.get(), "area-prepared", G_CALLBACK(areaPrepared), &decoding);
  const bool isWritten =
      gdk_pixbuf_loader_write(loader.get(), file.data(), file.size(), nullptr) != FALSE;
  const bool isClosed = gdk_pixbuf_loader_close(loader.get(), nullptr) != FALSE;
  if (decoding.isTooLarge) return failed(IconStep::cachedBitmap, EFBIG);
  GdkPixbuf* pixbuf = gdk_pixbuf_loader_get_pixbuf(loader.get());
  if (!isWritten || !isClosed || pixbuf == nullptr) return failed(IconStep::cachedBitmap, EILSEQ);
  OwnedPixbuf withAlpha(gdk_pixbuf_add_alpha(pixbuf, FALSE, 0, 0, 0));
  if (!withAlpha) return failed(IconStep::cachedBitmap, ENOMEM);
  return withAlpha;
}

void freePixels(guchar* pixels, gpointer) {
  g_free(pixels);
}

std::expected<OwnedPixbuf, IconFailure> scaled(const GdkPixbuf& picture, const PixelBox& size) {
  const auto rowBytes = static_cast<std::size_t>(size.wide) * bytesPerPixel;
  auto* pixels = static_cast<guchar*>(g_try_malloc0_n(static_cast<gsize>(size.high), rowBytes));
  if (pixels == nullptr) return failed(IconStep::newData, ENOMEM);
  OwnedPixbuf image(gdk_pixbuf_new_from_data(pixels, GDK_COLORSPACE_RGB, TRUE, bitsPerSample,
                                             size.wide, size.high, static_cast<int>(rowBytes),
                                             freePixels, nullptr));
  if (!image) return failed(IconStep::newImage, ENOMEM);
  const double across = double(size.wide) / gdk_pixbuf_get_width(&picture);
  const double down = double(size.high) / gdk_pixbuf_get_height(&picture);
  gdk_pixbuf_scale(&picture, image.get(), 0, 0, size.wide, size.high, 0, 0, across, down,
                   GDK_INTERP_BILINEAR);
  return image;
}

std::expected<Data, IconFailure> encoded(GdkPixbuf& image) {
  gchar* bytes = nullptr;
  gsize size = 0;
  if (!gdk_pixbuf_save_to_buffer(&image, &bytes, &size, "png", nullptr, nullptr)) {
    return failed(IconStep::finalization, EIO);
  }
  const std::unique_ptr<gchar, FreeBytes> owned(bytes);
  return dataFromString({bytes, size});
}

}  // namespace

PixelBox fitted(const PixelBox& picture, const PixelBox& box) {
  const double factor = std::min(double(box.wide) / picture.wide, double(box.high) / picture.high);
  const auto side = [&](int length, int most) {
    return std::clamp(static_cast<int>(std::lround(length * factor)), 1, most);
  };
  return {side(picture.wide, box.wide), side(picture.high, box.high)};
}

std::vector<std::string> readableIconEndings() {
  std::vector<std::string> endings{".png"};
  GSList* formats = gdk_pixbuf_get_formats();
  for (const GSList* each = formats; each != nullptr; each = each->next) {
    gchar* name = gdk_pixbuf_format_get_name(static_cast<GdkPixbufFormat*>(each->data));
    if (std::string_view(name) == "svg") endings.emplace_back(".svg");
    g_free(name);
  }
  g_slist_free(formats);
  return endings;
}

std::expected<Data, IconFailure> drawnAsPNG(const Data& file, const PixelBox& box) {
  const auto picture = decoded(file, {box});
  if (!picture) return std::unexpected(picture.error());
  const PixelBox has{gdk_pixbuf_get_width(picture->get()), gdk_pixbuf_get_height(picture->get())};
  const auto image = scaled(**picture, fitted(has, box));
  if (!image) return std::unexpected(image.error());
  return encoded(**image);
}

}  // namespace mirabel
