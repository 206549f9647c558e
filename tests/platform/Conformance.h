#pragma once

#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ConformanceFixture.h"

namespace mirabel::testing {

TEST_P(PlatformConformance, FileIDStaysThroughRenamesAndIsNeverGivenAgain) {
  volume->makeFolder("folder");
  volume->writeFile("folder/a", "1");
  const std::uint64_t folder = fileID("folder");
  const std::uint64_t file = fileID("folder/a");
  EXPECT_NE(folder, file);

  volume->rename("folder", "moved");
  volume->rename("moved/a", "b");
  EXPECT_EQ(fileID("moved"), folder);
  EXPECT_EQ(fileID("b"), file);
  EXPECT_EQ(pathOf(folder).value(), at("moved").path());
  EXPECT_EQ(pathOf(file).value(), at("b").path());

  volume->remove("b");
  volume->writeFile("b", "2");
  EXPECT_NE(fileID("b"), file);
  EXPECT_EQ(posixCode(pathOf(file)), ENOENT);
  EXPECT_EQ(posixCode(pathOf(0)), ENOENT);
  EXPECT_EQ(posixCode(pathOf(~std::uint64_t{0})), ENOENT);
}

TEST_P(PlatformConformance, PathOfFileIDFollowsARenamedParent) {
  volume->makeFolder("a");
  volume->makeFolder("a/b");
  volume->writeFile("a/b/c", "");
  const std::uint64_t file = fileID("a/b/c");
  volume->rename("a", "z");
  EXPECT_EQ(pathOf(file).value(), at("z/b/c").path());
  volume->remove("z");
  EXPECT_EQ(posixCode(pathOf(file)), ENOENT);
}

TEST_P(PlatformConformance, AllNamesOfAHardLinkAreKnownAndStand) {
  volume->makeFolder("folder");
  volume->writeFile("a", "");
  volume->link("a", "folder/b");
  volume->link("a", "c");
  const std::uint64_t file = fileID("a");
  EXPECT_EQ(fileID("folder/b"), file);
  EXPECT_EQ(fileID("c"), file);
  EXPECT_EQ(valuesOf("c").linkCount, 3U);
  EXPECT_EQ(valuesOf("folder").linkCount, 1U);
  EXPECT_THAT(pathsOf(file), ::testing::UnorderedElementsAre(at("a").path(), at("c").path(),
                                                             at("folder/b").path()));
  volume->remove("a");
  volume->rename("folder", "moved");
  fileID("moved");
  EXPECT_THAT(pathsOf(file), ::testing::UnorderedElementsAre(at("c").path(), at("moved/b").path()));
  EXPECT_THAT(pathOf(file).value(), ::testing::AnyOf(at("c").path(), at("moved/b").path()));
  volume->remove("c");
  volume->remove("moved");
  EXPECT_THAT(pathsOf(file), ::testing::IsEmpty());
  EXPECT_THAT(pathsOf(0), ::testing::IsEmpty());

  volume->writeFile("plain", "");
  EXPECT_EQ(valuesOf("plain").linkCount, 1U);
  EXPECT_THAT(pathsOf(fileID("plain")), ::testing::ElementsAre(at("plain").path()));
}

TEST_P(PlatformConformance, DocumentIDIsAllocatedOnceAndFollowsTheDocument) {
  volume->writeFile("a", "1");
  volume->writeFile("other", "1");
  const std::uint32_t before = documentID("a", Allocation::never);
  const std::uint32_t id = documentID("a");
  EXPECT_THAT(before, ::testing::AnyOf(0U, id));  // a platform may allocate at first sight
  EXPECT_NE(id, 0U);
  EXPECT_NE(documentID("other"), id);
  EXPECT_EQ(documentID("a", Allocation::never), id);
  EXPECT_EQ(valuesOf("a").documentID, id);

  const auto object = platform().objects.open(at("a")).value();
  EXPECT_EQ(object->attributes().value().documentID, id);
  EXPECT_EQ(platform().documents.permanentStorage(*object).value(), id);

  volume->rename("a", "b");
  EXPECT_EQ(valuesOf("b").documentID, id);
  EXPECT_EQ(platform().documents.fileIDOfDocument(device(), id).value(), fileID("b"));
}

TEST_P(PlatformConformance, DocumentIDSurvivesAFileRenamedOverIt) {
  volume->writeFile("a", "1");
  const std::uint32_t id = documentID("a");
  const std::uint64_t before = fileID("a");
  volume->writeFile("a.new", "2");
  volume->rename("a.new", "a");
  EXPECT_EQ(documentID("a", Allocation::never), id);
  EXPECT_NE(fileID("a"), before);
  EXPECT_EQ(platform().documents.fileIDOfDocument(device(), id).value(), fileID("a"));
  EXPECT_EQ(posixCode(pathOf(before)), ENOENT);
}

TEST_P(PlatformConformance, UnknownDocumentIDsAreNotFound) {
  volume->writeFile("a", "1");
  const std::uint32_t id = documentID("a");
  volume->remove("a");
  const std::int64_t gone = id;
  for (const std::int64_t unknown :
       {gone, std::int64_t{0}, std::int64_t{-1}, gone + (std::int64_t{1} << 32)}) {
    EXPECT_EQ(posixCode(platform().documents.fileIDOfDocument(device(), unknown)), ENOENT);
  }
}

TEST_P(PlatformConformance, OpenObjectTellsItsKindWithoutFollowingOrBlocking) {
  volume->makeFolder("folder");
  volume->writeFile("file", "");
  volume->makeSymlink("link", "folder");
  volume->makeFifo("fifo");
  const std::pair<std::string_view, FileKind> cases[] = {{"folder", FileKind::folder},
                                                         {"file", FileKind::regular},
                                                         {"link", FileKind::symbolicLink},
                                                         {"fifo", FileKind::other}};
  for (const auto& [name, kind] : cases) {
    const auto object = platform().objects.open(at(name)).value();
    const ObjectAttributes attributes = object->attributes().value();
    EXPECT_EQ(attributes.kind, kind) << name;
    EXPECT_EQ(attributes.fileID, fileID(name)) << name;
    EXPECT_EQ(object->device().value(), device()) << name;
  }
  EXPECT_NE(device(), 0U);
  EXPECT_EQ(posixCode(platform().objects.open(at("missing"))), ENOENT);
}

TEST_P(PlatformConformance, ResourceValuesTellEachKind) {
  const std::string package = volume->packageName();
  volume->makeFolder("folder");
  volume->makeFolder(package);
  volume->writeFile("notes.txt", "12345");
  volume->makeSymlink("link", "notes.txt");
  volume->makeFifo("fifo");

  const ResourceValues file = valuesOf("notes.txt");
  EXPECT_EQ(file.kind, FileKind::regular);
  EXPECT_EQ(file.size, 5U);
  EXPECT_EQ(file.typeIdentifier, "text/plain");
  EXPECT_TRUE(file.isWritable);
  EXPECT_FALSE(file.isPackage);
  EXPECT_TRUE(file.contentModificationDate);

  const ResourceValues folder = valuesOf("folder");
  EXPECT_EQ(folder.kind, FileKind::folder);
  EXPECT_EQ(folder.typeIdentifier, "inode/directory");
  EXPECT_FALSE(folder.isPackage);

  const ResourceValues packageValues = valuesOf(package);
  EXPECT_EQ(packageValues.kind, FileKind::folder);
  EXPECT_TRUE(packageValues.isPackage);
  EXPECT_NE(packageValues.typeIdentifier, "inode/directory");

  EXPECT_EQ(valuesOf("link").kind, FileKind::symbolicLink);
  EXPECT_NE(valuesOf("link").typeIdentifier, "text/plain");
  EXPECT_EQ(valuesOf("fifo").kind, FileKind::other);

  const auto missing = platform().resources.readValues(at("missing"));
  ASSERT_FALSE(missing);
  EXPECT_EQ(missing.error(), Error::file(FileErrorCode::noSuchFile));
}

TEST_P(PlatformConformance, PrefetchTellsWhatSingleReadsTell) {
  volume->makeFolder("folder");
  volume->writeFile("folder/a.txt", "123");
  volume->writeFile("b", "");
  volume->makeSymlink("link", "b");
  volume->makeFifo("fifo");
  ASSERT_TRUE(setAttribute("b", "com.norvane.test", {1}));
  documentID("b");

  const std::string_view names[] = {"folder", "folder/a.txt", "b", "link", "fifo", "missing"};
  std::vector<URL> urls;
  for (const std::string_view name : names)
    urls.push_back(at(name));
  ASSERT_TRUE(platform().resources.prefetch(urls));

  EXPECT_FALSE(urls.back().resources().isFilled());
  urls.pop_back();
  for (const URL& url : urls) {
    const auto cached = url.resources().snapshot();
    const auto single = platform().resources.readValues(URL::fileURL(url.path()));
    ASSERT_TRUE(cached && single) << url.path();
    EXPECT_EQ(cached->kind, single->kind) << url.path();
    EXPECT_EQ(cached->isPackage, single->isPackage) << url.path();
    EXPECT_EQ(cached->isWritable, single->isWritable) << url.path();
    EXPECT_EQ(cached->fileID, single->fileID) << url.path();
    EXPECT_EQ(cached->documentID, single->documentID) << url.path();
    EXPECT_EQ(cached->size, single->size) << url.path();
    EXPECT_EQ(cached->creationDate, single->creationDate) << url.path();
    EXPECT_EQ(cached->contentModificationDate, single->contentModificationDate) << url.path();
    EXPECT_EQ(cached->typeIdentifier, single->typeIdentifier) << url.path();
    EXPECT_EQ(url.resources().hasAttribute("com.norvane.test"), url.lastPathComponent() == "b")
        << url.path();
  }
}

TEST_P(PlatformConformance, AttributesAreReplacedAndRemovedWhole) {
  volume->writeFile("a", "");
  volume->makeFolder("folder");
  constexpr std::string_view name = "com.norvane.metadata:_kMDItemUserTags";
  for (const std::string_view object : {"a", "folder"}) {
    EXPECT_EQ(posixCode(attribute(object, name)), ENODATA);
    for (const Data& value : {Data{1, 2, 3}, Data{}, Data{0}, Data(500, 0xff)}) {
      ASSERT_TRUE(setAttribute(object, name, value));
      EXPECT_EQ(attribute(object, name).value(), value);
    }
    EXPECT_EQ(platform().attributes.names(at(object)).value(),
              std::vector<std::string>{std::string(name)});
    EXPECT_EQ(posixCode(platform().attributes.read(name, at(object), 499)), ERANGE);

    const auto target = platform().attributes.open(at(object)).value();
    EXPECT_TRUE(target->remove(name));
    EXPECT_EQ(posixCode(target->remove(name)), ENODATA);
    EXPECT_EQ(posixCode(attribute(object, name)), ENODATA);
  }
  EXPECT_EQ(posixCode(attribute("missing", name)), ENOENT);
  EXPECT_EQ(posixCode(platform().attributes.open(at("missing"))), ENOENT);
}

TEST_P(PlatformConformance, AttributesGoWithTheFileAndNotThroughALink) {
  volume->writeFile("a", "");
  volume->makeSymlink("link", "a");
  volume->makeFifo("fifo");
  ASSERT_TRUE(setAttribute("a", "com.norvane.test", {1}));
  for (const std::string_view name : {"link", "fifo"}) {
    EXPECT_EQ(posixCode(setAttribute(name, "com.norvane.test", {2})), EPERM) << name;
    EXPECT_FALSE(attribute(name, "com.norvane.test")) << name;
  }
  volume->rename("a", "b");
  EXPECT_EQ(attribute("b", "com.norvane.test").value(), Data{1});
}

TEST_P(PlatformConformance, DirectoryStreamGivesEachNameOnceWithItsKind) {
  const std::string_view files[] = {"plain", ".hidden", "100%", "new\nline", "\xff\xfe bytes"};
  for (const std::string_view name : files)
    volume->writeFile(name, "");
  volume->makeFolder("folder");
  volume->makeSymlink("link", "folder");
  volume->makeFifo("fifo");

  std::vector<std::pair<std::string, FileKind>> expected = {{".", FileKind::folder},
                                                            {"..", FileKind::folder},
                                                            {"folder", FileKind::folder},
                                                            {"link", FileKind::symbolicLink},
                                                            {"fifo", FileKind::other}};
  for (const std::string_view name : files)
    expected.emplace_back(name, FileKind::regular);

  const auto stream = platform().directories.open(at("")).value();
  std::vector<std::pair<std::string, FileKind>> entries;
  while (const auto entry = stream->next())
    entries.emplace_back(entry->name, entry->kind);
  EXPECT_THAT(entries, ::testing::UnorderedElementsAreArray(expected));
  EXPECT_FALSE(stream->next());
  EXPECT_TRUE(stream->close());
}

TEST_P(PlatformConformance, PositionLeadsToWhatAStreamHasNotGiven) {
  volume->makeFolder("folder");
  std::vector<std::string> files = {".", ".."};
  for (int i = 0; i < 300; ++i)
    files.push_back(std::to_string(i) + std::string(40, 'n'));
  for (std::size_t i = 2; i < files.size(); ++i)
    volume->writeFile("folder/" + files[i], "");
  for (const std::size_t taken : {0U, 1U, 2U, 150U, 301U, 302U}) {
    std::vector<std::string> seen;
    auto first = platform().directories.open(at("folder")).value();
    for (std::size_t i = 0; i < taken; ++i)
      seen.emplace_back(first->next().value().name);
    const auto position = first->position();
    if (!position) GTEST_SKIP() << "this file system keeps no positions";
    // Others come, go and change their names in between.
    for (int i = 0; i < 100; ++i)
      volume->writeFile("folder/other" + std::to_string(i), "");
    for (int i = 0; i < 100; i += 2)
      volume->rename("folder/other" + std::to_string(i), "folder/moved" + std::to_string(i));
    for (int i = 1; i < 100; i += 2)
      volume->remove("folder/other" + std::to_string(i));
    const auto second = platform().directories.openAt(at("folder"), *position).value();
    while (const auto entry = second->next())
      if (!entry->name.starts_with("moved")) seen.emplace_back(entry->name);
    EXPECT_THAT(seen, ::testing::UnorderedElementsAreArray(files)) << taken;
    for (int i = 0; i < 100; i += 2)
      volume->remove("folder/moved" + std::to_string(i));
  }
}

TEST_P(PlatformConformance, KeptPositionsOfListingsAreFound) {
  ListingPositions& positions = platform().positions;
  EXPECT_FALSE(positions.find("a", {1}));
  ASSERT_TRUE(positions.keep("a", {1}, {7}));
  ASSERT_TRUE(positions.keep("a", {1}, {8, 0, 255}));
  ASSERT_TRUE(positions.keep("b", {1}, {}));
  EXPECT_EQ(positions.find("a", {1}), (Data{8, 0, 255}));
  EXPECT_EQ(positions.find("b", {1}), Data{});
  EXPECT_FALSE(positions.find("a", {2}));
}

TEST_P(PlatformConformance, DirectoryStreamsOpenFoldersOnly) {
  volume->writeFile("file", "");
  volume->makeFolder("folder");
  volume->makeSymlink("link", "folder");
  EXPECT_EQ(posixCode(platform().directories.open(at("file"))), ENOTDIR);
  EXPECT_EQ(posixCode(platform().directories.open(at("missing"))), ENOENT);
  EXPECT_THAT(posixCode(platform().directories.open(at("link"))), ::testing::AnyOf(ELOOP, ENOTDIR));
}

TEST_P(PlatformConformance, StatusCountsTheEntriesOfAFolder) {
  volume->makeFolder("folder");
  EXPECT_EQ(linkCount("folder"), 2);
  volume->writeFile("folder/a", "");
  volume->makeFolder("folder/b");
  volume->writeFile("folder/.hidden", "");
  EXPECT_EQ(linkCount("folder"), 5);
  EXPECT_EQ(platform().objects.status(at("folder/a")).value().fileID, fileID("folder/a"));
  EXPECT_EQ(posixCode(platform().objects.status(at("missing"))), ENOENT);
}

TEST_P(PlatformConformance, DirectorySizeSumsTheFilesBelowIt) {
  volume->makeFolder("folder");
  volume->makeFolder("folder/deep");
  EXPECT_EQ(platform().sizes.directorySize(at("folder")).value(), 0U);
  volume->writeFile("folder/a", "12345");
  volume->writeFile("folder/deep/b", "123");
  volume->writeFile("outside", "1234567");
  volume->makeSymlink("folder/link", "../outside");
  const std::uint64_t size = platform().sizes.directorySize(at("folder")).value();
  EXPECT_EQ(size, 8U);
  EXPECT_EQ(posixCode(platform().sizes.directorySize(at("missing"))), ENOENT);
}

TEST_P(PlatformConformance, CreateDirectoryMakesWhatIsMissingAndAcceptsWhatIsThere) {
  for (int time = 0; time < 2; ++time) {
    EXPECT_TRUE(platform().operations.createDirectory(at("a/b/c")));
    EXPECT_EQ(valuesOf("a/b/c").kind, FileKind::folder);
  }
  volume->writeFile("file", "");
  EXPECT_NE(posixCode(platform().operations.createDirectory(at("file"))), 0);
  EXPECT_NE(posixCode(platform().operations.createDirectory(at("file/below"))), 0);
}

TEST_P(PlatformConformance, HistoryKeepsItsUUID) {
  const UUID uuid = platform().history.historyUUID(at("")).value();
  EXPECT_FALSE(uuid.isNil());
  EXPECT_EQ(platform().history.historyUUID(at("")).value(), uuid);
}

}  // namespace mirabel::testing
