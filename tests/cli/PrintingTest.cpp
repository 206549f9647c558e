#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <random>

#include "cli/ItemJSON.h"
#include "cli/Printing.h"

namespace mirabel::testing {
namespace {

TEST(Printing, TextIsMadeSafeAndKeepsWhatCanBeRead) {
  const std::pair<std::string, std::string> cases[] = {
      {"", ""},
      {"letter.txt", "letter.txt"},
      {"Grüße 日本 🙂", "Grüße 日本 🙂"},
      {"a\nb\tc\rd", "a\\nb\\tc\\x0dd"},
      {"\033[2Jgone", "\\x1b[2Jgone"},
      {"\xc2\x9b"
       "31m",
       "\\xc2\\x9b31m"},                                  // a control of one character
      {"\xe2\x80\xaetxt.exe", "\\xe2\\x80\\xaetxt.exe"},  // right-to-left override
      {"\xff\xfe", "\\xff\\xfe"},
      {"\xc3", "\\xc3"},                    // cut off
      {"\xed\xa0\x80", "\\xed\\xa0\\x80"},  // a surrogate
      {"\xc0\xaf", "\\xc0\\xaf"},           // longer than need be
      {std::string("a\0b", 3), "a\\x00b"},
  };
  for (const auto& [bytes, text] : cases)
    EXPECT_EQ(printable(bytes), text);
}

TEST(Printing, Base64GoesThereAndBackAndRefusesEverythingElse) {
  const std::pair<std::string, std::string> cases[] = {
      {"", ""},        {"f", "Zg=="},        {"fo", "Zm8="},
      {"foo", "Zm9v"}, {"foob", "Zm9vYg=="}, {"\xff\xfe\xfd", "//79"}};
  for (const auto& [bytes, text] : cases) {
    EXPECT_EQ(base64(bytes), text);
    EXPECT_EQ(fromBase64(text), bytes);
  }
  for (const char* wrong : {"Z", "Zg", "Zg=", "Zh==", "=g==", "Zg==Zg==", "Zm9 ", "Zm_v", "===="}) {
    EXPECT_EQ(fromBase64(wrong), std::nullopt) << wrong;
  }
}

TEST(Printing, SizesAreReadable) {
  const std::pair<std::uint64_t, const char*> cases[] = {
      {0, "0 B"},          {999, "999 B"},
      {1000, "1.0 kB"},    {999'949, "999.9 kB"},
      {999'950, "1.0 MB"}, {~std::uint64_t{0}, "18.4 EB"}};
  for (const auto& [bytes, text] : cases)
    EXPECT_EQ(humanSize(bytes), text);
}

TEST(Printing, AnyBytesMakeAJSONLineThatGivesThemBack) {
  std::mt19937 random(7);
  for (int round = 0; round < 2000; ++round) {
    std::string bytes;
    for (std::size_t i = random() % 6; i > 0; --i)
      bytes += "a\xe2\x82\xac\xed\xa0\xf4\x90\n\xff\"\0"[random() % 13];
    nlohmann::json object;
    setText(object, "filename", bytes);
    const nlohmann::json read = nlohmann::json::parse(object.dump());
    const bool isText = !read.contains("filenameBytes");
    const std::string found = read.at(isText ? "filename" : "filenameBytes");
    EXPECT_EQ(isText ? found : fromBase64(found), bytes);
  }
}

}  // namespace
}  // namespace mirabel::testing
