#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "foundation/ExtendedAttributes.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class ExtendedAttributes : public ::testing::Test {
 protected:
  FakePlatform fake;
  std::map<std::string, Data, std::less<>>& attributes =
      fake.volume.writeFile(fake.path("f")).attributes;
  ExtendedAttributeStore& store = fake.platform().attributes;
  LogCapture log;
};

TEST_F(ExtendedAttributes, FailuresToReadAreLoggedByWhatFailedAndWhy) {
  attributes["a"] = {1};
  const URL url = fake.url("f");
  for (const char* name : {"b", "c"})
    EXPECT_EQ(extendedAttribute(store, name, url), std::nullopt);
  EXPECT_EQ(fake.faults.calls(), 1U) << "the names, once";
  const std::string missing = "POSIX error 2: No such file or directory";
  const std::string broken = "POSIX error 5: Input/output error";
  const struct {
    Op op;
    int code;
    std::vector<LogLine> lines;
  } cases[] = {
      {Op::attributeSize, ENODATA, {}},
      {Op::attributeSize, ENOENT, {{LogLevel::debug, "[DEBUG] can't get xattr a; " + missing}}},
      {Op::attributeSize, EIO, {{LogLevel::error, "[ERROR] can't get xattr a; " + broken}}},
      {Op::attributeRead,
       ENOENT,
       {{LogLevel::debug, "[DEBUG] can't copy data for xattr a; " + missing}}},
      {Op::attributeRead,
       EIO,
       {{LogLevel::error, "[ERROR] can't copy data for xattr a; " + broken}}},
  };
  for (const auto& [op, code, lines] : cases) {
    log.clear();
    fake.faults.reset();
    // Names that can't be had leave it to the attribute itself to say what is wrong.
    fake.faults.fail(Op::attributeNames, Error::posix(EIO));
    fake.faults.fail(op, Error::posix(code));
    EXPECT_EQ(extendedAttribute(store, "a", fake.url("f")), std::nullopt);
    EXPECT_EQ(log.lines(), lines);
  }
}

TEST_F(ExtendedAttributes, FailuresToWriteAreLoggedAndReturned) {
  const auto target = store.open(fake.url("f")).value();
  EXPECT_EQ(setExtendedAttribute(*target, {}, "a"), std::nullopt) << "was not there";
  EXPECT_EQ(setExtendedAttribute(*target, Data{}, "a"), std::nullopt);
  EXPECT_TRUE(attributes.contains("a")) << "empty is not absent";
  EXPECT_THAT(log.lines(), IsEmpty());
  const struct {
    std::optional<Data> value;
    int code;
    LogLevel level;
    std::string line;
  } cases[] = {
      {Data{1}, EACCES, LogLevel::debug, "[DEBUG] can't set xattr \"a\"; "},
      {Data{1}, ENOSPC, LogLevel::error, "[ERROR] can't set xattr \"a\"; "},
      {Data{1}, ENODATA, LogLevel::error, "[ERROR] can't set xattr \"a\"; "},
      {{}, EACCES, LogLevel::debug, "[DEBUG] can't remove xattr \"a\"; "},
      {{}, EPERM, LogLevel::error, "[ERROR] can't remove xattr \"a\"; "},
  };
  for (const auto& [value, code, level, line] : cases) {
    log.clear();
    const Error failure = Error::posix(code);
    fake.faults.fail(value ? Op::attributeSet : Op::attributeRemove, failure);
    EXPECT_EQ(setExtendedAttribute(*target, value, "a"), failure);
    EXPECT_THAT(log.lines(), ElementsAre(LogLine{level, line + failure.description()}));
  }
}

}  // namespace
}  // namespace mirabel::testing
