#include <cerrno>
#include <filesystem>
#include <functional>
#include <sys/stat.h>

#include "linux/icons/IconFixture.h"
#include "linux/icons/IconPicture.h"
#include "linux/icons/LinuxIconService.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

constexpr std::uint32_t red = 0xFF0000FF;
constexpr std::uint32_t blue = 0x0000FFFF;

class LinuxIconServiceTest : public IconFixture {
 protected:
  LinuxIconServiceTest() { writeEntry("app", "app"); }

  void expectFailure(const Icon& icon, IconStep step, int code) const {
    ASSERT_FALSE(icon);
    EXPECT_EQ(icon.error().step, step) << icon.error().error.description();
    EXPECT_TRUE(icon.error().error.isPosix(code)) << icon.error().error.description();
  }
  const std::string file = icons + "hicolor/48x48/apps/app.png";
};

TEST_F(LinuxIconServiceTest, TheIconFillsTheBoxAndKeepsItsProportions) {
  write(file, Picture{48, 24, red});
  const struct {
    std::uint32_t wide, high;
    Picture picture;
  } cases[] = {
      {48, 48, {48, 24, red}}, {96, 96, {96, 48, red}}, {10, 100, {10, 5, red}},
      {100, 6, {12, 6, red}},  {1, 1, {1, 1, red}},     {4096, 1, {2, 1, red}},
  };
  for (const auto& c : cases) {
    const Icon drawn = icon("app", {c.wide, c.high});
    ASSERT_TRUE(drawn) << drawn.error().error.description();
    EXPECT_EQ(pictureIn(*drawn), c.picture);
    EXPECT_EQ(icon("app", {c.wide, c.high}), drawn) << "not the same bytes again";
  }
}

TEST_F(LinuxIconServiceTest, ThePictureForTheSizeAndScaleIsTaken) {
  write(file, Picture{48, 48, red});
  write(icons + "hicolor/24x24@2/apps/app.png", Picture{48, 48, blue});
  EXPECT_EQ(pictureIn(icon("app", {48, 48, 1}).value()).colour, red);
  EXPECT_EQ(pictureIn(icon("app", {48, 48, 2}).value()).colour, blue);
  write(icons + "mine/index.theme", "[Icon Theme]\nDirectories=a\n[a]\nSize=48\n");
  write(icons + "mine/a/app.png", Picture{1, 1, blue});
  EXPECT_EQ(pictureIn(icon("app", {48, 48, 1}, "mine").value()).colour, blue);
}

TEST_F(LinuxIconServiceTest, ADrawingIsDrawnAtTheSizeThatIsWanted) {
  if (readableIconEndings().size() < 2) GTEST_SKIP() << "no loader for SVG is installed";
  const std::string shape =
      "xmlns=\"http://www.w3.org/2000/svg\"><rect width=\"100%\" "
      "height=\"100%\" fill=\"#0000ff\"/></svg>";
  write(icons + "hicolor/scalable/apps/app.svg", "<svg width=\"20\" height=\"10\" " + shape);
  EXPECT_EQ(pictureIn(icon("app", {200, 200}).value()), (Picture{200, 100, blue}));
  write(icons + "hicolor/scalable/apps/app.svg", "<svg width=\"5000\" height=\"10\" " + shape);
  expectFailure(icon("app"), IconStep::cachedBitmap, EFBIG);
}

TEST_F(LinuxIconServiceTest, EveryCutAndDamagedPictureIsRefusedOrWhole) {
  const Data whole = png({16, 16, red});
  // The checksum of the end tells nothing more.
  for (std::size_t size = 0; size + 4 < whole.size(); ++size) {
    write(file, stringView(whole).substr(0, size));
    expectFailure(icon("app"), IconStep::cachedBitmap, EILSEQ);
  }
  for (std::size_t i = 0; i < whole.size(); ++i) {
    Data damaged = whole;
    damaged[i] ^= 0x10;
    write(file, stringView(damaged));
    const Icon drawn = icon("app");
    EXPECT_TRUE(!drawn || pictureIn(*drawn).wide > 0) << i;
  }
}

TEST_F(LinuxIconServiceTest, WhatIsLargerThanAnyIconIsRefusedBeforeItIsDecoded) {
  for (const Picture& picture : {Picture{4097, 1, red}, Picture{1, 4097, red}}) {
    write(file, picture);
    expectFailure(icon("app"), IconStep::cachedBitmap, EFBIG);
  }
  write(file, Picture{4096, 1, red});
  EXPECT_EQ(pictureIn(icon("app").value()), (Picture{48, 1, red}));
  fs::resize_file(at(file), (8u << 20) + 1);
  expectFailure(icon("app"), IconStep::primaryIconData, EFBIG);
}

TEST_F(LinuxIconServiceTest, OnlyRegularFilesAreOpened) {
  write("picture.png", Picture{48, 48, blue});
  fs::create_directories(fs::path(at(file)).parent_path());
  const std::string fifo = at("fifo");
  ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
  ASSERT_EQ(::mkfifo(at(file).c_str(), 0600), 0);
  expectFailure(icon("app"), IconStep::primaryIconData, ENOENT);
  for (const std::string& path : {fifo, std::string("/dev/zero"), home.path()}) {
    writeEntry("absolute", path);
    expectFailure(icon("absolute"), IconStep::primaryIconData, EINVAL);
    fs::remove(at(file));
    fs::create_symlink(path, at(file));
    expectFailure(icon("app"), IconStep::primaryIconData, ENOENT);
  }
  fs::remove(at(file));
  fs::create_symlink(at("picture.png"), at(file));
  EXPECT_EQ(pictureIn(icon("app").value()).colour, blue);
  writeEntry("absolute", at("picture.png"));
  EXPECT_EQ(pictureIn(icon("absolute").value()).colour, blue);
}

TEST_F(LinuxIconServiceTest, EntriesThatNameNoIconAreNamedInTheFailure) {
  write(file, Picture{48, 48, red});
  const std::string applications = data + "applications/";
  write(applications + "bare.desktop", "[Desktop Entry]\nType=Application\n");
  write(applications + "empty.desktop", "");
  write(applications + "garbage.desktop", "\xFF\xFE[[[");
  writeEntry("outside", "../../../../secret");
  write(applications + "huge.desktop", "[Desktop Entry]\nIcon=app\n");
  fs::resize_file(at(applications + "huge.desktop"), (256u << 10) + 1);
  ASSERT_EQ(::mkfifo(at(applications + "fifo.desktop").c_str(), 0600), 0);
  const std::pair<std::string, int> cases[] = {
      {"missing", ENOENT}, {"bare", ENOENT}, {"empty", ENOENT},   {"garbage", EILSEQ},
      {"huge", EFBIG},     {"fifo", EINVAL}, {"outside", ENOENT}, {"../applications/app", EINVAL},
      {"", EINVAL},        {"..", ENOENT},
  };
  for (const auto& [identifier, code] : cases) {
    SCOPED_TRACE(identifier);
    expectFailure(icon(identifier), IconStep::primaryIconData, code);
  }
  for (const IconVariant& none : {IconVariant{0, 48}, IconVariant{48, 0}, IconVariant{4097, 48}})
    expectFailure(icon("app", none), IconStep::primaryIconData, EINVAL);
}

TEST_F(LinuxIconServiceTest, TheThemeIsTheOneOfTheDesktopsSettings) {
  using Reach = IconFolders::Reach;
  EXPECT_EQ(chosenIconTheme(home.path(), Reach::homeAlone), "hicolor");
  write(".config/gtk-3.0/settings.ini", "[Settings]\ngtk-icon-theme-name=mine\n");
  EXPECT_EQ(chosenIconTheme(home.path(), Reach::homeAlone), "mine");
  for (const std::string& folder : folders().themes)
    EXPECT_TRUE(folder.starts_with(home.path() + "/")) << folder;
}

}  // namespace
}  // namespace mirabel::testing
