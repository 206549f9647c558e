#include <filesystem>

#include "cli/CommandLineFixture.h"

namespace mirabel::testing {
namespace {

using Changes = CommandLineFixture;

TEST_F(Changes, SinceAnAnchorThatCannotBeUsedStartOver) {
  home.writeFile("doc");
  const std::string before = anchor();
  for (const char* bad : {"garbage", "AAAA", ""}) {
    EXPECT_EQ(run({"changes", "--since", bad}).code, 4) << bad;
  }
  // Another history: the state was deleted since.
  std::filesystem::remove_all(home.stateFolder());
  EXPECT_EQ(run({"changes", "--since", before}).code, 4);
  EXPECT_EQ(run({"changes"}).code, 2);
  EXPECT_EQ(run({"anchor", home.at("missing")}).code, 3);
}

}  // namespace
}  // namespace mirabel::testing
