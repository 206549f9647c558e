#include <cerrno>
#include <cstdint>
#include <limits>

#include "applibrary/AppLibraryFixture.h"
#include "applibrary/LocalAppLibraryCache.h"
#include "foundation/KeyedArchive.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::StartsWith;
using Increment = LocalAppLibraryCache::Increment;

constexpr std::uint64_t largest = std::numeric_limits<std::uint64_t>::max();

class LocalAppLibraryCacheTest : public AppLibraryFixture {
 protected:
  void write(const PropertyList::Dictionary& root) {
    fake.caches.files[mainCachePath] = keyedarchive::archiveDictionary(root).value();
  }
  static std::pair<std::string, PropertyList> token(Number number) {
    return {"versionToken", PropertyList(number)};
  }
  static std::pair<std::string, PropertyList> proxies(PropertyList::Array array) {
    return {"bundleProxy", PropertyList(std::move(array))};
  }
  std::string size() const { return std::to_string(fake.caches.files.at(mainCachePath).size()); }

  std::vector<BundleProxy> records = {recordOf("org.a", "/apps/a", "A"),
                                      recordOf("org.b", "/apps/b")};
  AppLibraryCaches caches{fake.caches};
  LocalAppLibraryCache& main = caches.main;
};

TEST_F(LocalAppLibraryCacheTest, SavedRecordsAreLoadedByTheNextProcess) {
  EXPECT_EQ(main.versionToken(), 0U);
  EXPECT_EQ(main.save(records, 7, Increment::yes).value(), 1U);
  EXPECT_EQ(main.save(records, 7, Increment::yes).value(), 2U);
  EXPECT_EQ(main.save(records, 7, Increment::no).value(), 7U);
  EXPECT_EQ(main.versionToken(), 7U);
  EXPECT_THAT(log.sectionLabels(), ::testing::Each("saving bundle proxies to main cache"));
  EXPECT_EQ(messages().back(), "[DEBUG] wrote on disk " + size() + " bytes at " + mainCachePath);

  AppLibraryCaches next(fake.caches);
  const auto content = next.main.load();
  ASSERT_TRUE(content);
  EXPECT_EQ(content->versionToken, 7U);
  EXPECT_THAT(shown(content->records), ElementsAre("org.a /apps/a A", "org.b /apps/b -"));
  EXPECT_EQ(next.main.versionToken(), 7U);
  EXPECT_THAT(log.sectionLabels(), ElementsAre("loading bundle proxies from main cache"));
  EXPECT_THAT(messages(),
              ElementsAre("[DEBUG] read from disk " + size() + " bytes at " + mainCachePath,
                          "[DEBUG] loaded 2 app library items from data",
                          "[DEBUG] version token was set to 7 after load"));
}

TEST_F(LocalAppLibraryCacheTest, WhatIsStoredComesBackByteForByte) {
  records = {recordOf("a/../\"\xff\n", "/apps/\xff\xfe", std::string("N\0me", 4)), BundleProxy{},
             recordOf("", "/", std::string(100'000, 'n'))};
  ASSERT_TRUE(main.save(records, 1, Increment::no));
  EXPECT_EQ(shown(main.load()->records), shown(records));
}

TEST_F(LocalAppLibraryCacheTest, TokenNeverGoesDownOnLoad) {
  ASSERT_TRUE(main.save(records, 5, Increment::no));
  main.setVersionToken(7);
  messages();
  const auto content = main.load();
  ASSERT_TRUE(content);
  EXPECT_EQ(content->versionToken, 5U);
  EXPECT_EQ(main.versionToken(), 7U);
  EXPECT_EQ(messages().back(), "[DEBUG] loaded 2 app library items from data");
}

TEST_F(LocalAppLibraryCacheTest, WhatCannotBeUnderstoodIsNothing) {
  const auto record = [](std::string key, PropertyList value) {
    return PropertyList(PropertyList::Dictionary{{std::move(key), std::move(value)}});
  };
  const PropertyList text(std::string("5"));
  const PropertyList number(Number::of(std::int64_t{5}));
  const std::string invalidToken =
      "[DEBUG] version token invalid; data on disk is corrupted let's reset";
  const std::string invalidProxies =
      "[DEBUG] bundle proxies invalid; data on disk is corrupted let's reset";
  const std::pair<PropertyList::Dictionary, std::string> cases[] = {
      {{}, invalidToken},
      {{proxies({})}, invalidToken},
      {{{"versionToken", text}, proxies({})}, invalidToken},
      {{token(Number::of(5.0)), proxies({})}, invalidToken},
      {{token(Number::of(std::int64_t{-1})), proxies({})}, invalidToken},
      {{token(Number::of(std::int64_t{5}))}, invalidProxies},
      {{token(Number::of(std::int64_t{5})), {"bundleProxy", text}}, invalidProxies},
      {{token(Number::of(std::int64_t{5})), proxies({text})}, invalidProxies},
      {{token(Number::of(std::int64_t{5})), proxies({record("bundleIdentifier", number)})},
       invalidProxies},
      {{token(Number::of(std::int64_t{5})), proxies({record("localizedName", number)})},
       invalidProxies},
      {{token(Number::of(std::int64_t{5})), proxies({record("dataContainerURL", text)})},
       invalidProxies},
  };
  for (const auto& [root, message] : cases) {
    write(root);
    EXPECT_FALSE(main.load());
    EXPECT_EQ(messages().back(), message);
  }
  EXPECT_EQ(main.versionToken(), 0U);
  write({token(Number::of(largest)), proxies({record("unknown", number)})});
  EXPECT_EQ(main.load()->versionToken, largest);
}

TEST_F(LocalAppLibraryCacheTest, MissingOrUnreadableFileIsNothing) {
  main.setVersionToken(3);
  EXPECT_FALSE(main.load());
  EXPECT_THAT(messages(), ElementsAre("[DEBUG] nothing cached on disk"));

  fake.faults.fail(Op::cacheRead, Error::posix(EIO));
  EXPECT_FALSE(main.load());
  EXPECT_THAT(messages(), ElementsAre("[DEBUG] can't load cache from disk let's reset; " +
                                      Error::posix(EIO).description()));

  fake.caches.files[mainCachePath] = keyedarchive::archiveString("another class").value();
  EXPECT_FALSE(main.load());
  EXPECT_THAT(messages(),
              ElementsAre(StartsWith("[DEBUG] can't load cache from disk let's reset; ")));
  EXPECT_EQ(main.versionToken(), 3U);
}

TEST_F(LocalAppLibraryCacheTest, DamagedFileIsNothingOrIsReadAndIsWrittenUnderAHigherNumber) {
  ASSERT_TRUE(main.save(records, 0, Increment::yes));
  const Data whole = fake.caches.files.at(mainCachePath);
  std::vector<Data> damaged = {{}, Data(whole.begin(), whole.end() - 1)};
  for (std::size_t bit = 0; bit < whole.size() * 8; ++bit) {
    damaged.push_back(whole);
    damaged.back()[bit / 8] ^= static_cast<std::uint8_t>(1U << (bit % 8));
  }
  std::size_t refused = 0;
  for (const Data& bytes : damaged) {
    fake.caches.files[mainCachePath] = bytes;
    AppLibraryCaches next(fake.caches);
    const auto content = next.main.load();
    refused += content ? 0 : 1;
    const std::uint64_t token = content ? content->versionToken : 0;
    ASSERT_EQ(next.main.versionToken(), token);
    // The numbers go on where the lost file had left them.
    ASSERT_GT(next.main.save(records, 0, Increment::yes).value(), std::max(token, refused));
    ASSERT_EQ(shown(next.main.load()->records), shown(records));
  }
  EXPECT_GT(refused, whole.size() * 2);
}

TEST_F(LocalAppLibraryCacheTest, TwoProcessesNeverGiveOneNumberToTwoContents) {
  AppLibraryCaches other(fake.caches);
  ASSERT_EQ(main.save(records, 0, Increment::yes).value(), 1U);
  EXPECT_EQ(other.main.save({}, 0, Increment::yes).value(), 2U);
  EXPECT_EQ(main.load()->versionToken, 2U);
  EXPECT_EQ(main.versionToken(), 2U);

  // The other process writes while this one is about to: the later number is overwritten.
  fake.caches.afterClaim = [&] { ASSERT_EQ(other.main.save({}, 0, Increment::yes).value(), 4U); };
  EXPECT_EQ(main.save(records, 0, Increment::yes).value(), 3U);
  EXPECT_EQ(other.main.load()->versionToken, 3U);
  EXPECT_EQ(other.main.versionToken(), 4U);
  EXPECT_EQ(main.save(records, 0, Increment::yes).value(), 5U);
}

TEST_F(LocalAppLibraryCacheTest, MoreThanAnArchiveHoldsIsNotSaved) {
  ASSERT_TRUE(main.save(records, 0, Increment::yes));
  const Data before = fake.caches.files.at(mainCachePath);
  records.push_back(recordOf("a", "/a", std::string(20u << 20, 'n')));
  EXPECT_FALSE(main.save(records, 0, Increment::yes));
  EXPECT_EQ(fake.caches.files.at(mainCachePath), before);
  EXPECT_EQ(main.versionToken(), 1U);
}

TEST_F(LocalAppLibraryCacheTest, LargestTokenCannotBeIncremented) {
  main.setVersionToken(largest);
  EXPECT_EQ(main.save(records, largest, Increment::no).value(), largest);
  EXPECT_DEATH(
      {
        Log::shared().setSink(nullptr, LogLevel::error);
        static_cast<void>(main.save(records, 0, Increment::yes));
      },
      "version token of the main cache");
}

}  // namespace
}  // namespace mirabel::testing
