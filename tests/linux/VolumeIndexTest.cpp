#include <filesystem>
#include <map>
#include <set>

#include "linux/VolumeFixture.h"
#include "linux/volume/IdentityStore.h"

namespace mirabel {
namespace {

using VolumeIndexTest = VolumeFixture;

TEST_F(VolumeIndexTest, LookingBetweenTheStepsOfASaveChangesNothing) {
  write("doc");
  const std::uint32_t document = this->document("doc");
  run("mv doc doc~");
  EXPECT_EQ(findDocument(document), "doc~");
  run("write doc");
  list();
  EXPECT_EQ(this->document("doc"), document);
  const std::uint32_t backup = this->document("doc~");
  EXPECT_NE(backup, document);
  // One that is kept and replaced leaves the document with its name.
  for (const char* first : {"doc~", "doc"}) {
    run("mv doc doc~; write doc");
    see(first);
    EXPECT_EQ(findDocument(document), "doc") << first;
    EXPECT_EQ(this->document("doc~"), backup) << first;
  }
  // One that is renamed back was no backup; one that moved on hands nothing over.
  for (const char* step : {"mv doc~ doc~.old", "mv doc~.old elsewhere", "write doc~"}) {
    run(step);
    list();
  }
  EXPECT_EQ(this->document("elsewhere"), backup);
  EXPECT_NE(this->document("doc~"), backup);
}

TEST_F(VolumeIndexTest, ExchangedDocumentsGoWithTheirFiles) {
  run("write a; write b; write c");
  const auto a = see("a"), b = see("b"), c = see("c");
  run("close; swap a b; swap b c");  // now a: b's, b: c's, c: a's
  list();
  EXPECT_EQ(document("c"), a.documentID);
  EXPECT_EQ(document("a"), b.documentID);
  EXPECT_EQ(document("b"), c.documentID);
  EXPECT_EQ(findFile(a.fileID), "c");
}

TEST_F(VolumeIndexTest, AReusedInodeNumberIsANewThing) {
  std::set<std::uint64_t> files;
  std::set<std::uint32_t> documents;
  for (int round = 0; round < 50; ++round) {
    const std::string n = std::to_string(round);
    run("write f" + n + "; mkdir d" + n);
    const Sighting seen = see("f" + n);
    const std::uint64_t folder = file("d" + n);
    EXPECT_TRUE(files.insert(seen.fileID).second);
    EXPECT_TRUE(files.insert(folder).second);
    EXPECT_TRUE(documents.insert(seen.documentID).second);
    if (round % 7 == 0) close();
    // The number's next holder must not be found under the old identity.
    run("rm f" + n + "; rm d" + n + "; write next; mkdir nextFolder");
    if (round % 2 == 0) list();
    EXPECT_EQ(findFile(seen.fileID), "");
    EXPECT_EQ(findFile(folder), "");
    EXPECT_EQ(findDocument(seen.documentID), "");
    run("rm next; rm nextFolder");
  }
}

TEST_F(VolumeIndexTest, KindsHaveTheIdentityThatFitsThem) {
  run("mkdir plain; mkdir thing.package");
  std::filesystem::create_symlink("nowhere", path("broken"));
  ASSERT_EQ(::mkfifo(path("fifo").c_str(), 0600), 0);
  for (const char* name : {"plain", "broken", "fifo"})
    EXPECT_EQ(document(name), 0u) << name;
  const Sighting package = see("thing.package");
  EXPECT_NE(package.documentID, 0u);

  // A package that stops being one loses its document ID, and gets it back with its suffix.
  run("mv thing.package thing");
  EXPECT_EQ(document("thing"), 0u);
  EXPECT_EQ(findDocument(package.documentID), "");
  EXPECT_EQ(file("thing"), package.fileID);
  run("mv thing other.package");
  EXPECT_EQ(document("other.package"), package.documentID);

  // A file in the place of a package is no save of it.
  run("rm other.package; write other.package");
  EXPECT_NE(document("other.package"), package.documentID);
}

TEST_F(VolumeIndexTest, AHardLinkedFileIsOneThingAsLongAsItHasAName) {
  run("mkdir folder; write a");
  const Sighting a = see("a");
  link("a", "folder/b");
  EXPECT_EQ(see("folder/b").fileID, a.fileID);
  EXPECT_EQ(document("folder/b"), a.documentID);
  close();
  EXPECT_EQ(findDocument(a.documentID), "a");
  remove("a");
  EXPECT_EQ(findDocument(a.documentID), "folder/b");
  // A save over one of two names leaves the other with the identity.
  link("folder/b", "c");
  list();
  run("write tmp; mv tmp c");
  list();
  EXPECT_EQ(document("folder/b"), a.documentID);
  EXPECT_NE(document("c"), a.documentID);
  // A save over the last of its names takes the document over.
  link("folder/b", "folder/d");
  list("folder");
  run("rm folder/d; write tmp; mv tmp folder/b");
  list("folder");
  EXPECT_EQ(findDocument(a.documentID), "folder/b");
}

// Making room for the further name moves a document onto another name of the same file.
TEST_F(VolumeIndexTest, ALinkThatTakesTheNameOfADocumentWhichTookALinkKeepsBothApart) {
  run("write .file; look .file; ln .file b; write f; look f");
  const std::uint32_t document = this->document("b");
  run("mv f b; ln .file f");
  const std::uint32_t linked = this->document("f");
  EXPECT_NE(linked, document);
  EXPECT_EQ(this->document(".file"), linked);
  EXPECT_EQ(findDocument(document), "b");
}

TEST_F(VolumeIndexTest, ListingWhatIsKnownWritesNothing) {
  run("write a; ln a b; mkdir folder; ln a folder/c");
  age_ = 1'000'000'000;
  const auto timeOfState = [this] {
    list();
    list("folder");
    close();
    for (const auto& entry : std::filesystem::recursive_directory_iterator(state_)) {
      if (entry.path().filename() == "witness") return entry.last_write_time();
    }
    return std::filesystem::file_time_type();
  };
  const auto before = timeOfState();
  EXPECT_EQ(timeOfState(), before);
}

TEST_F(VolumeIndexTest, AThingThatLeavesTheRootsAndComesBackIsItself) {
  run("write doc; mkdir folder/sub");
  const std::uint32_t doc = document("doc");
  const std::uint64_t sub = file("folder/sub");
  run("mv doc ../doc; mv folder ../folder");
  EXPECT_EQ(findDocument(doc), "");
  EXPECT_EQ(findFile(sub), "");
  run("close; mv ../doc again; mv ../folder moved");
  EXPECT_EQ(document("again"), doc);
  EXPECT_EQ(findFile(sub), "moved/sub");
}

// The number of a file that was saved over goes to the next new file at once, which a listing may
// meet before the one that took the document over.
TEST_F(VolumeIndexTest, DocumentsSavedInTurnKeepTheirIdentities) {
  std::map<std::string, std::uint32_t> documents;
  for (int i = 0; i < 24; ++i) {
    const std::string name = "doc" + std::to_string(i);
    write(name);
    documents[name] = document(name);
  }
  for (const auto& [name, id] : documents)
    run("write tmp; mv tmp " + name);
  run("mkdir folder; write folder/unrelated");
  list("folder");
  EXPECT_EQ(findDocument(documents["doc7"]), "doc7");
  list();
  for (const auto& [name, id] : documents)
    EXPECT_EQ(document(name), id) << name;
}

TEST_F(VolumeIndexTest, AnotherWayToAPlaceIsTheSamePlace) {
  run("mkdir folder; write doc; write folder/inner");
  const Sighting doc = see("doc"), inner = see("folder/inner");
  std::filesystem::create_directory_symlink(documents_, base_ + "/alias");
  EXPECT_EQ(see("folder/../doc").fileID, doc.fileID);
  EXPECT_EQ(see("folder/./inner").fileID, inner.fileID);
  EXPECT_EQ(see("folder/..").fileID, file("."));
  EXPECT_EQ(see("../alias/folder/inner").fileID, inner.fileID);
  EXPECT_EQ(findFile(doc.fileID), "doc");
  EXPECT_EQ(findFile(inner.fileID), "folder/inner");
}

}  // namespace
}  // namespace mirabel
