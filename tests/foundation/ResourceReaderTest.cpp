#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "foundation/ResourceValues.h"
#include "foundation/URL.h"
#include "support/LogCapture.h"

namespace mirabel {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using testing::LogCapture;
using testing::LogLine;

class OneFile : public ResourceValueSource {
 public:
  Result<ResourceValues> values;
  int reads = 0;

  Result<ResourceValues> readValues(const URL&) override {
    ++reads;
    return values;
  }
  Result<void> prefetch(std::span<const URL>) override { return {}; }
};

struct ResourceReaderTest : ::testing::Test {
  OneFile source;
  ResourceReader reader{source};
  URL url = URL::fileURL("/d/report 1.txt");
  LogCapture log;
};

TEST_F(ResourceReaderTest, AllValuesComeFromOneLook) {
  source.values = ResourceValues{.kind = FileKind::regular,
                                 .isPackage = false,
                                 .isWritable = true,
                                 .fileID = std::uint64_t{1} << 62,
                                 .documentID = 5,
                                 .size = 12,
                                 .creationDate = Date{.seconds = 1, .nanoseconds = 2},
                                 .contentModificationDate = Date{.seconds = 3, .nanoseconds = 4},
                                 .typeIdentifier = "text/plain"};
  EXPECT_EQ(reader.string(ResourceKey::name, url), "report 1.txt");
  EXPECT_EQ(reader.string(ResourceKey::typeIdentifier, url), "text/plain");
  EXPECT_EQ(reader.number(ResourceKey::fileSize, url), Number::of(std::uint64_t{12}));
  EXPECT_EQ(reader.number(ResourceKey::fileIdentifier, url), Number::of(std::uint64_t{1} << 62));
  EXPECT_EQ(reader.number(ResourceKey::documentIdentifier, url), Number::of(std::uint64_t{5}));
  EXPECT_EQ(reader.date(ResourceKey::creationDate, url), (Date{1, 2}));
  EXPECT_EQ(reader.date(ResourceKey::contentModificationDate, url), (Date{3, 4}));
  EXPECT_EQ(reader.boolean(ResourceKey::isDirectory, url), false);
  EXPECT_EQ(reader.boolean(ResourceKey::isPackage, url), false);
  EXPECT_EQ(reader.boolean(ResourceKey::isWritable, url), true);
  EXPECT_EQ(reader.boolean(ResourceKey::isReachable, url), true);
  EXPECT_EQ(source.reads, 1);

  url.resources().clear();
  EXPECT_EQ(reader.boolean(ResourceKey::isReachable, url), true);
  EXPECT_EQ(source.reads, 2) << "a cleared cache looks again";
}

TEST_F(ResourceReaderTest, AbsentValuesAndOtherTypesReadAsNothingWithoutALine) {
  source.values = ResourceValues{.kind = FileKind::folder, .fileID = 2, .size = 4096};
  EXPECT_EQ(reader.number(ResourceKey::fileSize, url), std::nullopt) << "folders have no size";
  EXPECT_EQ(reader.number(ResourceKey::documentIdentifier, url), std::nullopt);
  EXPECT_EQ(reader.date(ResourceKey::creationDate, url), std::nullopt);
  EXPECT_EQ(reader.string(ResourceKey::typeIdentifier, url), std::nullopt);
  EXPECT_EQ(reader.number(ResourceKey::fileResourceIdentifier, url), std::nullopt);
  EXPECT_EQ(reader.boolean(ResourceKey::isDirectory, url), true);

  EXPECT_EQ(reader.number(ResourceKey::name, url), std::nullopt);
  EXPECT_EQ(reader.string(ResourceKey::fileIdentifier, url), std::nullopt);
  EXPECT_EQ(reader.data(ResourceKey::isDirectory, url), std::nullopt);
  EXPECT_EQ(reader.date(ResourceKey::isPackage, url), std::nullopt);
  EXPECT_EQ(reader.boolean(ResourceKey::name, url), std::nullopt);
  EXPECT_THAT(log.lines(), IsEmpty());

  EXPECT_EQ(reader.string(ResourceKey::name, URL::fileURL("/")), "/");
}

TEST_F(ResourceReaderTest, FailedReadsAreLoggedAndTriedAgain) {
  source.values = fail(Error::posix(EACCES));
  EXPECT_EQ(reader.number(ResourceKey::documentIdentifier, url), std::nullopt);
  source.values = fail(Error::file(FileErrorCode::noSuchFile));
  EXPECT_EQ(reader.string(ResourceKey::typeIdentifier, url), std::nullopt);
  EXPECT_THAT(log.lines(),
              ElementsAre(LogLine{LogLevel::error,
                                  "[ERROR] can't get resource \"documentIdentifier\" for "
                                  "file:///d/report%201.txt; POSIX error 13: Permission denied"},
                          LogLine{LogLevel::error,
                                  "[ERROR] can't get resource \"typeIdentifier\" for "
                                  "file:///d/report%201.txt; file error 260: no such file"}));
  EXPECT_EQ(source.reads, 2) << "a failure is not kept";
}

}  // namespace
}  // namespace mirabel
