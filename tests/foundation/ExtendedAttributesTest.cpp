#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "foundation/ExtendedAttributes.h"
#include "foundation/URL.h"
#include "support/LogCapture.h"

namespace mirabel {
namespace {

using ::testing::_;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using testing::LogCapture;
using testing::LogLine;
using ::testing::Return;
using ::testing::StrictMock;

constexpr std::string_view tags = "com.norvane.metadata:_kMDItemUserTags";

class MockStore : public ExtendedAttributeStore {
 public:
  MOCK_METHOD(Result<std::vector<std::string>>, names, (const URL&), (override));
  MOCK_METHOD(Result<std::size_t>, size, (std::string_view, const URL&), (override));
  MOCK_METHOD(Result<Data>, read, (std::string_view, const URL&, std::size_t), (override));
  MOCK_METHOD(Result<std::unique_ptr<AttributeTarget>>, open, (const URL&), (override));
};

class MockTarget : public AttributeTarget {
 public:
  MOCK_METHOD(Result<void>, set, (std::string_view, const Data&), (override));
  MOCK_METHOD(Result<void>, remove, (std::string_view), (override));
};

struct ExtendedAttributes : ::testing::Test {
  StrictMock<MockStore> store;
  StrictMock<MockTarget> target;
  URL url = URL::fileURL("/d/f");
  LogCapture log;
};

TEST_F(ExtendedAttributes, AreReadWithTheSizeThatWasAskedFor) {
  const std::vector<std::string> names = {"z", std::string(tags)};
  EXPECT_CALL(store, names(_)).WillOnce(Return(names));
  EXPECT_CALL(store, size(tags, url)).WillOnce(Return(3u));
  EXPECT_CALL(store, read(tags, url, 3u)).WillOnce(Return(Data{1, 2, 3}));
  EXPECT_EQ(extendedAttribute(store, tags, url), (Data{1, 2, 3}));

  EXPECT_CALL(store, size("z", url)).WillOnce(Return(0u));
  EXPECT_CALL(store, read("z", url, 0u)).WillOnce(Return(Data{}));
  EXPECT_EQ(extendedAttribute(store, "z", url), Data{}) << "empty, and the names are known";
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(ExtendedAttributes, NamesAreAskedForOnceAndWhatIsNotThereIsNotAskedFor) {
  EXPECT_CALL(store, names(_)).WillOnce(Return(std::vector<std::string>{}));
  EXPECT_EQ(extendedAttribute(store, tags, url), std::nullopt);
  EXPECT_EQ(extendedAttribute(store, "other", url), std::nullopt);
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(ExtendedAttributes, FailuresToReadAreLoggedByWhatFailedAndWhy) {
  const std::string get = "can't get xattr com.norvane.metadata:_kMDItemUserTags; ";
  const std::string copy = "can't copy data for xattr com.norvane.metadata:_kMDItemUserTags; ";
  const std::string missing = "POSIX error 2: No such file or directory";
  const struct {
    std::optional<int> sizeFailure, readFailure;
    std::vector<LogLine> lines;
  } cases[] = {
      {ENODATA, {}, {}},
      {ENOENT, {}, {{LogLevel::debug, "[DEBUG] " + get + missing}}},
      {EIO, {}, {{LogLevel::error, "[ERROR] " + get + "POSIX error 5: Input/output error"}}},
      {{}, ENOENT, {{LogLevel::debug, "[DEBUG] " + copy + missing}}},
      {{}, EIO, {{LogLevel::error, "[ERROR] " + copy + "POSIX error 5: Input/output error"}}},
  };
  // Names that can't be had leave it to the attribute itself to say what is wrong.
  EXPECT_CALL(store, names(_)).WillRepeatedly([](auto&) { return fail(Error::posix(EIO)); });
  for (const auto& [sizeFailure, readFailure, lines] : cases) {
    log.clear();
    EXPECT_CALL(store, size(_, _)).WillOnce([&](auto, auto&) -> Result<std::size_t> {
      if (sizeFailure) return fail(Error::posix(*sizeFailure));
      return 4u;
    });
    if (readFailure) {
      EXPECT_CALL(store, read(_, _, 4u)).WillOnce([&](auto, auto&, auto) {
        return fail(Error::posix(*readFailure));
      });
    }
    EXPECT_EQ(extendedAttribute(store, tags, url), std::nullopt);
    EXPECT_EQ(log.lines(), lines);
  }
}

TEST_F(ExtendedAttributes, AreSetAndRemovedWithoutALine) {
  EXPECT_CALL(target, set(tags, Data{4})).WillOnce(Return(Result<void>()));
  EXPECT_EQ(setExtendedAttribute(target, Data{4}, tags), std::nullopt);
  EXPECT_CALL(target, set(tags, Data{})).WillOnce(Return(Result<void>()));
  EXPECT_EQ(setExtendedAttribute(target, Data{}, tags), std::nullopt) << "empty is not absent";
  EXPECT_CALL(target, remove(tags)).WillOnce(Return(Result<void>())).WillOnce([](auto) {
    return fail(Error::posix(ENODATA));
  });
  EXPECT_EQ(setExtendedAttribute(target, std::nullopt, tags), std::nullopt);
  EXPECT_EQ(setExtendedAttribute(target, std::nullopt, tags), std::nullopt) << "was not there";
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(ExtendedAttributes, FailuresToWriteAreLoggedAndReturned) {
  const struct {
    std::optional<Data> value;
    Error failure;
    LogLevel level;
    std::string line;
  } cases[] = {
      {Data{1}, Error::posix(EACCES), LogLevel::debug, "[DEBUG] can't set xattr \"a\"; "},
      {Data{1}, Error::posix(ENOSPC), LogLevel::error, "[ERROR] can't set xattr \"a\"; "},
      {Data{1}, Error::posix(ENODATA), LogLevel::error, "[ERROR] can't set xattr \"a\"; "},
      {{}, Error::posix(EACCES), LogLevel::debug, "[DEBUG] can't remove xattr \"a\"; "},
      {{}, Error::posix(EPERM), LogLevel::error, "[ERROR] can't remove xattr \"a\"; "},
  };
  for (const auto& [value, failure, level, line] : cases) {
    log.clear();
    ON_CALL(target, set).WillByDefault([&](auto, auto&) { return fail(failure); });
    ON_CALL(target, remove).WillByDefault([&](auto) { return fail(failure); });
    EXPECT_CALL(target, set).Times(value ? 1 : 0);
    EXPECT_CALL(target, remove).Times(value ? 0 : 1);
    EXPECT_EQ(setExtendedAttribute(target, value, "a"), failure);
    EXPECT_THAT(log.lines(), ElementsAre(LogLine{level, line + failure.description()}));
    ::testing::Mock::VerifyAndClear(&target);
  }
}

}  // namespace
}  // namespace mirabel
