#include <algorithm>
#include <set>

#include "cli/CommandLineFixture.h"
#include "cli/Printing.h"
#include "fs/FSChangeToken.h"

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

TEST_F(Pages, FullPagesAreFollowedByAnother) {
  struct Case {
    int files;
    std::vector<std::size_t> pages;
  };
  int made = 0;
  for (const Case& c : {Case{0, {0}}, Case{199, {199}}, Case{200, {200, 0}}, Case{201, {200, 1}},
                        Case{400, {200, 200, 0}}}) {
    for (; made < c.files; ++made)
      home.writeFile("f" + std::to_string(made));
    const auto pages = lines(run({"ls", "--json"}));
    ASSERT_EQ(pages.size(), c.pages.size()) << c.files;
    for (std::size_t i = 0; i < pages.size(); ++i) {
      EXPECT_EQ(pages[i].at("items").size(), c.pages[i]) << c.files;
      EXPECT_EQ(pages[i].at("nextPage").is_null(), i + 1 == pages.size()) << c.files;
    }
  }
}

TEST_F(Pages, OfSeveralProcessesMakeUpTheFolder) {
  fill(450);
  std::multiset<std::string> names;
  std::vector<std::string> command = {"--json", "ls", "--pages", "1"};
  int count = 0;
  for (; count < 10; ++count) {
    const nlohmann::json page = run(command).json();
    for (const auto& item : page.at("items"))
      names.insert(item.at("filename"));
    if (page.at("nextPage").is_null()) break;
    command = {"--json", "ls", "--pages", "1", "--page", page.at("nextPage")};
  }
  EXPECT_EQ(count, 2);
  std::multiset<std::string> all;
  for (int i = 0; i < 450; ++i)
    all.insert("f" + std::to_string(i));
  EXPECT_EQ(names, all);
}

TEST_F(Pages, PeopleAreToldWhereAListingGoesOn) {
  fill(201);
  const Answer first = run({"ls", "--pages", "1"});
  EXPECT_EQ(std::ranges::count(first.out, '\n'), 200);
  const std::size_t at = first.err.find("--page ");
  ASSERT_NE(at, std::string::npos) << first.err;
  const std::string page = first.err.substr(at + 7, first.err.size() - at - 8);
  EXPECT_EQ(std::ranges::count(run({"ls", "--page", page}).out, '\n'), 1);
}

TEST_F(Pages, ThatAreNoneOfThisHistoryStartOver) {
  fill(201);
  const std::string page = run({"--json", "ls", "--pages", "1"}).json().at("nextPage");
  FSChangeToken foreign;
  foreign.deviceUUID = UUID::random();
  const std::string cut = base64(fromBase64(page)->substr(0, 50));
  const std::vector<std::string> wrong = {"garbage", page.substr(1), cut,
                                          base64(stringView(foreign.encode()))};
  for (const std::string& text : wrong) {
    expectFailure(run({"ls", "--page=" + text}), 4, "start over");
    EXPECT_EQ(run({"--json", "ls", "--page=" + text}).error().at("code"), -1002) << text;
  }
  // One that lies behind the end of the folder, too.
  auto token =
      *FSChangeToken::decode(std::span<const std::uint8_t>(dataFromString(*fromBase64(page))));
  token.offset = ~std::uint64_t{0} - 1;
  expectFailure(run({"ls", "--page", base64(stringView(token.encode()))}), 4, "start over");
}

TEST_F(Pages, OfEverythingAndOfAllFoldersAreListedByTheirWords) {
  home.makeFolder("folder");
  home.makeFolder("folder/inner");
  home.writeFile("folder/inner/doc");
  home.makeFolder(".Trash");
  home.writeFile(".Trash/erased");
  home.makeFolder("workingset");
  const auto names = [&](const std::string& item) {
    std::set<std::string> seen;
    const nlohmann::json page = run({"--json", "ls", item}).json();
    for (const auto& each : page.at("items"))
      seen.insert(each.at("filename"));
    return seen;
  };
  using Names = std::set<std::string>;
  EXPECT_EQ(names("workingset"), (Names{"folder", "inner", "doc", "workingset", "erased"}));
  EXPECT_EQ(names("alldirs"), (Names{"folder", "inner", "workingset"}));
  EXPECT_EQ(names(home.at("workingset")), Names{});
}

}  // namespace
}  // namespace mirabel::testing
