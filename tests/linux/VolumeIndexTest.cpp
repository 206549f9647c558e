#include <filesystem>
#include <map>
#include <set>

#include "linux/VolumeFixture.h"
#include "linux/volume/IdentityStore.h"

namespace mirabel {
namespace {

using VolumeIndexTest = VolumeFixture;

TEST_F(VolumeIndexTest, LookingBetweenTheStepsOfASaveChangesNothing) {
  write("doc.txt");
  const std::uint32_t document = this->document("doc.txt");
  rename("doc.txt", "doc.txt.bak");
  EXPECT_EQ(findDocument(document), "doc.txt.bak");
  write("doc.txt", "new");
  list();
  EXPECT_EQ(this->document("doc.txt"), document);
  EXPECT_NE(this->document("doc.txt.bak"), document);

  // A backup that is renamed back was no backup; one that moved on hands nothing over.
  const std::uint32_t backup = this->document("doc.txt.bak");
  rename("doc.txt.bak", "doc.txt.bak.old");
  list();
  rename("doc.txt.bak.old", "elsewhere");
  list();
  write("doc.txt.bak", "unrelated");
  list();
  EXPECT_EQ(this->document("elsewhere"), backup);
  EXPECT_NE(this->document("doc.txt.bak"), backup);
}

TEST_F(VolumeIndexTest, ExchangedDocumentsGoWithTheirFiles) {
  write("a");
  write("b");
  write("c");
  const auto a = see("a"), b = see("b"), c = see("c");
  close();
  exchange("a", "b");
  exchange("b", "c");  // now a: b's, b: c's, c: a's
  list();
  EXPECT_EQ(document("c"), a.documentID);
  EXPECT_EQ(document("a"), b.documentID);
  EXPECT_EQ(document("b"), c.documentID);
  EXPECT_EQ(findFile(a.fileID), "c");
}

TEST_F(VolumeIndexTest, AReusedInodeNumberIsANewThing) {
  std::set<std::uint64_t> files;
  std::set<std::uint32_t> documents;
  int reused = 0;
  std::uint64_t last = 0;
  for (int round = 0; round < 50; ++round) {
    const std::string name = "f" + std::to_string(round);
    const std::string folder = "d" + std::to_string(round);
    write(name);
    makeFolder(folder);
    reused += inode(name) == last ? 1 : 0;
    last = inode(name);
    const Sighting seen = see(name);
    const std::uint64_t folderID = file(folder);
    EXPECT_TRUE(files.insert(seen.fileID).second);
    EXPECT_TRUE(files.insert(folderID).second);
    EXPECT_TRUE(documents.insert(seen.documentID).second);
    if (round % 7 == 0) close();
    remove(name);
    remove(folder);
    // The number's next holder must not be found under the old identity.
    write("next" + name);
    makeFolder("next" + folder);
    if (round % 2 == 0) list();
    EXPECT_EQ(findFile(seen.fileID), "");
    EXPECT_EQ(findFile(folderID), "");
    EXPECT_EQ(findDocument(seen.documentID), "");
    remove("next" + name);
    remove("next" + folder);
  }
  RecordProperty("reused", reused);
}

TEST_F(VolumeIndexTest, KindsHaveTheIdentityThatFitsThem) {
  makeFolder("plain");
  makeFolder("thing.package");
  write("thing.package/inner");
  std::filesystem::create_symlink("nowhere", path("broken"));
  ASSERT_EQ(::mkfifo(path("fifo").c_str(), 0600), 0);
  EXPECT_EQ(document("plain"), 0u);
  EXPECT_EQ(document("broken"), 0u);
  EXPECT_EQ(document("fifo"), 0u);
  const std::uint32_t package = document("thing.package");
  EXPECT_NE(package, 0u);

  // A package that stops being one loses its document ID, and gets it back with its suffix.
  const std::uint64_t fileID = file("thing.package");
  rename("thing.package", "thing");
  EXPECT_EQ(document("thing"), 0u);
  EXPECT_EQ(findDocument(package), "");
  EXPECT_EQ(file("thing"), fileID);
  rename("thing", "other.package");
  EXPECT_EQ(document("other.package"), package);

  // A file in the place of a package is no save of it.
  remove("other.package");
  write("other.package");
  EXPECT_NE(document("other.package"), package);
}

TEST_F(VolumeIndexTest, AHardLinkedFileIsOneThingAsLongAsItHasAName) {
  makeFolder("folder");
  write("a");
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
  write("tmp", "new");
  rename("tmp", "c");
  list();
  EXPECT_EQ(document("folder/b"), a.documentID);
  EXPECT_NE(document("c"), a.documentID);
  // A save over the last of its names takes the document over.
  link("folder/b", "folder/d");
  list("folder");
  remove("folder/d");
  write("tmp", "new");
  rename("tmp", "folder/b");
  list("folder");
  EXPECT_EQ(findDocument(a.documentID), "folder/b");
}

// Making room for the further name moves a document onto another name of the same file.
TEST_F(VolumeIndexTest, ALinkThatTakesTheNameOfADocumentWhichTookALinkKeepsBothApart) {
  write(".file");
  see(".file");
  link(".file", "b");
  write("f");
  see("f");
  const std::uint32_t document = this->document("b");
  rename("f", "b");
  link(".file", "f");
  const std::uint32_t linked = this->document("f");
  EXPECT_NE(linked, document);
  EXPECT_EQ(this->document(".file"), linked);
  EXPECT_EQ(findDocument(document), "b");
}

TEST_F(VolumeIndexTest, ListingWhatIsKnownWritesNothing) {
  write("a");
  link("a", "b");
  makeFolder("folder");
  link("a", "folder/c");
  age_ = 1'000'000'000;
  list();
  list("folder");
  close();
  const auto written = [this] {
    for (const auto& entry : std::filesystem::recursive_directory_iterator(state_)) {
      if (entry.path().filename() == "witness") return entry.last_write_time();
    }
    return std::filesystem::file_time_type();
  };
  const auto before = written();
  list();
  list("folder");
  close();
  EXPECT_EQ(written(), before);
}

TEST_F(VolumeIndexTest, AThingThatLeavesTheRootsAndComesBackIsItself) {
  write("doc");
  makeFolder("folder/sub");
  const Sighting doc = see("doc");
  const std::uint64_t sub = file("folder/sub");
  std::filesystem::rename(path("doc"), base_ + "/outside");
  std::filesystem::rename(path("folder"), base_ + "/folder");
  EXPECT_EQ(findDocument(doc.documentID), "");
  EXPECT_EQ(findFile(sub), "");
  close();
  std::filesystem::rename(base_ + "/outside", path("again"));
  std::filesystem::rename(base_ + "/folder", path("moved"));
  EXPECT_EQ(document("again"), doc.documentID);
  EXPECT_EQ(findFile(sub), "moved/sub");
}

TEST_F(VolumeIndexTest, DeepAndUnusualNamesAreFoundAgain) {
  const std::vector<std::string> names = {std::string(255, 'n'),
                                          "\xff\xfe not text",
                                          "new\nline",
                                          "=",
                                          "#",
                                          "fid=3",
                                          " ",
                                          "%41",
                                          "a\\b"};
  std::map<std::string, std::uint32_t> documents;
  for (const std::string& name : names)
    write(name);
  for (const Sighting& sighting : list())
    documents[sighting.name] = sighting.documentID;
  ASSERT_EQ(documents.size(), names.size());
  close();
  for (const auto& [name, id] : documents)
    EXPECT_EQ(findDocument(id), name);
  EXPECT_EQ(statusOf(path("missing")).error().code, ENOENT);
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
  makeFolder("folder");
  for (const auto& [name, id] : documents) {
    write("tmp", "new");
    rename("tmp", name);
  }
  write("folder/unrelated");
  list("folder");
  EXPECT_EQ(findDocument(documents["doc7"]), "doc7");
  list();
  for (const auto& [name, id] : documents)
    EXPECT_EQ(document(name), id) << name;
}

TEST_F(VolumeIndexTest, ABackupThatIsKeptAndReplacedLeavesTheDocumentWithItsName) {
  write("doc");
  const std::uint32_t document = this->document("doc");
  rename("doc", "doc~");
  write("doc", "new");
  list();
  const std::uint32_t backup = this->document("doc~");
  EXPECT_NE(backup, document);
  for (const char* first : {"doc~", "doc"}) {
    rename("doc", "doc~");
    write("doc", "newer");
    see(first);
    EXPECT_EQ(findDocument(document), "doc") << first;
    EXPECT_EQ(this->document("doc~"), backup) << first;
  }
}

TEST_F(VolumeIndexTest, AnotherWayToAPlaceIsTheSamePlace) {
  makeFolder("folder");
  write("doc");
  write("folder/inner");
  const Sighting doc = see("doc"), inner = see("folder/inner");
  EXPECT_EQ(see("folder/../doc").fileID, doc.fileID);
  EXPECT_EQ(see("folder/./inner").fileID, inner.fileID);
  EXPECT_EQ(see("folder/..").fileID, file("."));
  std::filesystem::create_directory_symlink(documents_, base_ + "/alias");
  EXPECT_EQ(see("../alias/folder/inner").fileID, inner.fileID);
  EXPECT_EQ(findFile(doc.fileID), "doc");
  EXPECT_EQ(findFile(inner.fileID), "folder/inner");
}

}  // namespace
}  // namespace mirabel
