#include <cerrno>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits>
#include <map>
#include <string>
#include <vector>

#include "foundation/KeyedArchive.h"
#include "items/AttributeNames.h"
#include "mirabel/TagData.h"
#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::Contains;
using ::testing::IsEmpty;

constexpr Date date{1'763'700'000, 0};

class MetadataTest : public ProviderFixture {
 protected:
  MetadataTest() : file(id("a.txt")) { log.clear(); }
  std::map<std::string, Data, std::less<>>& attributes() {
    return fake.volume.at(fake.path("a.txt")).attributes;
  }
  std::vector<std::string> labels() {
    return keyedarchive::unarchiveStrings(attributes().at(std::string(attributename::tags)))
        .value();
  }

  std::string file;
};

TEST_F(MetadataTest, WhatIsSetIsOnTheItemAndIsClearedAgain) {
  vessel->setLastUsedDate(date, file, done.handler());
  EXPECT_EQ(done.item()->lastUsedDate(), date);
  EXPECT_EQ(log.sectionLabels().front(),
            "set last used date \"2025-11-21T04:40:00Z\" to item \"" + file + "\"");
  clear();
  vessel->setLastUsedDate({}, file, done.handler());
  EXPECT_EQ(done.item()->lastUsedDate(), std::nullopt);
  EXPECT_EQ(log.sectionLabels().front(), "clearing last used date for item \"" + file + "\"");

  for (const Number& rank :
       {Number::of(std::int64_t{-1}), Number::of(std::numeric_limits<std::uint64_t>::max()),
        Number::of(0.5)}) {
    clear();
    vessel->setFavoriteRank(rank, file, done.handler());
    EXPECT_EQ(done.item()->favoriteRank(), rank);
    EXPECT_EQ(log.sectionLabels().front(),
              "set favorite rank \"" + rank.description() + "\" to item \"" + file + "\"");
  }
  clear();
  vessel->setFavoriteRank({}, file, done.handler());
  EXPECT_EQ(done.item()->favoriteRank(), std::nullopt);
  EXPECT_EQ(log.sectionLabels().front(), "set favorite rank \"(null)\" to item \"" + file + "\"");
  EXPECT_THAT(attributes(), IsEmpty());
  // Nothing there to clear is no failure.
  clear();
  vessel->setFavoriteRank({}, file, done.handler());
  EXPECT_TRUE(done.result());
}

TEST_F(MetadataTest, OfTagsTheLabelsAreKeptInTheirOrder) {
  const auto tags = encodeTagData({{"work", 3}, {"\xff", 0}, {"", 1}, {"work", 0}}).value();
  vessel->setTagData(tags, file, done.handler());
  EXPECT_EQ(done.item()->tagData(), encodeTagData({{"work"}, {"\xff"}, {""}, {"work"}}).value());
  EXPECT_EQ(labels(), (std::vector<std::string>{"work", "\xff", "", "work"}));
  EXPECT_EQ(log.sectionLabels().front(), "set tag data to item \"" + file + "\"");
  for (const auto& none : {std::optional<Data>(), std::optional(Data{}), std::optional(Data{1, 2}),
                           std::optional(encodeTagData({}).value())}) {
    done.results.clear();
    vessel->setTagData(tags, file, Completions().handler());
    vessel->setTagData(none, file, done.handler());
    EXPECT_EQ(done.item()->tagData(), encodeTagData({}).value());
    EXPECT_THAT(labels(), IsEmpty());
  }
}

TEST_F(MetadataTest, WhatNoArchiveHoldsRemovesTheAttribute) {
  vessel->setLastUsedDate(date, file, Completions().handler());
  vessel->setLastUsedDate(Date{Date::latest.seconds + 1, 0}, file, done.handler());
  EXPECT_EQ(done.item()->lastUsedDate(), std::nullopt);
  EXPECT_THAT(attributes(), IsEmpty());
}

TEST_F(MetadataTest, TooManyLabelsAreRefusedAndTheTagsStay) {
  vessel->setTagData(encodeTagData({{"work"}}).value(), file, Completions().handler());
  vessel->setTagData(encodeTagData({{std::string(100'000, 'x')}}).value(), file, done.handler());
  EXPECT_TRUE(done.error().isPosix(E2BIG));
  EXPECT_EQ(labels(), std::vector<std::string>{"work"});
}

struct Setter {
  std::function<void(const std::string&)> start;
  std::string attribute;
  std::string line;
};

TEST_F(MetadataTest, AFailedWriteIsTheErrnoThatItLeft) {
  const Setter setters[] = {
      {[&](const auto& id) { vessel->setLastUsedDate(date, id, done.handler()); },
       "com.norvane.lastuseddate#PS",
       "can't set xattr com.norvane.lastuseddate#PS on file://" + fake.path("a.txt") + "; "},
      {[&](const auto& id) { vessel->setTagData({}, id, done.handler()); },
       "com.norvane.metadata:_kMDItemUserTags",
       "can't set xattr com.norvane.metadata:_kMDItemUserTags; "},
      {[&](const auto& id) { vessel->setFavoriteRank(Number::of(1.0), id, done.handler()); },
       "com.norvane.favorite-rank.number#PS",
       "can't set xattr com.norvane.favorite-rank.number#PS; "},
  };
  struct Failure {
    Op op;
    Error error;
    int code;
  };
  const Failure failures[] = {
      {Op::readWriteAccess, Error::posix(EACCES), EACCES},
      {Op::attributeSet, Error::posix(ENOSPC), ENOSPC},
      // An error that says nothing of errno counts for less than errno.
      {Op::attributeSet, Error::file(FileErrorCode::writeNotPermitted), EDQUOT},
  };
  for (const Setter& setter : setters) {
    for (const Failure& failure : failures) {
      clear();
      attributes()[setter.attribute] = {1};
      fake.faults.fail(failure.op, failure.error);
      errno = EDQUOT;
      setter.start(file);
      EXPECT_EQ(done.error(), Error::posix(failure.code));
      EXPECT_EQ(attributes()[setter.attribute], Data{1});
      EXPECT_EQ(log.messages().back(),
                error(setter.line + Error::posix(failure.code).description()));
    }
  }
}

TEST_F(MetadataTest, AnUnknownIdentifierIsTheNoSuchItemErrorWithALineForTags) {
  const Error missing = Error::nonExistentItem("fid=4711");
  vessel->setLastUsedDate(date, "fid=4711", done.handler());
  EXPECT_EQ(done.error(), missing);
  done.results.clear();
  vessel->setFavoriteRank({}, "fid=4711", done.handler());
  EXPECT_EQ(done.error(), missing);
  EXPECT_THAT(
      log.messages(),
      Each(::testing::Field(&LogLine::text, ::testing::Not(::testing::StartsWith("[ERROR]")))));
  clear();
  vessel->setTagData({}, "fid=4711", done.handler());
  EXPECT_EQ(done.error(), missing);
  EXPECT_THAT(log.messages(), Contains(error("can't find URL for item; " + missing.description())));
}

TEST_F(MetadataTest, TheSectionEndsBeforeTheCompletionWithTheItemAlreadyRead) {
  vessel->setFavoriteRank(Number::of(1.0), file, [&](LocalVessel::ItemResult result) {
    EXPECT_TRUE(result);
    EXPECT_TRUE(log.lines().back().text.starts_with("[DEBUG] ┗"));
    EXPECT_EQ(log.sectionLabels().back(), "fetching item's properties for \"" + file + "\"");
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
