#include <filesystem>
#include <gmock/gmock.h>
#include <iterator>
#include <limits>
#include <map>
#include <random>
#include <stop_token>
#include <thread>
#include <tuple>

#include "host/search/SearchFixture.h"
#include "host/search/SearchIndex.h"
#include "host/search/SearchText.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::UnorderedElementsAreArray;
using Names = std::vector<std::string>;

class SearchIndexTest : public ::testing::Test {
 protected:
  void fill(const VesselItems& all, std::string_view anchor = "a") {
    const auto content = index->startOver().value();
    ASSERT_TRUE(content->add(all));
    ASSERT_TRUE(content->commit(anchorOf(anchor)));
  }
  Names search(const SearchQuery& query) { return items.names(index->search(query)); }
  Names search(const Names& words) {
    SearchQuery query;
    query.words = words;
    return search(query);
  }

  TempHome home;
  SearchItems items;
  const std::unique_ptr<SearchIndex> index = SearchIndex::open(home.path()).value();
};

TEST_F(SearchIndexTest, AllWordsAreFoundInNamesAndTags) {
  fill(items.items(
      {"Annual Report 2024.pdf", "Photo (árbol).jpg", "日本語の本.txt", "bad\xFFname.txt"}));
  items.tag("Annual Report 2024.pdf", {"Work", "For Zoë"});
  ASSERT_TRUE(index->apply({items.item("Annual Report 2024.pdf")}, {}, anchorOf("b")));
  const Names report{"Annual Report 2024.pdf"};
  const struct {
    Names words;
    Names found;
  } cases[] = {
      {{"report"}, report},
      {{"PORT", "ann"}, report},
      {{"report", "work"}, report},
      {{"zoe", "for z"}, report},
      {{"4"}, report},
      {{"report 2024"}, report},
      {{"report", "report", "", " "}, report},
      {{"report", "photo"}, {}},
      {{"reporting"}, {}},
      {{"rep ort"}, {}},
      {{"work for"}, {}},  // two tags
      {{"pdf work"}, {}},  // a name and a tag
      {{"(Á"}, {"Photo (árbol).jpg"}},
      {{"本語"}, {"日本語の本.txt"}},
      {{"bad", "name"}, {"bad\xFFname.txt"}},
      {{"\xFEn"}, {"bad\xFFname.txt"}},
  };
  for (const auto& each : cases)
    EXPECT_EQ(search(each.words), each.found) << ::testing::PrintToString(each.words);
}

TEST_F(SearchIndexTest, EverythingThatIsAskedMustHold) {
  items.fake().volume.makeFolder(items.fake().path(".Trash"));
  for (const char* name : {"old.txt", "new.txt", "picture", ".Trash/thrown away.txt"})
    items.item(name);
  items.node("old.txt").modified = {1'000, 0};
  items.node("new.txt").modified = {2'000, 5};
  items.tag("new.txt", {"Red"});
  items.tag("picture", {"Dark Red"});
  VesselItems all = items.items({"old.txt", "new.txt", "picture", ".Trash/thrown away.txt"});
  all.push_back(items.itemOf("org.example.Draw", "drawn.txt"));
  fill(all);
  const struct {
    const char* what;
    SearchQuery query;
    Names found;
  } cases[] = {
      {"nothing", {}, {}},
      {"a label", {.tags = {"RED"}}, {"new.txt"}},
      {"part of a label", {.tags = {"dark"}}, {}},
      {"a label and a word", {.words = {"ne"}, .tags = {"red"}}, {"new.txt"}},
      {"a family", {.type = "application/*"}, {"picture"}},
      {"a type", {.type = "application/octet-stream"}, {"picture"}},
      {"the beginning of a type", {.words = {"pict"}, .type = "application"}, {}},
      {"from a moment on",
       {.words = {"txt"}, .modifiedSince = Date{2'000, 5}, .modifiedBefore = Date{3'000, 0}},
       {"new.txt"}},
      {"before a moment", {.modifiedBefore = Date{2'000, 5}}, {"old.txt"}},
      {"of an application", {.words = {"txt"}, .domain = "org.example.Draw"}, {"drawn.txt"}},
      {"in the trash", {.words = {"thrown"}}, {}},
      {"the trash too", {.words = {"thrown"}, .includesTrashed = true}, {"thrown away.txt"}},
  };
  for (const auto& each : cases)
    EXPECT_EQ(search(each.query), each.found) << each.what;
}

TEST_F(SearchIndexTest, RecentAndFavoriteItemsComeInTheirOrder) {
  items.fake().volume.makeFolder(items.fake().path("folder"));
  items.fake().volume.makeFolder(items.fake().path(".Trash"));
  for (const char* name : {"a", "b", "c", ".Trash/d"})
    items.item(name);
  items.node("a").modified = {3'000, 0};
  items.node("b").modified = {1'000, 0};
  items.used("b", {1'700'000'000, 0});
  items.node("c").modified = {2'000, 0};
  items.rank("b", Number::of(2.5));
  items.rank("folder", Number::of(-3.0));
  items.rank("a", Number::of(std::uint64_t{18'000'000'000'000'000'000u}));
  items.rank("c", Number::of(std::int64_t{-1}));
  items.rank(".Trash/d", Number::of(std::int64_t{1}));
  fill(items.items({"a", "b", "c", "folder", ".Trash/d"}));
  EXPECT_THAT(items.names(index->recent(10)), ElementsAre("b", "a", "c"));
  EXPECT_THAT(items.names(index->recent(1)), ElementsAre("b"));
  EXPECT_THAT(items.names(index->favorites()), ElementsAre("folder", "c", "b", "a"));
}

TEST_F(SearchIndexTest, StartingOverCountsOnceItIsCommitted) {
  fill(items.items({"old one.txt", "old two.txt"}), "a");
  {
    const auto abandoned = index->startOver().value();
    ASSERT_TRUE(abandoned->add(items.items({"new.txt"})));
    EXPECT_TRUE(index->startOver().error().isPosix(EBUSY));
    EXPECT_THAT(search({"old"}), SizeIs(2));
  }
  EXPECT_FALSE(std::filesystem::exists(home.path() + "/search.db.new"));
  EXPECT_EQ(index->anchor(), anchorOf("a"));
  // A listing may tell an item twice; the last time counts.
  const auto content = index->startOver().value();
  const auto before = items.items({"new.txt", "same.txt"});
  ASSERT_TRUE(content->add(before));
  items.fake().volume.rename(items.fake().path("new.txt"), items.fake().path("renamed.txt"));
  ASSERT_TRUE(content->add(items.items({"renamed.txt"})));
  ASSERT_TRUE(content->commit(anchorOf("b")));
  EXPECT_EQ(index->anchor(), anchorOf("b"));
  EXPECT_EQ(index->count().value(), 2u);
  EXPECT_THAT(search({"txt"}), UnorderedElementsAreArray({"renamed.txt", "same.txt"}));
  EXPECT_THAT(search({"new"}), IsEmpty());
  const auto mode = std::filesystem::status(home.path() + "/search.db").permissions();
  EXPECT_EQ(mode, std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);
}

TEST_F(SearchIndexTest, DomainsLeaveAndMayComeBack) {
  const auto drawn = items.itemOf("org.example.Draw", "drawing.txt");
  const auto sung = items.itemOf("org.example.Sing", "song.txt");
  fill({items.item("own.txt"), drawn, sung});
  const auto content = index->startOver().value();
  ASSERT_TRUE(content->add({items.item("own.txt"), drawn, sung}));
  ASSERT_TRUE(index->deleteDomains({"org.example.Draw", "org.example.None"}));
  EXPECT_THAT(search({"txt"}), UnorderedElementsAreArray({"own.txt", "song.txt"}));
  // What it was told of them before is in neither of the two.
  ASSERT_TRUE(content->commit(anchorOf("b")));
  EXPECT_THAT(search({"txt"}), UnorderedElementsAreArray({"own.txt", "song.txt"}));
  ASSERT_TRUE(index->apply({drawn}, {}, anchorOf("c")));
  EXPECT_THAT(search({"draw"}), ElementsAre("drawing.txt"));
}

// Each answer is of one state, while states follow each other by changes and by starting over.
TEST_F(SearchIndexTest, WhoSearchesMeanwhileSeesOneStateOrAnother) {
  fill(items.items({}));
  std::jthread searching([this](const std::stop_token& stop) {
    while (!stop.stop_requested()) {
      const auto found = index->search({.words = {"gen"}}).value();
      if (found.empty()) continue;
      const std::string generation = found.front().substr(0, found.front().find(' '));
      EXPECT_EQ(found.size(), 50u);
      for (const std::string& identifier : found)
        EXPECT_TRUE(identifier.starts_with(generation + " ")) << identifier;
    }
  });
  for (int generation = 1; generation < 20; ++generation) {
    const VesselItems next = items.namedItems(namesOfGeneration(generation, 50));
    if (generation % 2 == 0) {
      fill(next);
    } else {
      ASSERT_TRUE(index->apply(next, namesOfGeneration(generation - 1, 50), anchorOf("b")));
    }
  }
}

class ManyItems : public SearchIndexTest {
 protected:
  /// Few words that many names have, so that there are far more matches than are looked at.
  std::string anyName() {
    static const Names parts{"art", "smart", "party", "a", "ar", "tart", "Größe", "x-ray", "12"};
    std::string name;
    for (int word = 0; word < 2; ++word)
      name += parts[random() % parts.size()] + (random() % 4 == 0 ? "" : " ");
    return name + " " + std::to_string(++number);
  }
  std::shared_ptr<LocalItem> make(const std::string& name) {
    items.item(name);
    items.node(name).modified = {1'000 + static_cast<std::int64_t>(random() % 1'000'000), 0};
    auto made = items.item(name);
    rows[made->itemIdentifier()] = {foldedText(name), items.node(name).modified.seconds, name};
    return made;
  }
  struct Row {
    std::string folded;
    std::int64_t modified = 0;
    std::string name;
  };

  /// The answer as it is defined, from all rows.
  Names expected(const Names& words, std::size_t limit) {
    std::vector<std::tuple<Match, std::int64_t, std::string>> found;
    for (const auto& [identifier, row] : rows) {
      Match worst = Match::wholeWord;
      bool isFound = true;
      for (const std::string& word : words) {
        const auto match = bestMatch(row.folded, foldedText(word));
        isFound = isFound && match;
        worst = std::max(worst, match.value_or(Match::insideWord));
      }
      if (isFound) found.emplace_back(worst, -row.modified, identifier);
    }
    std::ranges::sort(found);
    found.resize(std::min(limit, found.size()));
    Names identifiers;
    for (const auto& each : found)
      identifiers.push_back(std::get<2>(each));
    return identifiers;
  }
  void expectRightAnswers(const std::string& after) {
    const Names asked{"art", "mart", "ar", "a", "12", "2", "x-", "ray", "größ", "rt", "tar", "y s"};
    for (int i = 0; i < 40; ++i) {
      SearchQuery query;
      for (std::size_t words = 1 + random() % 2; words > 0; --words)
        query.words.push_back(asked[random() % asked.size()]);
      query.limit = i == 0 ? 0 : i % 3 == 0 ? 1500 : 20;
      EXPECT_EQ(index->search(query).value(), expected(query.words, query.limit))
          << after << ::testing::PrintToString(query.words) << query.limit;
    }
  }

  std::mt19937 random{7};
  std::map<std::string, Row> rows;
  int number = 0;
};

TEST_F(ManyItems, AreAnsweredAsIfAllWereCompared) {
  VesselItems all;
  for (int i = 0; i < 5000; ++i)
    all.push_back(make(anyName()));
  fill(all);
  expectRightAnswers("the first feed");
  for (int batch = 0; batch < 5; ++batch) {
    VesselItems updated;
    Names deleted;
    const auto before = rows;
    for (int i = 0; i < 100; ++i) {
      // Each once: nothing is both updated and deleted in one batch.
      const auto step = static_cast<std::ptrdiff_t>(i + 100 * (random() % 40));
      const auto& [identifier, former] = *std::next(before.begin(), step);
      rows.erase(identifier);
      const std::string name = i % 3 == 0 ? former.name : anyName();
      if (i % 3 == 1) deleted.push_back(identifier);
      if (i % 3 == 2)
        items.fake().volume.rename(items.fake().path(former.name), items.fake().path(name));
      updated.push_back(make(name));
    }
    ASSERT_TRUE(index->apply(updated, deleted, anchorOf("b")));
    expectRightAnswers("batch " + std::to_string(batch));
  }
}

// Whatever people and programs ask is text: it is found where it stands, and fails nowhere.
TEST_F(SearchIndexTest, HostileWordsAreText) {
  using namespace std::string_literals;
  fill(items.items({"say \"NEAR(a b)\" AND text:x*.txt", "plain.txt"}));
  for (const char* word : {"\"near(a", "AND", "text:x*", "b)\"", "\"", "(", "*.txt", "r(a b"}) {
    EXPECT_THAT(search({word}), ElementsAre("say \"NEAR(a b)\" AND text:x*.txt")) << word;
  }
  Names many;
  for (int i = 0; i < 100'000; ++i)
    many.push_back(std::to_string(i));
  const Names hostile[] = {{"plain"s + '\0' + "x"},
                           {"OR"},
                           {"NOT plain"},
                           {"{text} : plain"},
                           {"^plain"},
                           {"'; DROP TABLE items; --"},
                           {std::string(5'000'000, 'p')},
                           {std::string(10'000, '\xFF')},
                           many,
                           {"%"}};
  for (const Names& words : hostile) {
    SearchQuery query{.words = words,
                      .tags = {},
                      .includesTrashed = true,
                      .limit = std::numeric_limits<std::size_t>::max()};
    EXPECT_THAT(search(query), IsEmpty()) << words.front().substr(0, 40);
    query.tags.swap(query.words);
    EXPECT_THAT(search(query), IsEmpty()) << words.front().substr(0, 40);
  }
  std::mt19937 random(3);
  const std::string alphabet = "\"*()^{}:-+ ANDORT\0\n\xC3\xA9%'plain."s;
  for (int i = 0; i < 2000; ++i) {
    std::string word;
    for (std::size_t length = random() % 8; length > 0; --length)
      word += alphabet[random() % alphabet.size()];
    EXPECT_TRUE(index->search({.words = {word, "plain"}, .limit = 5})) << word;
  }
  EXPECT_EQ(index->count().value(), 2u);
}

}  // namespace
}  // namespace mirabel::testing
