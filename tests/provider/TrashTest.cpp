#include <cerrno>

#include "foundation/KeyedArchive.h"
#include "items/AttributeNames.h"
#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;

class TrashTest : public ProviderFixture {
 protected:
  TrashTest() {
    fake.volume.makeFolder("/apps/draw/Documents/Notes");
    fake.volume.writeFile(before, "12345");
    file = idAt(before);
    log.clear();
  }
  /// Of what was moved.
  std::map<std::string, Data, std::less<>> attributes() { return fake.volume.at(after).attributes; }

  const std::string before = "/apps/draw/Documents/Notes/a.txt";
  const std::string after = "/apps/draw/Documents/.Trash/a.txt";
  std::string file;
};

TEST_F(TrashTest, TheItemIsMovedWithANoteOfWhenAndFromWhere) {
  vessel->trashItemWithIdentifier(file, done.handler());
  EXPECT_EQ(done.item()->itemIdentifier(), file);
  EXPECT_TRUE(done.item()->isTrashed());
  EXPECT_EQ(done.item()->fileURL().path(), after);
  EXPECT_EQ(done.item()->putBackURL(), URL::fileURL(before));
  EXPECT_FALSE(existsAt(before));
  EXPECT_EQ(keyedarchive::unarchiveDate(attributes().at("com.norvane.trash.time#PS")),
            fake.clock.now());
  EXPECT_EQ(keyedarchive::unarchiveString(attributes().at("com.norvane.trash.putback#PS")),
            "Notes/a.txt");
  EXPECT_THAT(log.sectionLabels(),
              ElementsAre("trash item \"" + file + "\"", "fetching URL for \"" + file + "\"",
                          "fetching item identifier for \"" + after + "\""));
  EXPECT_THAT(log.messages(),
              ElementsAre(debug("found file://" + before),
                          debug("trash is located at \"/apps/draw/Documents/.Trash\""),
                          debug("setting trash date on file://" + after),
                          debug("setting putback string on file://" + after),
                          debug("setting putback 'Notes/a.txt' on file://" + after),
                          debug("found " + file)));
}

TEST_F(TrashTest, WhatLiesInNoLibraryIsTrashedWithoutAPutBackPlace) {
  vessel->trashItemWithIdentifier(id("a.txt"), done.handler());
  const std::string trashed = fake.path(".Trash/a.txt");
  EXPECT_EQ(done.item()->fileURL().path(), trashed);
  EXPECT_TRUE(fake.volume.at(trashed).attributes.contains(attributename::trashDate));
  EXPECT_FALSE(fake.volume.at(trashed).attributes.contains(attributename::putBack));
  EXPECT_THAT(log.messages(),
              Contains(error("couldn't find app library for file://" + fake.path("a.txt"))));
}

TEST_F(TrashTest, ALibraryThatCannotBeUsedLeavesTheItemWithoutAPutBackPlace) {
  fake.install("org.example.other", "/apps/other");
  struct Case {
    BundleProxy owner;
    std::vector<LogLine> errors;
  };
  const Case cases[] = {
      {{"org.example.bare", {}, {}},
       {error("can't create an app library item without a data container URL")}},
      {{"org.example.other", URL::fileURL("/apps/other"), "Other"},
       {error("could't compute putback string (path: " + before +
              ", basePath: /apps/other/Documents")}},
  };
  for (const Case& c : cases) {
    clear();
    const OneOwner owners(c.owner);
    LocalVessel other(fake.platform(), libraries, owners);
    other.trashItemWithIdentifier(file, done.handler());
    EXPECT_TRUE(done.item()->isTrashed());
    EXPECT_FALSE(attributes().contains(attributename::putBack));
    auto errors = log.messages();
    std::erase_if(errors, [](const LogLine& line) { return line.level != LogLevel::error; });
    EXPECT_EQ(errors, c.errors);
    fake.volume.rename(after, before);
  }
}

TEST_F(TrashTest, NotesThatCannotBeWrittenDoNotUndoTheMove) {
  const std::string line = "couldn't set putback xattr (Notes/a.txt) on file://" + after + "; ";
  fake.faults.fail(Op::readWriteAccess, Error::posix(EROFS), 1, 2);
  vessel->trashItemWithIdentifier(file, done.handler());
  EXPECT_TRUE(done.item()->isTrashed());
  EXPECT_TRUE(attributes().empty());
  EXPECT_THAT(log.messages(), Contains(error(line + Error::posix(EROFS).description())));

  fake.volume.rename(after, before);
  clear();
  fake.faults.fail(Op::attributeSet, Error::posix(EDQUOT), 2);
  vessel->trashItemWithIdentifier(file, done.handler());
  EXPECT_TRUE(done.item()->isTrashed());
  EXPECT_TRUE(attributes().contains(attributename::trashDate));
  EXPECT_THAT(log.messages(), Contains(error(line + Error::posix(EDQUOT).description())));
}

TEST_F(TrashTest, AFailedMoveLeavesTheItemAsItWas) {
  fake.faults.fail(Op::createDirectory, Error::posix(ENOSPC));
  vessel->trashItemWithIdentifier(file, done.handler());
  EXPECT_EQ(done.error(), Error::posix(ENOSPC));
  // A name that is taken all the same is told like any collision.
  clear();
  fake.faults.fail(Op::trashUnderFolder, fileExists(fake.url("a.txt")));
  vessel->trashItemWithIdentifier(file, done.handler());
  EXPECT_EQ(done.error(), Error::collision(id("a.txt")));
  EXPECT_TRUE(fake.volume.at(before).attributes.empty());
}

class TrashOutsideDocumentsTest : public ProviderFixture {
 protected:
  TrashOutsideDocumentsTest() : ProviderFixture("/home/me/Files") {}
};

TEST_F(TrashOutsideDocumentsTest, NothingIsMadeOrMoved) {
  vessel->trashItemWithIdentifier(id("a.txt"), done.handler());
  EXPECT_EQ(done.error(), Error::invalidParameter("sourceURL", "file://" + fake.path("a.txt")));
  EXPECT_EQ(log.messages().back(),
            error("no Documents directory found in path \"" + fake.path("a.txt") + "\""));
  EXPECT_EQ(fake.faults.calls(Op::createDirectory), 0U);
  EXPECT_TRUE(exists("a.txt"));
}

}  // namespace
}  // namespace mirabel::testing
