#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "provider/Lines.h"
#include "provider/TrashPlaces.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;

TEST(TrashPlacesTest, TrashFolderLiesInTheFirstFolderNamedDocuments) {
  const std::pair<const char*, const char*> cases[] = {
      {"/a/Documents/x", "/a/Documents/.Trash"},
      {"/a/Documents/Sub/Documents/x", "/a/Documents/.Trash"},
      {"/Documents", "/Documents/.Trash"},
      {"/a/Documents/.Trash/x", "/a/Documents/.Trash"},
      {"/a/MyDocuments/Documents/x", "/a/MyDocuments/Documents/.Trash"},
      {"/a/100%\n/Documents/x", "/a/100%\n/Documents/.Trash"},
      {"/a/documents/Documents2/x", nullptr},
      {"/a", nullptr},
      {"/", nullptr},
  };
  for (const auto& [item, trash] : cases) {
    LogCapture log;
    const auto folder = trashFolderFor(URL::fileURL(item));
    if (trash != nullptr) {
      EXPECT_EQ(folder, URL::fileURL(trash)) << item;
      continue;
    }
    ASSERT_FALSE(folder) << item;
    EXPECT_EQ(folder.error(), Error::invalidParameter("sourceURL", "file://" + std::string(item)));
    EXPECT_THAT(log.lines(), ElementsAre(error("no Documents directory found in path \"" +
                                               std::string(item) + "\"")));
  }
}

TEST(TrashPlacesTest, PutBackStringIsThePathBehindTheLibrary) {
  struct Case {
    const char* item;
    const char* root;
    std::optional<std::string> string;
  };
  const Case cases[] = {
      {"/apps/draw/Documents/Notes/a.txt", "/apps/draw/Documents", "Notes/a.txt"},
      {"/apps/draw/Documents/a.txt", "/apps/draw/Documents", "a.txt"},
      {"/apps/draw/Documents/new\nline/100%", "/apps/draw/Documents", "new\nline/100%"},
      {"/private/var/draw/Documents/a", "/var/draw/Documents", "a"},
      {"/apps/draw/Documents", "/apps/draw/Documents", ""},
      {"/apps/draw/Documents2/a", "/apps/draw/Documents", std::nullopt},
      {"/apps/draw", "/apps/draw/Documents", std::nullopt},
      {"/home/me/Documents/a", "/apps/draw/Documents", std::nullopt},
  };
  for (const Case& c : cases)
    EXPECT_EQ(putBackString(URL::fileURL(c.item), URL::fileURL(c.root)), c.string) << c.item;
}

}  // namespace
}  // namespace mirabel::testing
