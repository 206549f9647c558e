#include <cerrno>

#include "fs/LinkNames.h"
#include "support/ItemsFixture.h"

namespace mirabel::testing {
namespace {

class LinkNamesTest : public ItemsFixture {
 protected:
  using Depth = LinkNames::Depth;

  LinkNamesTest() {
    fake.install("org.example.draw", "/apps/draw", "Draw");
    for (const char* folder : {"a", "b", "b/c", ".hidden", "pack.bundle", ".Trash", ".Trash/t"})
      fake.volume.makeFolder(fake.path(folder));
  }

  std::string absolute(std::string_view name) const {
    return name.starts_with('/') ? std::string(name) : fake.path(name);
  }
  /// Where the container shows the object that was looked up under the first of its names.
  std::string shown(const std::vector<URL>& folders, Depth depth,
                    const std::vector<std::string_view>& names) {
    fake.volume.writeFile(absolute(names.front()));
    for (std::size_t i = 1; i < names.size(); ++i)
      fake.volume.link(absolute(names.front()), absolute(names[i]));
    const HiddenTest hidden(folders, fake.platform().resources);
    LinkNames links(context, folders, depth, hidden);
    const auto name = links.shownName(URL::fileURL(absolute(names.front()))).value();
    // A listing that comes by each of the names hands over that one and no other.
    for (const std::string_view each : names) {
      const URL entry = URL::fileURL(absolute(each));
      const bool isListed =
          !hidden.isHidden(entry) &&
          (depth == Depth::everything || entry.deletingLastPathComponent() == folders.front());
      if (!isListed) continue;
      EXPECT_EQ(links.isShownElsewhere(entry).value(), name != entry) << each;
    }
    for (const std::string_view each : names)
      fake.volume.remove(absolute(each));
    return name ? name->path() : "";
  }
};

TEST_F(LinkNamesTest, TheSmallestPathThatIsListedIsShown) {
  const URL library = URL::fileURL("/apps/draw/Documents");
  struct Case {
    std::string_view container;  ///< "" for everything
    std::vector<std::string_view> names;
    std::string_view shown;
  };
  const Case cases[] = {
      {"", {"b/x", "a/y"}, "a/y"},
      {"", {"b/x", "b.txt"}, "b.txt"},  // "." is less than "/"
      {"", {"b/c/x", "b/x"}, "b/c/x"},
      {"", {".hidden/x", "a/.x", "a/Inbox", "pack.bundle/x", "b/x"}, "b/x"},
      {"", {".hidden/x", "a/.x"}, ""},
      {"", {".Trash/x", "b/x"}, "b/x"},
      {"", {".Trash/x", ".Trash/t/a", ".Trash/y"}, ".Trash/x"},
      {"", {"/apps/draw/Documents/x", "b/x"}, "b/x"},
      {"", {"/apps/draw/Documents/x", ".Trash/x"}, "/apps/draw/Documents/x"},
      {"", {"/elsewhere", "b/x"}, "b/x"},
      {"", {"b/x"}, "b/x"},
      {"b", {"a/x", "b/z", "b/y", "b/c/a", "b/.a"}, "b/y"},
      {"b", {"a/x", "b/c/a"}, ""},
      {".hidden", {"a/x", ".hidden/x"}, ".hidden/x"},
      {".Trash", {"a/x", ".Trash/x"}, ".Trash/x"},
  };
  for (const Case& c : cases) {
    const bool isEverything = c.container.empty();
    const std::vector<URL> folders =
        isEverything ? std::vector{library, fake.url()} : std::vector{fake.url(c.container)};
    const std::string expected = c.shown.empty() ? "" : absolute(c.shown);
    EXPECT_EQ(shown(folders, isEverything ? Depth::everything : Depth::children, c.names), expected)
        << c.container << ": " << c.names.front();
  }
}

TEST_F(LinkNamesTest, FilesOfOneNameAreNotAskedFor) {
  fake.volume.writeFile(fake.path("a/x"));
  const HiddenTest hidden({fake.url()}, fake.platform().resources);
  LinkNames links(context, {fake.url()}, Depth::everything, hidden);
  for (const char* name : {"a/x", "a", "missing"})
    EXPECT_FALSE(links.isShownElsewhere(fake.url(name)).value()) << name;
  EXPECT_EQ(fake.faults.calls(Op::pathsOfFileID), 0U);
}

TEST_F(LinkNamesTest, NamesThatCannotBeToldAreAnError) {
  fake.volume.writeFile(fake.path("a/x"));
  fake.volume.link(fake.path("a/x"), fake.path("b/x"));
  const HiddenTest hidden({fake.url()}, fake.platform().resources);
  LinkNames links(context, {fake.url()}, Depth::everything, hidden);
  fake.faults.fail(Op::pathsOfFileID, Error::posix(EIO), 1, 2);
  EXPECT_TRUE(links.isShownElsewhere(fake.url("a/x")).error().isPosix(EIO));
  EXPECT_TRUE(links.shownName(fake.url("a/x")).error().isPosix(EIO));
}

}  // namespace
}  // namespace mirabel::testing
