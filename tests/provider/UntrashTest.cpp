#include <cerrno>

#include "foundation/KeyedArchive.h"
#include "items/AttributeNames.h"
#include "provider/ProviderFixture.h"
#include "support/Transcript.h"

namespace mirabel::testing {
namespace {

using ::testing::Contains;

/// A file of an app library that lies in the trash, with a note of where it was.
class UntrashTest : public ProviderFixture {
 protected:
  UntrashTest() {
    fake.volume.makeFolder(library + "/Notes");
    fake.volume.writeFile(library + "/Notes/a.txt", "12345");
    file = idAt(library + "/Notes/a.txt");
    vessel->trashItemWithIdentifier(file, done.handler());
    fake.volume.makeFolder(library + "/.Trash/folder");
    trashed = idAt(library + "/.Trash/folder");
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
  std::string trashed;  ///< a folder
};

TEST_F(UntrashTest, TheItemLosesItsDateOnly) {
  untrash();
  EXPECT_EQ(done.item()->itemIdentifier(), file);
  EXPECT_FALSE(done.item()->isTrashed());
  const auto& attributes = fake.volume.at(library + "/Notes/a.txt").attributes;
  EXPECT_FALSE(attributes.contains(attributename::trashDate));
  EXPECT_TRUE(attributes.contains(attributename::putBack));
  expectTranscript(log, R"(
┏untrash item "did=1"
[DEBUG] putback url is file:///apps/draw/Documents/Notes/a.txt
[DEBUG] removing trash date xattr
[DEBUG] setting trash date on file:///apps/draw/Documents/Notes/a.txt
)");
  untrash(id("folder"));
  EXPECT_EQ(done.error(), Error::invalidParameter("itemIdentifier", file));
  EXPECT_EQ(log.messages().back(), debug("item is not in trash"));
  EXPECT_TRUE(existsAt(library + "/Notes/a.txt"));
}

TEST_F(UntrashTest, ItsPlaceAndNameAreThoseThatItHadUnlessTheHostKnowsBetterOrTheyAreNoMore) {
  const std::string notes = library + "/Notes";
  const std::string trash = library + "/.Trash";
  const auto nothing = [] {};
  const auto setNote = [&](std::string_view place) {
    fake.volume.at(trash + "/a.txt").attributes[std::string(attributename::putBack)] =
        keyedarchive::archiveString(place).value();
  };
  // Another of that name was there before it.
  const auto renamed = [&] { fake.volume.rename(trash + "/a.txt", trash + "/a 2.txt"); };
  const std::string unreachable = "putback url is not reachable; " + putBack;
  const std::string recovered = "use #org.example.draw's root as recover location";
  const struct {
    std::function<void()> arrange;
    std::string parent;
    std::optional<std::string> formerName;
    std::string path;
    std::string line;
  } cases[] = {
      {nothing, "", {}, notes + "/a.txt", "putback url is " + putBack},
      {nothing, id("folder"), {}, fake.path("folder/a.txt"), ""},
      {nothing, "fid=4711", {}, notes + "/a.txt", "putback url is " + putBack},
      {nothing,
       trashed,
       {},
       notes + "/a.txt",
       "can't use provided parent item " + trashed + " because it's trashed; " + trash + "/folder"},
      {renamed, "", {}, notes + "/a.txt", ""},
      {renamed, "", "known.txt", notes + "/known.txt", ""},
      {renamed, id("folder"), {}, fake.path("folder/a.txt"), ""},
      {renamed, id("folder"), "known.txt", fake.path("folder/known.txt"), ""},
      {[&] { setNote(".Trash/folder/b.txt"); }, "", {}, library + "/b.txt", recovered},
      {[&] { fake.volume.at(trash + "/a.txt").attributes.clear(); },
       "",
       {},
       library + "/a.txt",
       "no putback url"},
      {[&] { fake.volume.remove(notes); }, "", {}, library + "/a.txt", unreachable},
      {[&] { fake.volume.writeFile(notes, "a file now"); },
       "",
       {},
       library + "/a.txt",
       unreachable},
      {[&] {
         fake.volume.remove(notes);
         fake.volume.makeSymlink(notes, "..");
       },
       "",
       {},
       library + "/a.txt",
       recovered},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.path + " " + c.line);
    c.arrange();
    clear();
    untrash(c.parent.empty() ? std::nullopt : std::optional(c.parent), c.formerName);
    EXPECT_EQ(pathAfterwards(), c.path);
    if (!c.line.empty()) {
      EXPECT_THAT(log.messages(), Contains(debug(c.line)));
    }
    // Back into the trash as it was, with the note of its old place.
    fake.volume.rename(c.path, trash + "/a.txt");
    setNote("Notes/a.txt");
  }
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
