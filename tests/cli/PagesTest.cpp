#include <algorithm>
#include <set>

#include "cli/CommandLineFixture.h"

namespace mirabel::testing {
namespace {

class Pages : public CommandLineFixture {
 protected:
  void fill(int count) const {
    for (int i = 0; i < count; ++i)
      home.writeFile("f" + std::to_string(i));
  }
  static std::vector<nlohmann::json> lines(const Answer& answer) {
    std::vector<nlohmann::json> pages;
    std::istringstream text(answer.out);
    for (std::string line; std::getline(text, line);)
      pages.push_back(nlohmann::json::parse(line));
    return pages;
  }
};

// A listing of 6,000 in seven processes, while others use the folder.
TEST_F(Pages, GiveEachEntryOnceWhileOthersComeAndChangeTheirNames) {
  constexpr int count = 6'000;
  fill(count);
  std::vector<int> seen(count);
  std::vector<std::string> command = {"--json", "ls", "--pages", "5"};
  int other = 0;
  for (bool more = true; more;) {
    ASSERT_LT(other, 1000) << "it goes round in circles";
    const Answer answer = run(command);
    ASSERT_EQ(answer.code, 0) << answer.err;
    for (const nlohmann::json& page : lines(answer)) {
      for (const auto& item : page.at("items")) {
        const std::string name = item.at("filename");
        if (name.starts_with('f')) ++seen[std::stoul(name.substr(1))];
      }
      more = !page.at("nextPage").is_null();
      if (more) command = {"--json", "ls", "--pages", "5", "--page", page.at("nextPage")};
    }
    for (int i = 0; i < 40; ++i, ++other) {
      const std::string number = std::to_string(other), before = std::to_string(other - 1);
      home.writeFile("other" + number);
      home.rename("other" + number, "moved" + number);
      if (i > 0) home.rename("moved" + before, "again" + before);
    }
  }
  EXPECT_GE(other, 200);
  EXPECT_EQ(std::ranges::count(seen, 1), count);
}

TEST_F(Pages, OfEverythingGoOnInADeepFolderInAnotherProcess) {
  std::string folder = "a";
  for (int depth = 0; depth < 12; ++depth, folder += "/a") {
    home.makeFolder(folder);
    for (int i = 0; i < 40; ++i)
      home.writeFile(folder + "/" + std::to_string(depth) + "." + std::to_string(i));
  }
  const auto pathsOf = [](const Answer& answer) {
    std::multiset<std::string> paths;
    for (const nlohmann::json& page : lines(answer))
      for (const auto& item : page.at("items"))
        paths.insert(item.at("path"));
    return paths;
  };
  const auto whole = pathsOf(run({"--json", "ls", "workingset"}));
  EXPECT_EQ(whole.size(), 12 + 12 * 40u);
  Answer page = run({"--json", "ls", "workingset", "--pages", "1"});
  auto inPages = pathsOf(page);
  for (auto next = page.json().at("nextPage"); !next.is_null(); next = page.json().at("nextPage")) {
    page = run({"--json", "ls", "workingset", "--pages", "1", "--page", next});
    inPages.merge(pathsOf(page));
    ASSERT_LE(inPages.size(), whole.size());
  }
  EXPECT_EQ(inPages, whole);
  const std::string next = done({"ls", "workingset", "--pages", "1"}).at("nextPage");
  home.rename("a/a", "renamed");
  expectFailure(run({"ls", "workingset", "--page", next}), 4, "start over");
}

TEST_F(Pages, PeopleAreToldWhereAListingGoesOn) {
  fill(201);
  const Answer first = run({"ls", "--pages", "1"});
  EXPECT_EQ(std::ranges::count(first.out, '\n'), 200);
  const std::size_t at = first.err.find("--page ");
  ASSERT_NE(at, std::string::npos) << first.err;
  const std::string page = first.err.substr(at + 7, first.err.size() - at - 8);
  EXPECT_EQ(std::ranges::count(run({"ls", "--page", page}).out, '\n'), 1);
  expectFailure(run({"ls", "--page", "garbage"}), 4, "start over");
  EXPECT_EQ(run({"--json", "ls", "--page", "garbage"}).error().at("code"), -1002);
}

}  // namespace
}  // namespace mirabel::testing
