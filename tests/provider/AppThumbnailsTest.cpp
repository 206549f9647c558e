#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits>

#include "provider/AppThumbnails.h"
#include "provider/Lines.h"
#include "support/FakeIconService.h"
#include "support/FakePlatform.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;

/// One call of a handler.
struct Told {
  std::string identifier;
  std::optional<Data> image;
  std::optional<Error> error;

  friend bool operator==(const Told&, const Told&) = default;
};

class AppThumbnailsTest : public ::testing::Test {
 protected:
  AppThumbnailsTest() {
    fake.install("org.example.draw", "/apps/draw");
    icons.icons["org.example.draw"] = picture;
  }

  void fetch(const std::vector<std::string>& identifiers, const ThumbnailSize& size = {32, 32}) {
    thumbnails.fetchThumbnailsForItemIdentifiers(
        identifiers, size,
        [&](std::string_view identifier, std::optional<Data> image, std::optional<Error> error) {
          EXPECT_EQ(completions, 0);
          told.push_back({std::string(identifier), std::move(image), std::move(error)});
        },
        [&](const std::optional<Error>& error) {
          EXPECT_FALSE(error);
          ++completions;
        });
  }

  const Data picture = dataFromString("a picture");
  FakePlatform fake;
  FakeIconService icons;
  AppThumbnails thumbnails{fake.applications, icons};
  std::vector<Told> told;
  int completions = 0;
  LogCapture log;
};

TEST_F(AppThumbnailsTest, EachIdentifierIsAnsweredOnceAndThenAllOfThem) {
  fetch({"#org.example.draw", "did=1", "#org.example.gone", "#org.example.draw"});
  EXPECT_THAT(
      told, ElementsAre(Told{"#org.example.draw", picture, {}}, Told{"did=1", {}, {}},
                        Told{"#org.example.gone", {}, Error::nonExistentItem("#org.example.gone")},
                        Told{"#org.example.draw", picture, {}}));
  EXPECT_EQ(completions, 1);
  EXPECT_THAT(log.sectionLabels(),
              ElementsAre("fetching thumbnails for [\"#org.example.draw\", \"did=1\", "
                          "\"#org.example.gone\", \"#org.example.draw\"]"));
  EXPECT_THAT(log.messages(),
              ElementsAre(debug("did=1: no app library, so there is no thumbnail"),
                          error("#org.example.gone: can't get app proxy for org.example.gone")));
  fetch({});
  EXPECT_EQ(completions, 2);
}

TEST_F(AppThumbnailsTest, AFailureNamesItsStepAndTheOthersAreAnswered) {
  const Error cause = Error::posix(EIO);
  const std::pair<IconStep, std::string> steps[] = {
      {IconStep::primaryIconData, ": can't get primary icon data; " + cause.description()},
      {IconStep::cachedBitmap, ": can't create icon from cached bitmap"},
      {IconStep::newData, ": can't create new data"},
      {IconStep::newImage, ": can't create image from new data"},
      {IconStep::finalization, ": can't finalize image"},
  };
  fake.install("org.example.bad", "/apps/bad");
  for (const auto& [step, text] : steps) {
    icons.icons["org.example.bad"] = std::unexpected(IconFailure{step, cause});
    log.clear();
    told.clear();
    completions = 0;
    fetch({"#org.example.bad", "#org.example.draw"});
    EXPECT_THAT(told, ElementsAre(Told{"#org.example.bad", {}, cause},
                                  Told{"#org.example.draw", picture, {}}));
    EXPECT_THAT(log.messages(), ElementsAre(error("#org.example.bad" + text)));
  }
}

TEST_F(AppThumbnailsTest, TheVariantIsThatOfTheScreenAndNeverBeyondBounds) {
  constexpr double nan = std::numeric_limits<double>::quiet_NaN();
  constexpr double infinity = std::numeric_limits<double>::infinity();
  const struct {
    double scale;
    ThumbnailSize size;
    std::uint32_t wide, high;
  } cases[] = {
      {1, {32, 48}, 32, 48},   {2, {32, 48}, 64, 96},  {1.5, {33, 1}, 50, 2},
      {2, {0, 16}, 0, 32},     {2, {-5, nan}, 0, 0},   {1, {1e300, infinity}, 4096, 4096},
      {nan, {32, 32}, 32, 32}, {-2, {32, 32}, 32, 32}, {infinity, {32, 32}, 32, 32},
  };
  for (const auto& c : cases) {
    icons.device = {7, c.scale};
    icons.asked.clear();
    completions = 0;
    fetch({"#org.example.draw"}, c.size);
    ASSERT_EQ(icons.asked.size(), 1U);
    EXPECT_EQ(icons.asked[0].pixelsWide, c.wide);
    EXPECT_EQ(icons.asked[0].pixelsHigh, c.high);
    EXPECT_EQ(icons.asked[0].deviceClassNumber, 7);
  }
}

TEST_F(AppThumbnailsTest, TheTypeIsToldOfAPictureOnly) {
  std::vector<std::optional<std::string>> types;
  thumbnails.fetchThumbnailsForItemIdentifiers(
      {"#org.example.draw", "fid=2"}, {32, 32},
      [&](std::string_view, const std::optional<Data>& image,
          const std::optional<std::string>& type, const std::optional<Error>&) {
        EXPECT_EQ(image.has_value(), type.has_value());
        types.push_back(type);
      },
      [&](const std::optional<Error>&) { ++completions; });
  EXPECT_THAT(types, ElementsAre("image/png", std::nullopt));
  EXPECT_EQ(completions, 1);
}

}  // namespace
}  // namespace mirabel::testing
