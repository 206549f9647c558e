#include <gtest/gtest.h>
#include <string_view>

#include "fs/DocumentIDPath.h"

namespace mirabel::testing {
namespace {

TEST(DocumentIDPathTest, RecordsAreReadWithAndWithoutSlashesAndDevice) {
  const std::pair<std::string_view, DocumentIDPath> cases[] = {
      {".docid/5/changed/42/src=100,dst=200", {42, 100, 200}},
      {"/.docid/changed/42/src=100,dst=0", {42, 100, 0}},
      {"///.docid/0/changed/1/src=2,dst=3", {1, 2, 3}},
      {".docid/changed/-1/src=-2,dst=9223372036854775807", {-1, -2, INT64_MAX}},
  };
  for (const auto& [path, expected] : cases)
    EXPECT_EQ(DocumentIDPath::parse(path), expected) << path;
}

TEST(DocumentIDPathTest, AnythingElseIsRefused) {
  for (const std::string_view path : {"",
                                      "/",
                                      ".docid",
                                      ".docid/",
                                      "docid/changed/1/src=2,dst=3",
                                      ".docid/changed/1/src=2",
                                      ".docid/changed/7/src=3,dst=5x",
                                      ".docid/changed/7/src=3,dst=5 ",
                                      ".docid/-5/changed/7/src=3,dst=5",
                                      ".docid/5changed/7/src=3,dst=5",
                                      ".docid/x/changed/7/src=3,dst=5",
                                      ".docid/changed//src=3,dst=5",
                                      ".docid/changed/7/src=,dst=5",
                                      ".docid/changed/7/src=3,dst=",
                                      ".docid/changed/ 7/src=3,dst=5",
                                      ".docid/changed/7/dst=5,src=3",
                                      ".docid/changed/7//src=3,dst=5",
                                      ".docid/99999999999999999999/changed/7/src=3,dst=5",
                                      ".docid/changed/9223372036854775808/src=3,dst=5",
                                      ".docid/changed/7/src=3,dst=99999999999999999999"}) {
    EXPECT_FALSE(DocumentIDPath::parse(path)) << path;
  }
  const std::string_view whole = "/.docid/5/changed/42/src=100,dst=2";
  for (std::size_t length = 0; length < whole.size(); ++length)
    EXPECT_FALSE(DocumentIDPath::parse(whole.substr(0, length))) << length;
}

}  // namespace
}  // namespace mirabel::testing
