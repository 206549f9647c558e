#include <cerrno>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

#include "foundation/KeyedArchive.h"
#include "items/AttributeNames.h"
#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::AllOf;
using ::testing::Contains;
using ::testing::IsSupersetOf;

/// A file of an app library that lies in the trash, with a note of where it was.
class UntrashTest : public ProviderFixture {
 protected:
  UntrashTest() {
    fake.volume.makeFolder(library + "/Notes");
    fake.volume.writeFile(library + "/Notes/a.txt", "12345");
    file = idAt(library + "/Notes/a.txt");
    vessel->trashItemWithIdentifier(file, done.handler());
    clear();
  }
  void untrash(const std::optional<std::string>& parent = {},
               const std::optional<std::string>& formerName = {}) {
    done.results.clear();
    vessel->untrashItemWithIdentifier(file, parent, done.handler(), formerName);
  }
  std::string pathAfterwards() {
    const auto item = done.item();
    return item ? item->fileURL().path() : std::string();
  }

  const std::string library = "/apps/draw/Documents";
  const std::string putBack = "file:///apps/draw/Documents/Notes/a.txt";
  std::string file;
};

TEST_F(UntrashTest, TheItemGoesBackToItsFolderAndLosesItsDateOnly) {
  untrash();
  EXPECT_EQ(pathAfterwards(), library + "/Notes/a.txt");
  EXPECT_EQ(done.item()->itemIdentifier(), file);
  EXPECT_FALSE(done.item()->isTrashed());
  const auto& attributes = fake.volume.at(library + "/Notes/a.txt").attributes;
  EXPECT_FALSE(attributes.contains(attributename::trashDate));
  EXPECT_TRUE(attributes.contains(attributename::putBack));
  EXPECT_EQ(log.sectionLabels().front(), "untrash item \"" + file + "\"");
  EXPECT_EQ(log.messages(),
            (std::vector{debug("found file://" + library + "/.Trash/a.txt"),
                         debug("putback url is " + putBack), debug("removing trash date xattr"),
                         debug("setting trash date on " + putBack), debug("found " + file)}));
}

TEST_F(UntrashTest, AParentThatIsGivenComesBeforeThePlaceItCameFrom) {
  untrash(id("folder"));
  EXPECT_EQ(pathAfterwards(), fake.path("folder/a.txt"));
}

TEST_F(UntrashTest, AParentThatIsNoneIsPassedOver) {
  fake.volume.makeFolder(library + "/.Trash/folder");
  const std::string trashed = idAt(library + "/.Trash/folder");
  const std::pair<std::string, std::vector<LogLine>> cases[] = {
      {trashed,
       {debug("can't use provided parent item " + trashed + " because it's trashed; " + library +
              "/.Trash/folder"),
        debug("putback url is " + putBack)}},
      {"fid=4711", {debug("putback url is " + putBack)}},
  };
  for (const auto& [parent, lines] : cases) {
    log.clear();
    untrash(parent);
    EXPECT_EQ(pathAfterwards(), library + "/Notes/a.txt");
    EXPECT_THAT(log.messages(), IsSupersetOf(lines));
    done.results.clear();
    vessel->trashItemWithIdentifier(file, done.handler());
  }
}

TEST_F(UntrashTest, AFolderThatHoldsNothingAnyMoreGivesWayToTheLibrary) {
  const std::string folder = library + "/Notes";
  const std::function<void()> changes[] = {
      [&] { fake.volume.remove(folder); },
      [&] { fake.volume.writeFile(folder, "a file now"); },
      [&] {
        fake.volume.remove(folder);
        fake.volume.makeSymlink(folder, "..");
      },
  };
  for (const auto& change : changes) {
    clear();
    change();
    untrash();
    EXPECT_EQ(pathAfterwards(), library + "/a.txt");
    EXPECT_THAT(log.messages(),
                AllOf(Contains(debug("putback url is not reachable; " + putBack)),
                      Contains(debug("use #org.example.draw's root as recover location"))));
    // Back into the trash as it was, with the note of its old place.
    fake.volume.rename(library + "/a.txt", library + "/.Trash/a.txt");
  }
}

TEST_F(UntrashTest, APlaceInTheTrashGivesWayToTheLibrary) {
  fake.volume.makeFolder(library + "/.Trash/Notes");
  fake.volume.at(library + "/.Trash/a.txt").attributes[std::string(attributename::putBack)] =
      keyedarchive::archiveString(".Trash/Notes/b.txt").value();
  untrash();
  EXPECT_EQ(pathAfterwards(), library + "/b.txt");
}

TEST_F(UntrashTest, WithoutANoteTheItemGoesToTheLibraryUnderItsName) {
  fake.volume.at(library + "/.Trash/a.txt").attributes.clear();
  fake.volume.rename(library + "/.Trash/a.txt", library + "/.Trash/b.txt");
  untrash();
  EXPECT_EQ(pathAfterwards(), library + "/b.txt");
  EXPECT_THAT(log.messages(),
              IsSupersetOf({debug("no putback url"),
                            debug("use #org.example.draw's root as recover location")}));
}

TEST_F(UntrashTest, TheNameIsTheOneItHadUnlessTheHostKnowsBetter) {
  struct Case {
    std::optional<std::string> parent;
    std::optional<std::string> formerName;
    std::string path;
  };
  const Case cases[] = {
      {{}, {}, library + "/Notes/a.txt"},
      {{}, "known.txt", library + "/Notes/known.txt"},
      {id("folder"), {}, fake.path("folder/a.txt")},
      {id("folder"), "known.txt", fake.path("folder/known.txt")},
  };
  for (const Case& c : cases) {
    // Another was there before it in the trash.
    fake.volume.rename(fake.volume
                           .pathsOfFileID(fake.volume.fileIDOfDocument(
                               static_cast<std::uint64_t>(std::stoi(file.substr(4)))))
                           .front(),
                       library + "/.Trash/a 2.txt");
    untrash(c.parent, c.formerName);
    EXPECT_EQ(pathAfterwards(), c.path);
  }
  untrash();
  EXPECT_EQ(done.error(), Error::invalidParameter("itemIdentifier", file));
}

TEST_F(UntrashTest, ANameThatIsTakenIsNoObstacle) {
  fake.volume.writeFile(library + "/Notes/a.txt", "1");
  const std::string other = idAt(library + "/Notes/a.txt");
  untrash();
  EXPECT_NE(done.item()->filename(), "a.txt");
  EXPECT_EQ(done.item()->fileURL().deletingLastPathComponent().path(), library + "/Notes");
  EXPECT_EQ(idAt(library + "/Notes/a.txt"), other);
}

TEST_F(UntrashTest, WhatIsNotInTheTrashIsRefused) {
  fake.volume.rename(library + "/.Trash/a.txt", library + "/a.txt");
  untrash(id("folder"));
  EXPECT_EQ(done.error(), Error::invalidParameter("itemIdentifier", file));
  EXPECT_EQ(log.messages().back(), debug("item is not in trash"));
  EXPECT_TRUE(existsAt(library + "/a.txt"));
}

TEST_F(UntrashTest, WhatHasNoPlaceToGoStays) {
  fake.volume.makeFolder(fake.path(".Trash"));
  fake.volume.rename(fake.path("a.txt"), fake.path(".Trash/a.txt"));
  fake.volume.makeFolder(fake.path(".Trash/app"));
  fake.install("org.example.trashed", fake.path(".Trash/app"), "Trashed");
  for (const std::string& identifier : {id(".Trash/a.txt"), std::string("#org.example.trashed")}) {
    clear();
    vessel->untrashItemWithIdentifier(identifier, {}, done.handler());
    EXPECT_EQ(done.error(), Error::invalidParameter("itemIdentifier", identifier));
    EXPECT_THAT(log.messages(), Contains(debug("no putback url")));
    EXPECT_EQ(log.messages().back(), debug("can't compute valid parent URL for " + identifier));
    EXPECT_EQ(fake.faults.calls(Op::reparentUnderFolder), 0U);
  }
  // A host that remembers helps.
  vessel->untrashItemWithIdentifier(id(".Trash/a.txt"), id("folder"), Completions().handler(),
                                    "former.txt");
  EXPECT_TRUE(exists("folder/former.txt"));
}

TEST_F(UntrashTest, ALibraryInTheTrashDoesNotGoIntoItself) {
  fake.volume.makeFolder(fake.path(".Trash"));
  const OneOwner owners(fake.install("org.example.trashed", fake.path(".Trash/app"), "Trashed"));
  LocalVessel other(fake.platform(), libraries, owners);
  other.untrashItemWithIdentifier("#org.example.trashed", {}, done.handler());
  EXPECT_EQ(done.error(), Error::invalidParameter("itemIdentifier", "#org.example.trashed"));
  EXPECT_EQ(fake.faults.calls(Op::reparentUnderFolder), 0U);
}

TEST_F(UntrashTest, AFailedMoveLeavesTheDate) {
  fake.faults.fail(Op::reparentUnderFolder, Error::posix(ENOSPC));
  untrash();
  EXPECT_EQ(done.error(), Error::posix(ENOSPC));
  EXPECT_TRUE(
      fake.volume.at(library + "/.Trash/a.txt").attributes.contains(attributename::trashDate));
  fake.faults.fail(Op::reparentUnderFolder, fileExists(fake.url("folder")));
  untrash();
  EXPECT_EQ(done.error(), Error::collision(id("folder")));
  // One that cannot be removed does not undo the move.
  fake.faults.fail(Op::readWriteAccess, Error::posix(EROFS));
  untrash();
  EXPECT_EQ(pathAfterwards(), library + "/Notes/a.txt");
}

}  // namespace
}  // namespace mirabel::testing
