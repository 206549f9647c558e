#include "linux/icons/IconFixture.h"

#include <filesystem>
#include <fstream>
#include <gdk-pixbuf/gdk-pixbuf.h>
#include <ostream>
#include <stdexcept>

namespace mirabel::testing {

void PrintTo(const Picture& picture, std::ostream* out) {
  *out << picture.wide << "x" << picture.high << " #" << std::hex << picture.colour << std::dec;
}

Data png(const Picture& picture) {
  GdkPixbuf* image = gdk_pixbuf_new(GDK_COLORSPACE_RGB, TRUE, 8, picture.wide, picture.high);
  gdk_pixbuf_fill(image, picture.colour);
  gchar* bytes = nullptr;
  gsize size = 0;
  const bool isMade =
      gdk_pixbuf_save_to_buffer(image, &bytes, &size, "png", nullptr, nullptr) != FALSE;
  g_object_unref(image);
  if (!isMade) throw std::runtime_error("can't make a picture");
  Data file = dataFromString({bytes, size});
  g_free(bytes);
  return file;
}

Picture pictureIn(const Data& png) {
  GdkPixbufLoader* loader = gdk_pixbuf_loader_new_with_type("png", nullptr);
  const bool isWhole = gdk_pixbuf_loader_write(loader, png.data(), png.size(), nullptr) != FALSE;
  const bool isPicture = gdk_pixbuf_loader_close(loader, nullptr) != FALSE && isWhole;
  Picture picture;
  if (isPicture) {
    GdkPixbuf* image = gdk_pixbuf_loader_get_pixbuf(loader);
    const guint8* pixel = gdk_pixbuf_read_pixels(image);
    for (int i = 0; i < 4; ++i)
      picture.colour = (picture.colour << 8) | pixel[i];
    picture.wide = gdk_pixbuf_get_width(image);
    picture.high = gdk_pixbuf_get_height(image);
  }
  g_object_unref(loader);
  if (!isPicture) throw std::runtime_error("no PNG file");
  return picture;
}

void IconFixture::write(const std::string& path, std::string_view contents) const {
  std::filesystem::create_directories(std::filesystem::path(at(path)).parent_path());
  std::ofstream(at(path), std::ios::binary) << contents;
}

void IconFixture::write(const std::string& path, const Picture& picture) const {
  write(path, stringView(png(picture)));
}

void IconFixture::writeEntry(const std::string& identifier, const std::string& icon) const {
  write(data + "applications/" + identifier + ".desktop",
        "[Desktop Entry]\nType=Application\nName=x\nExec=false\nIcon=" + icon + "\n");
}

IconFixture::Icon IconFixture::icon(const std::string& identifier, const IconVariant& variant,
                                    const std::string& theme) const {
  LinuxIconService service({folders(), theme});
  BundleProxy application;
  application.bundleIdentifier = identifier;
  return service.primaryIcon(application, variant);
}

}  // namespace mirabel::testing
