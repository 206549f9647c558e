#include <filesystem>
#include <functional>
#include <set>
#include <utility>
#include <vector>

#include "linux/VolumeFixture.h"

namespace mirabel {
namespace {

// Ways in which a document "doc.txt" changes while nobody looks, and where it is then.
class DocumentIdentity : public VolumeFixture, public ::testing::WithParamInterface<int> {
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
        {"linked to a backup, temporary renamed over it",
         [this] {
           link("doc.txt", "doc.txt~");
           saveOver("doc.tmp");
           return "doc.txt";
         }},
        {"saved over in a folder that was renamed",
         [this] {
           rename("doc.txt", "folder/doc.txt");
           see("folder/doc.txt");
           close();
           rename("folder", "renamed");
           write("renamed/tmp", "new");
           rename("renamed/tmp", "renamed/doc.txt");
           return "renamed/doc.txt";
         }},
        {"moved into a folder that takes its name",
         [this] {
           makeFolder("new");
           rename("doc.txt", "new/doc.txt");
           rename("new", "doc.txt");
           return "doc.txt/doc.txt";
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

INSTANTIATE_TEST_SUITE_P(FirstLook, DocumentIdentity, ::testing::Range(0, 4));

}  // namespace
}  // namespace mirabel
