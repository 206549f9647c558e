#include <algorithm>
#include <functional>
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
      home.writeFile("other" + std::to_string(other));
      home.rename("other" + std::to_string(other), "moved" + std::to_string(other));
      if (i > 0) {
        home.rename("moved" + std::to_string(other - 1), "again" + std::to_string(other - 1));
      }
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
  const auto namesOf = [&](const std::vector<std::string>& options) {
    std::multiset<std::string> names;
    std::vector<std::string> command = {"--json", "ls", "workingset"};
    for (std::string next = "first"; !next.empty() && names.size() < 1000;) {
      std::vector<std::string> line = command;
      line.insert(line.end(), options.begin(), options.end());
      if (next != "first") line.insert(line.end(), {"--page", next});
      const Answer answer = run(line);
      EXPECT_EQ(answer.code, 0) << answer.err;
      next.clear();
      for (const nlohmann::json& page : lines(answer)) {
        for (const auto& item : page.at("items"))
          names.insert(item.at("path"));
        next = page.at("nextPage").is_null() ? "" : page.at("nextPage").get<std::string>();
      }
    }
    return names;
  };
  const auto whole = namesOf({});
  EXPECT_EQ(whole.size(), 12 + 12 * 40u);
  EXPECT_EQ(namesOf({"--pages", "1"}), whole);
}

TEST_F(Pages, StartOverInAnotherProcessAfterADeletionOrAMove) {
  const std::function<void()> changes[] = {
      [&] { home.remove("folder/f7"); },
      [&] { home.rename("folder", "renamed"); },
      [&] {
        home.rename("folder", "renamed");
        home.makeFolder("folder");
      },
  };
  for (const auto& change : changes) {
    home.makeFolder("folder");
    for (int i = 0; i < 300; ++i)
      home.writeFile("folder/f" + std::to_string(i));
    const std::string next =
        run({"--json", "ls", "workingset", "--pages", "1"}).json().at("nextPage");
    change();
    expectFailure(run({"ls", "workingset", "--page", next}), 4, "start over");
    home.remove("");
    home.makeFolder("");
  }
}

TEST_F(Pages, WithoutAUsablePositionAreTheSameOrStartOver) {
  fill(450);
  const std::string next = run({"--json", "ls", "--pages", "1"}).json().at("nextPage");
  const std::string rest = run({"ls", "--page", next}).out;
  const Answer damaged = shell(
      "find \"$state\" -name listings -exec sh -c "
      "'printf xx | dd of=\"$1\" bs=1 seek=40 conv=notrunc 2>&1' _ {} \\; "
      "| grep -c copied");
  EXPECT_EQ(damaged.out, "1\n") << damaged.err;
  EXPECT_EQ(run({"ls", "--page", next}).out, rest);
  home.rename("f1", "renamed");
  expectFailure(run({"ls", "--page", next}), 4, "start over");
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

}  // namespace
}  // namespace mirabel::testing
