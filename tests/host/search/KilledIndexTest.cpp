#include <gtest/gtest.h>
#include <random>

#include "host/search/SearchFixture.h"
#include "linux/KilledProcess.h"

namespace mirabel::testing {
namespace {

constexpr int files = 150;

/// Goes from one generation, whose number is its anchor, to the next, in turn by starting over and
/// by changes, and says each that was acknowledged.
void feed(const KilledProcess::Self& self, const std::string& folder) {
  SearchItems items;
  const auto index = SearchIndex::open(folder).value();
  int generation = std::stoi(std::string(stringView(index->anchor().value_or(anchorOf("0")))));
  while (true) {
    const auto gone = namesOfGeneration(generation, files);
    const Data anchor = anchorOf(std::to_string(++generation));
    const VesselItems next = items.namedItems(namesOfGeneration(generation, files));
    bool done = false;
    if (generation % 2 == 0) {
      done = index->apply(next, gone, anchor).has_value();
    } else {
      const auto content = index->startOver().value();
      done = content->add(next) && content->commit(anchor);
    }
    self.say(done ? std::to_string(generation) : "failed");
  }
}

/// Says the generation of the anchor, and how many rows and how many findings are of it.
void look(const KilledProcess::Self& self, const std::string& folder) {
  const auto index = SearchIndex::open(folder).value();
  const std::string anchor(stringView(index->anchor().value_or(anchorOf("0"))));
  self.say(anchor);
  self.say(std::to_string(index->count().value()));
  const SearchQuery query{.words = {"gen" + anchor, "no1"}, .limit = 1000};
  self.say(std::to_string(index->search(query).value().size()));
}

TEST(KilledIndex, RowsAndAnchorAreOfOneMoment) {
  const TempHome home;
  std::mt19937 random(std::random_device{}());
  int reached = 0;
  for (int round = 0; round < 25; ++round) {
    KilledProcess feeding([&](const auto& self) { feed(self, home.path()); });
    const std::string first = feeding.line();
    ASSERT_FALSE(first.empty());
    feeding.listen(static_cast<long>(random() % 30'000));
    std::vector<std::string> said = feeding.kill();
    said.insert(said.begin(), first);
    for (const std::string& line : said) {
      ASSERT_NE(line, "failed");
      reached = std::stoi(line);
    }
    KilledProcess looking([&](const auto& self) { look(self, home.path()); });
    const int anchor = std::stoi(looking.line());
    EXPECT_GE(anchor, reached);
    EXPECT_LE(anchor, reached + 1);
    EXPECT_EQ(looking.line(), std::to_string(files));
    EXPECT_EQ(looking.line(), "61");  // no1, no10 to no19, no100 to no149
    reached = anchor;
  }
}

}  // namespace
}  // namespace mirabel::testing
