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

TEST_F(ResourceReaderTest, AbsentValuesAndOtherTypesReadAsNothingWithoutALine) {
  source.values = ResourceValues{.kind = FileKind::folder, .fileID = 2, .size = 4096};
  EXPECT_EQ(reader.number(ResourceKey::fileSize, url), std::nullopt) << "folders have no size";
  EXPECT_EQ(reader.number(ResourceKey::documentIdentifier, url), std::nullopt);
  EXPECT_EQ(reader.date(ResourceKey::creationDate, url), std::nullopt);
  EXPECT_EQ(reader.string(ResourceKey::typeIdentifier, url), std::nullopt);
  EXPECT_EQ(reader.boolean(ResourceKey::isDirectory, url), true);

  EXPECT_EQ(reader.number(ResourceKey::name, url), std::nullopt);
  EXPECT_EQ(reader.date(ResourceKey::isDirectory, url), std::nullopt);
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
