#include <filesystem>
#include <set>
#include <string>
#include <utility>

#include "linux/VolumeFixture.h"

namespace mirabel {
namespace {

class DocumentIdentity : public VolumeFixture, public ::testing::WithParamInterface<int> {};

// Ways in which a document "doc.txt" changes while nobody looks, and where it is then.
constexpr std::pair<const char*, const char*> changes[] = {
    {"mv doc.txt other.txt", "other.txt"},
    {"mv doc.txt folder/doc.txt", "folder/doc.txt"},
    {"mv doc.txt .Trash/doc.txt", ".Trash/doc.txt"},
    {"mv doc.txt folder/doc.txt; mv folder renamed", "renamed/doc.txt"},
    {"write doc.tmp; mv doc.tmp doc.txt", "doc.txt"},
    {"write .doc.swp; mv .doc.swp doc.txt", "doc.txt"},
    {"mv doc.txt doc.txt~; write doc.txt", "doc.txt"},
    {"mv doc.txt doc.txt~; write doc.txt; rm doc.txt~", "doc.txt"},
    {"write new; mv doc.txt .doc.txt.1; mv new doc.txt", "doc.txt"},
    {"rm doc.txt; write doc.txt", "doc.txt"},
    {"write doc.tmp; swap doc.tmp doc.txt; rm doc.tmp", "doc.txt"},
    {"write doc.txt new", "doc.txt"},
    {"mv doc.txt folder/kept.txt; write doc.txt", "folder/kept.txt"},
    {"write a.tmp; mv a.tmp doc.txt; write b.tmp; mv b.tmp doc.txt", "doc.txt"},
    {"ln doc.txt doc.txt~; write doc.tmp; mv doc.tmp doc.txt", "doc.txt"},
    {"mv doc.txt folder/doc.txt; look folder/doc.txt; close; mv folder renamed; write renamed/tmp; "
     "mv renamed/tmp renamed/doc.txt",
     "renamed/doc.txt"},
    {"mkdir new; mv doc.txt new/doc.txt; mv new doc.txt", "doc.txt/doc.txt"},
};

// The first look after the change may be a listing, a look at the new place, a search for the
// document, or a search for the object that held it: the answer is the same.
TEST_P(DocumentIdentity, LastsThroughEveryWayOfSavingAndMoving) {
  for (const auto& [change, result] : changes) {
    SCOPED_TRACE(change);
    run("mkdir folder; mkdir .Trash; write doc.txt old; write bystander.txt");
    list();
    const Sighting before = see("doc.txt");
    const std::uint32_t bystander = document("bystander.txt");
    ASSERT_NE(before.documentID, 0u);
    close();

    run(change);
    const std::string folder = std::filesystem::path(result).parent_path();
    if (GetParam() == 0) list(folder);
    if (GetParam() == 1) see(result);
    if (GetParam() == 3) findFile(before.fileID);
    EXPECT_EQ(findDocument(before.documentID), result);
    EXPECT_EQ(document(result), before.documentID);
    // Nothing else has it, whatever was looked at, and others keep theirs.
    std::set<std::uint32_t> seen;
    for (const std::string& place : std::set<std::string>{"", folder}) {
      for (const Sighting& sighting : list(place)) {
        if (sighting.documentID == 0) continue;
        EXPECT_TRUE(seen.insert(sighting.documentID).second) << sighting.name;
      }
    }
    EXPECT_EQ(document("bystander.txt"), bystander);
    close();
    EXPECT_EQ(document(result), before.documentID);
    for (const auto& entry : std::filesystem::directory_iterator(documents_))
      std::filesystem::remove_all(entry);
  }
}

INSTANTIATE_TEST_SUITE_P(FirstLook, DocumentIdentity, ::testing::Range(0, 4));

}  // namespace
}  // namespace mirabel
