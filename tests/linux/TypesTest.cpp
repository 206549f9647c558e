#include <algorithm>
#include <gio/gio.h>
#include <gtest/gtest.h>
#include <iterator>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <vector>

#include "linux/files/NamePatterns.h"
#include "linux/files/TypeTable.h"

namespace mirabel::testing {
namespace {

std::string typeInDatabase(const std::string& name) {
  char* type = g_content_type_guess(name.c_str(), nullptr, 0, nullptr);
  std::string result = type;
  g_free(type);
  return result;
}

ObjectStatus fileStatus(FileKind kind, std::uint16_t mode = S_IFREG) {
  ObjectStatus status;
  status.kind = kind;
  status.mode = mode;
  return status;
}

// What was kept for one name must never be answered for another whose type differs, whichever of
// them came first.
TEST(TypesByName, AreWhatTheDatabaseSaysInAnyOrder) {
  // Parted by spaces.
  std::istringstream list(
      "a.txt b.TXT x.C x.c a.gz a.tar.gz A.TAR.GZ a.svg.gz a.b.12.jpg Makefile makefile.am x.am "
      "core core.txt x.core README readme.pdf x.readme notes.txt~ x~ x.txt,v x,v man.1 lib.so "
      "lib.so.6 lib.so.6.1 x.6 a.7z.001 b.001 123.vdr 12.vdr x.vdr .bashrc .txt a. a..txt "
      "noextension \xff\xfe.pdf caf\xc3\x89.PDF x.\xff x.anim3 x.anim copying CMakeLists.txt "
      "letter.quill x.unknown-ending");
  std::vector<std::string> names{std::istream_iterator<std::string>(list), {}};
  names.push_back(std::string(250, 'n') + ".jpg");
  names.push_back("a." + std::string(200, 'e'));
  for (int order = 0; order < 2; ++order, std::ranges::reverse(names)) {
    TypeTable types;
    for (int time = 0; time < 2; ++time) {
      for (const std::string& name : names) {
        EXPECT_EQ(types.typeOf(name, fileStatus(FileKind::regular)), typeInDatabase(name)) << name;
      }
    }
  }
}

TEST(TypesByName, EndingsWithoutBoundAreForgottenNotMistaken) {
  TypeTable types;
  for (int i = 0; i < 10'000; ++i) {
    const std::string name = "x.unknown" + std::to_string(i);
    ASSERT_EQ(types.typeOf(name, fileStatus(FileKind::regular)), "application/octet-stream");
  }
  EXPECT_EQ(types.typeOf("a.txt", fileStatus(FileKind::regular)), "text/plain");
}

TEST(TypesByKind, ComeBeforeNamesUnlessAFolderIsAPackage) {
  TypeTable types;
  const std::pair<ObjectStatus, std::string_view> kinds[] = {
      {fileStatus(FileKind::folder, S_IFDIR), "inode/directory"},
      {fileStatus(FileKind::symbolicLink, S_IFLNK), "inode/symlink"},
      {fileStatus(FileKind::other, S_IFIFO), "inode/fifo"},
      {fileStatus(FileKind::other, S_IFSOCK), "inode/socket"},
      {fileStatus(FileKind::other, S_IFCHR), "inode/chardevice"},
      {fileStatus(FileKind::other, S_IFBLK), "inode/blockdevice"}};
  for (const auto& [status, type] : kinds)
    EXPECT_EQ(types.typeOf("a.txt", status), type);
  const std::pair<std::string_view, std::string_view> folders[] = {
      {"a.quill", "com.norvane.quillsuite.document"},
      {"a.QuillSheet", "com.norvane.quillsuite.spreadsheet"},
      {"a.quilldeck", "com.norvane.quillsuite.presentation"},
      {"a.lumenbeat", "com.norvane.lumenbeat.project"},
      {"a.lumenband", "com.norvane.lumenbeat.band"},
      {"\xff.package", "com.norvane.package"},
      {".hidden.quill", "com.norvane.quillsuite.document"}};
  for (const auto& [name, type] : folders)
    EXPECT_EQ(types.typeOf(name, kinds[0].first), type) << name;
  for (const std::string_view name : {".quill", "quill", "a.quill.d", "a.quills", "a.", ""})
    EXPECT_EQ(types.typeOf(name, kinds[0].first), "inode/directory") << name;
}

// What a database holds that this machine's does not.
TEST(NamePatterns, NamesWhoseTypeHangsOnMoreThanTheirEndingAreKnown) {
  NamePatterns patterns;
  for (const char* pattern : {"*.txt", "*.[1-9]", "*.tar.gz", "Make", "read*", "*,v", "*.so.[0-9]*",
                              "[0-9]x.dat", "*.x?z", ""}) {
    patterns.add(pattern);
  }
  for (const char* name : {"MAKE", "Readme.txt", "a.txt,V", "lib.so.1.2", "a.x.z"}) {
    EXPECT_TRUE(patterns.needsWholeName(name)) << name;
  }
  for (const char* name : {"a.txt", "makes", "a.1", "bread.txt"}) {
    EXPECT_FALSE(patterns.needsWholeName(name)) << name;
  }
  EXPECT_TRUE(patterns.isAmbiguousEnding(".GZ"));
  EXPECT_TRUE(patterns.isAmbiguousEnding(".dat"));
  EXPECT_FALSE(patterns.isAmbiguousEnding(".txt"));
  patterns.add("*.[!a]");  // a dot is not an "a"
  EXPECT_TRUE(patterns.needsWholeName("a.txt"));
  EXPECT_FALSE(patterns.needsWholeName("plain"));
  patterns.add("[a-z]?");
  EXPECT_TRUE(patterns.needsWholeName("plain"));
}

}  // namespace
}  // namespace mirabel::testing
