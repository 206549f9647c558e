#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "linux/log/JournalSink.h"

namespace mirabel {
namespace {

using ::testing::ElementsAre;

TEST(JournalSink, LinesBecomeFieldsThatPeopleFilterBy) {
  EXPECT_THAT(journalFields(LogLevel::error, "com.norvane.Vessel", "mirabel", "[ERROR] a\nb=c"),
              ElementsAre("MESSAGE=[ERROR] a\nb=c", "PRIORITY=3", "SUBSYSTEM=com.norvane.Vessel",
                          "CATEGORY=mirabel", "SYSLOG_IDENTIFIER=mirabel"));
  EXPECT_EQ(journalFields(LogLevel::info, "s", "c", "x")[1], "PRIORITY=6");
  EXPECT_EQ(journalFields(LogLevel::debug, "s", "c", "x")[1], "PRIORITY=7");
}

TEST(JournalSink, LeavesErrnoAloneWithAndWithoutAJournal) {
  JournalSink sink;
  errno = ENOTDIR;
  sink.write(LogLevel::debug, "com.norvane.Vessel", "mirabel", "[DEBUG] written by a test");
  EXPECT_EQ(errno, ENOTDIR);
}

}  // namespace
}  // namespace mirabel
