#include <cerrno>
#include <limits>

#include "foundation/KeyedArchive.h"
#include "items/AttributeNames.h"
#include "mirabel/TagData.h"
#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::IsEmpty;

constexpr Date date{1'763'700'000, 0};

class MetadataTest : public ProviderFixture {
 protected:
  MetadataTest() : file(id("a.txt")) {}
  std::map<std::string, Data, std::less<>>& attributes() {
    return fake.volume.at(fake.path("a.txt")).attributes;
  }
  std::vector<std::string> labels() {
    return keyedarchive::unarchiveStrings(attributes().at(std::string(attributename::tags)))
        .value();
  }

  std::string file;
};

TEST_F(MetadataTest, OfTagsTheLabelsAreKeptInTheirOrder) {
  const auto tags = encodeTagData({{"work", 3}, {"\xff", 0}, {"", 1}, {"work", 0}}).value();
  vessel->setTagData(tags, file, done.handler());
  EXPECT_EQ(done.item()->tagData(), encodeTagData({{"work"}, {"\xff"}, {""}, {"work"}}).value());
  EXPECT_EQ(labels(), (std::vector<std::string>{"work", "\xff", "", "work"}));
  for (const auto& none : {std::optional<Data>(), std::optional(Data{}), std::optional(Data{1, 2}),
                           std::optional(encodeTagData({}).value())}) {
    done.results.clear();
    vessel->setTagData(tags, file, Completions().handler());
    vessel->setTagData(none, file, done.handler());
    EXPECT_EQ(done.item()->tagData(), encodeTagData({}).value());
    EXPECT_THAT(labels(), IsEmpty());
  }
  vessel->setTagData(tags, file, Completions().handler());
  done.results.clear();
  vessel->setTagData(encodeTagData({{std::string(100'000, 'x')}}).value(), file, done.handler());
  EXPECT_TRUE(done.error().isPosix(E2BIG));
  EXPECT_EQ(labels().size(), 4U);
}

TEST_F(MetadataTest, WhatNoArchiveHoldsRemovesTheAttribute) {
  vessel->setLastUsedDate(date, file, Completions().handler());
  vessel->setLastUsedDate(Date{Date::latest.seconds + 1, 0}, file, done.handler());
  EXPECT_EQ(done.item()->lastUsedDate(), std::nullopt);
  EXPECT_THAT(attributes(), IsEmpty());
}

TEST_F(MetadataTest, AFailedWriteIsTheErrorThatItHad) {
  const struct {
    std::function<void(const std::string&)> start;
    std::string attribute;
  } setters[] = {
      {[&](const auto& id) { vessel->setLastUsedDate(date, id, done.handler()); },
       "com.norvane.lastuseddate#PS"},
      {[&](const auto& id) { vessel->setTagData({}, id, done.handler()); },
       "com.norvane.metadata:_kMDItemUserTags"},
      {[&](const auto& id) { vessel->setFavoriteRank(Number::of(1.0), id, done.handler()); },
       "com.norvane.favorite-rank.number#PS"},
  };
  const struct {
    Op op;
    Error error;
  } failures[] = {
      {Op::readWriteAccess, Error::posix(EACCES)},
      {Op::attributeSet, Error::posix(ENOSPC, "with a detail")},
      {Op::attributeSet, Error::store(11, "malformed")},
  };
  for (const auto& setter : setters) {
    for (const auto& failure : failures) {
      clear();
      attributes()[setter.attribute] = {1};
      fake.faults.fail(failure.op, failure.error);
      setter.start(file);
      EXPECT_EQ(done.error(), failure.error);
      EXPECT_EQ(attributes()[setter.attribute], Data{1});
    }
    clear();
    setter.start("fid=4711");
    EXPECT_EQ(done.error(), Error::nonExistentItem("fid=4711"));
  }
}

TEST_F(MetadataTest, TheSectionEndsBeforeTheCompletion) {
  vessel->setFavoriteRank(Number::of(1.0), file, [&](const LocalVessel::ItemResult&) {
    EXPECT_TRUE(log.lines().back().text.starts_with("[DEBUG] ┗"));
    log.clear();
  });
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(MetadataTest, AnythingWithAFileHasMetadata) {
  for (const std::string& identifier : {id("folder"), std::string("#org.example.draw"),
                                        std::string(VesselRootContainerItemIdentifier)}) {
    done.results.clear();
    vessel->setFavoriteRank(Number::of(2.0), identifier, done.handler());
    EXPECT_EQ(done.item()->favoriteRank(), Number::of(2.0)) << identifier;
  }
}

}  // namespace
}  // namespace mirabel::testing
