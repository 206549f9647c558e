#include <algorithm>
#include <filesystem>
#include <functional>
#include <map>
#include <random>
#include <set>

#include "linux/VolumeFixture.h"
#include "linux/volume/IdentityStore.h"

namespace mirabel {
namespace {

using VolumeIndexTest = VolumeFixture;

// One way in which a document "doc.txt" changes while nobody looks, and where it is then.
struct Change {
  const char* name;
  std::function<void(const VolumeFixture&)> make;
  const char* result;
};

class DocumentIdentity : public VolumeFixture, public testing::WithParamInterface<int> {
 protected:
  void saveOver(const char* temporary) const {
    write(temporary, "new");
    rename(temporary, "doc.txt");
  }
  std::vector<std::pair<const char*, std::function<std::string()>>> changes() {
    return {
        {"renamed",
         [this] {
           rename("doc.txt", "other.txt");
           return "other.txt";
         }},
        {"moved",
         [this] {
           rename("doc.txt", "folder/doc.txt");
           return "folder/doc.txt";
         }},
        {"trashed by hand",
         [this] {
           rename("doc.txt", ".Trash/doc.txt");
           return ".Trash/doc.txt";
         }},
        {"its folder renamed",
         [this] {
           rename("doc.txt", "folder/doc.txt");
           rename("folder", "renamed");
           return "renamed/doc.txt";
         }},
        {"temporary renamed over it",
         [this] {
           saveOver("doc.tmp");
           return "doc.txt";
         }},
        {"hidden temporary renamed over it",
         [this] {
           saveOver(".doc.swp");
           return "doc.txt";
         }},
        {"renamed to a backup, written anew",
         [this] {
           rename("doc.txt", "doc.txt~");
           write("doc.txt", "new");
           return "doc.txt";
         }},
        {"renamed to a backup, written anew, backup removed",
         [this] {
           rename("doc.txt", "doc.txt~");
           write("doc.txt", "new");
           remove("doc.txt~");
           return "doc.txt";
         }},
        {"renamed to a hidden backup, temporary renamed to it",
         [this] {
           write("new", "new");
           rename("doc.txt", ".doc.txt.1");
           rename("new", "doc.txt");
           return "doc.txt";
         }},
        {"removed first, then written anew",
         [this] {
           remove("doc.txt");
           write("doc.txt", "new");
           return "doc.txt";
         }},
        {"exchanged with a temporary that is then removed",
         [this] {
           write("doc.tmp", "new");
           exchange("doc.tmp", "doc.txt");
           remove("doc.tmp");
           return "doc.txt";
         }},
        {"truncated and written in place",
         [this] {
           write("doc.txt", "new");
           return "doc.txt";
         }},
        {"moved away while a new file takes its name",
         [this] {
           rename("doc.txt", "folder/kept.txt");
           write("doc.txt", "another");
           return "folder/kept.txt";
         }},
        {"saved over twice",
         [this] {
           saveOver("a.tmp");
           saveOver("b.tmp");
           return "doc.txt";
         }},
    };
  }
};

// The first look after the change may be a listing, a look at the new place, a search for the
// document, or a search for the object that held it: the answer is the same.
TEST_P(DocumentIdentity, LastsThroughEveryWayOfSavingAndMoving) {
  const auto all = changes();
  for (const auto& [name, change] : all) {
    SCOPED_TRACE(name);
    makeFolder("folder");
    makeFolder(".Trash");
    write("doc.txt", "old");
    write("bystander.txt");
    list();
    const Sighting before = see("doc.txt");
    const std::uint32_t bystander = document("bystander.txt");
    ASSERT_NE(before.documentID, 0u);
    close();

    const std::string result = change();
    const std::string folder = std::filesystem::path(result).parent_path();
    switch (GetParam()) {
      case 0:
        list(folder);
        break;
      case 1:
        see(result);
        break;
      case 2:
        break;
      default:
        findFile(before.fileID);
    }
    EXPECT_EQ(findDocument(before.documentID), result);
    EXPECT_EQ(document(result), before.documentID);
    // Nothing else has it, whatever was looked at, and others keep theirs.
    std::set<std::uint32_t> seen;
    for (const std::string& place : {std::string(), folder}) {
      for (const Sighting& sighting : list(place)) {
        if (sighting.documentID == 0 || (place == folder && folder.empty())) continue;
        EXPECT_TRUE(seen.insert(sighting.documentID).second) << sighting.name;
      }
    }
    EXPECT_EQ(document("bystander.txt"), bystander);
    close();
    EXPECT_EQ(document(result), before.documentID);
    for (const auto& entry : std::filesystem::directory_iterator(documents_)) {
      std::filesystem::remove_all(entry);
    }
  }
}

INSTANTIATE_TEST_SUITE_P(FirstLook, DocumentIdentity, testing::Range(0, 4));

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
  remove("folder/b");
  EXPECT_EQ(findDocument(a.documentID), "");
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

// Random changes, now and then looked at in part; the document goes where its bytes went. Files
// are only created under fresh names, so that no save is mistaken for a move.
TEST_F(VolumeIndexTest, RandomMovesNeverLoseOrMixIdentities) {
  const unsigned seed = std::random_device{}();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937 random(seed);
  const auto pick = [&](std::size_t n) { return random() % n; };
  std::vector<std::string> folders = {""};
  std::map<std::string, std::uint32_t> model;  // relative path -> document
  int fresh = 0;
  const auto join = [](const std::string& folder, const std::string& name) {
    return folder.empty() ? name : folder + "/" + name;
  };
  for (int step = 0; step < 400; ++step) {
    const auto any = [&] { return std::next(model.begin(), pick(model.size())); };
    switch (pick(7)) {
      case 0:
      case 1: {
        const std::string name = join(folders[pick(folders.size())], "f" + std::to_string(fresh++));
        write(name);
        model[name] = document(name);
        break;
      }
      case 2:
        if (folders.size() < 12) {
          folders.push_back(join(folders[pick(folders.size())], "d" + std::to_string(fresh++)));
          makeFolder(folders.back());
        }
        break;
      case 3: {
        if (model.empty()) break;
        const auto from = any();
        const std::string to = join(folders[pick(folders.size())], "m" + std::to_string(fresh++));
        rename(from->first, to);
        model[to] = from->second;
        model.erase(from);
        break;
      }
      case 4: {
        if (model.size() < 2) break;
        const auto a = any(), b = any();
        if (a == b) break;
        exchange(a->first, b->first);
        std::swap(a->second, b->second);
        // Looked at before one of them can go: unseen, that would have been a save.
        EXPECT_EQ(document(a->first), a->second);
        break;
      }
      case 5: {
        if (model.empty()) break;
        const auto gone = any();
        remove(gone->first);
        EXPECT_EQ(findDocument(gone->second), "");
        model.erase(gone);
        break;
      }
      default:
        if (pick(3) == 0) close();
        list(folders[pick(folders.size())]);
    }
  }
  for (const auto& [name, id] : model) {
    if (pick(2) == 0) {
      EXPECT_EQ(document(name), id) << name;
    } else {
      EXPECT_EQ(findDocument(id), name);
    }
  }
}

}  // namespace
}  // namespace mirabel
