#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <sys/stat.h>

#include "host/search/SearchFixture.h"
#include "linux/volume/Database.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using namespace std::string_literals;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

class DamagedIndex : public ::testing::Test {
 protected:
  void SetUp() override {
    std::vector<std::string> names;
    for (int i = 0; i < 300; ++i)
      names.push_back("Report " + std::to_string(i) + ".pdf");
    const auto index = open();
    const auto content = index->startOver().value();
    ASSERT_TRUE(content->add(items.items(names)));
    ASSERT_TRUE(content->commit(anchorOf("a")));
    ASSERT_TRUE(index->apply({items.item("Letter.pdf")}, {}, anchorOf("b")));
  }
  std::unique_ptr<SearchIndex> open() {
    return SearchIndex::open(home.path(),
                             [this](std::string_view text) { notices.emplace_back(text); })
        .value();
  }
  [[nodiscard]] std::string file() const { return home.path() + "/search.db"; }
  std::string bytes() {
    std::ifstream in(file(), std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
  }
  void setBytes(std::string_view bytes) {
    std::ofstream(file(), std::ios::binary | std::ios::trunc) << bytes;
  }

  TempHome home;
  SearchItems items;
  std::vector<std::string> notices;
  LogCapture log;
};

// A bit in each page: who asks gets the right answer or an error, and after an error there is no
// anchor for rows that are gone. A new listing mends it, whether the damage was met or not.
TEST_F(DamagedIndex, NoBitChangesAnAnswer) {
  const SearchQuery query{.words = {"report", "29"}, .limit = 1000};
  const auto right = open()->search(query).value();
  const std::string whole = bytes();
  int met = 0;
  for (std::size_t at = 16; at < whole.size(); at += 4096 / 3) {
    std::string damaged = whole;
    damaged[at] = static_cast<char>(damaged[at] ^ 4);
    setBytes(damaged);
    const auto index = open();
    const auto answer = index->search(query);
    const auto recent = index->recent(1000);
    const auto anchor = index->anchor();
    if (anchor) {
      EXPECT_EQ(answer.value(), right) << at;
      EXPECT_EQ(recent.value().size(), 301u) << at;
      EXPECT_EQ(*anchor, anchorOf("b")) << at;
    } else {
      ++met;
      EXPECT_EQ(index->count().value(), 0u) << at;
    }
    const auto content = index->startOver().value();
    ASSERT_TRUE(content->add({items.item("Letter.pdf")}));
    ASSERT_TRUE(content->commit(anchorOf("c"))) << at;
    EXPECT_EQ(items.names(index->search({.words = {"pdf"}})), std::vector{"Letter.pdf"s}) << at;
  }
  EXPECT_GT(met, 10);
}

TEST_F(DamagedIndex, WhatIsNoIndexIsMadeAnewAndToldOnce) {
  const std::string whole = bytes();
  const struct {
    const char* what;
    std::function<void()> damage;
  } cases[] = {
      {"cut", [&] { setBytes(whole.substr(0, whole.size() / 2)); }},
      {"text", [&] { setBytes(std::string(20'000, 'x')); }},
      {"another format",
       [&] { ASSERT_TRUE(Database::open(file()).value()->execute("PRAGMA user_version=99")); }},
      {"another folding",
       [&] {
         ASSERT_TRUE(Database::open(file()).value()->execute(
             "UPDATE facts SET value = 'glib 1.2.3' WHERE name = 'folding'"));
       }},
      {"a foreign database",
       [&] {
         fs::remove(file());
         ASSERT_TRUE(Database::open(file()).value()->execute("CREATE TABLE t(a)"));
       }},
  };
  for (const auto& each : cases) {
    fs::remove(file() + "-wal");
    setBytes(whole);
    each.damage();
    notices.clear();
    EXPECT_EQ(open()->anchor(), std::nullopt) << each.what;
    EXPECT_THAT(notices, ElementsAre(HasSubstr("the search index can't be used"))) << each.what;
    notices.clear();
    EXPECT_EQ(open()->count().value(), 0u) << each.what;
    EXPECT_THAT(notices, IsEmpty()) << each.what;
  }
}

TEST_F(DamagedIndex, WhatLiesInItsPlaceIsReplacedUnlessItIsAFolder) {
  fs::remove(file());
  fs::create_symlink("elsewhere", file());
  EXPECT_EQ(open()->anchor(), std::nullopt);
  EXPECT_FALSE(fs::exists(home.path() + "/elsewhere"));
  fs::remove(file());
  ASSERT_EQ(::mkfifo(file().c_str(), 0600), 0);
  EXPECT_EQ(open()->anchor(), std::nullopt);
  fs::remove(file());
  fs::create_directory(file());
  EXPECT_FALSE(SearchIndex::open(home.path()));
  EXPECT_FALSE(SearchIndex::open(home.path() + "/none"));
}

// The log of a database that is gone belongs to no other.
TEST_F(DamagedIndex, ALogWithoutItsDatabaseCountsForNothing) {
  ASSERT_TRUE(fs::exists(file() + "-wal"));
  fs::remove(file());
  std::ofstream(file() + ".new") << "left behind";
  const auto index = open();
  EXPECT_EQ(index->anchor(), std::nullopt);
  EXPECT_EQ(index->count().value(), 0u);
  EXPECT_FALSE(fs::exists(file() + ".new"));
}

}  // namespace
}  // namespace mirabel::testing
