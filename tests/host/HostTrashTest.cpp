#include <functional>
#include <future>
#include <gtest/gtest.h>

#include "host/LocalDocuments.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

class HostTrashTest : public ::testing::Test {
 protected:
  HostTrashTest() {
    for (const char* folder : {"folder", "target", "trashed"})
      home.makeFolder(folder);
    home.writeFile("folder/doc.txt", "text");
    documents = LocalDocuments::open({.home = home.path()}).value();
  }
  std::string idOf(const std::string& name) const {
    return documents->itemAtPath(home.at(name))->itemIdentifier;
  }
  using Begin = std::function<void(Documents::ItemHandler)>;
  static Documents::ItemResult done(const Begin& begin) {
    std::promise<Documents::ItemResult> answer;
    begin([&](Documents::ItemResult result) { answer.set_value(std::move(result)); });
    return answer.get_future().get();
  }
  void trash(const std::string& identifier) {
    ASSERT_TRUE(done([&](auto handler) { documents->trash(identifier, handler); }));
  }

  TempHome home;
  std::unique_ptr<LocalDocuments> documents;
};

TEST_F(HostTrashTest, AParentThatCanNotBeUsedIsIgnoredForWhereTheItemCameFrom) {
  const std::string doc = idOf("folder/doc.txt"), trashed = idOf("trashed");
  trash(trashed);
  const std::pair<std::string, std::string> places[] = {{"fid=12345", "folder/doc.txt"},
                                                        {trashed, "folder/doc.txt"},
                                                        {"nonsense", "folder/doc.txt"},
                                                        {idOf("target"), "target/doc.txt"}};
  for (const auto& [parent, place] : places) {
    trash(doc);
    const auto restored = done([&](auto handler) { documents->restore(doc, parent, handler); });
    ASSERT_TRUE(restored) << parent << " " << restored.error().description();
    EXPECT_EQ(restored->path, home.at(place)) << parent;
  }
}

}  // namespace
}  // namespace mirabel::testing
