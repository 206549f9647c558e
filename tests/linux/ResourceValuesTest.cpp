#include <sys/resource.h>
#include <sys/stat.h>
#include <vector>

#include "linux/FilesFixture.h"
#include "support/NoDescriptors.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

class ResourceValuesOnDisk : public FilesTest {};

TEST_F(ResourceValuesOnDisk, NamesOfAnyBytesAreReadAndFoundAgain) {
  const std::string names[] = {
      "\xff\xfe", "a\nb", "a=b", "#x",       "100%41",  "...",   " ",
      "-rf",      "~",    "\\",  "\x01\x7f", "a.quill", "ﾅ.pdf", std::string(255, 'n')};
  std::vector<URL> urls;
  for (const std::string& name : names) {
    home.writeFile(name, name);
    urls.push_back(home.url().appendingPathComponent(name));
  }
  urls.insert(urls.begin(),
              {home.url(), URL::fromString("https://example.org/"), home.url("missing")});
  ASSERT_TRUE(platform().resources.prefetch(urls));
  // A root is no entry of a folder that is presented.
  EXPECT_TRUE(urls[0].resources().isFilled());
  EXPECT_FALSE(urls[1].resources().isFilled() || urls[2].resources().isFilled());
  urls.erase(urls.begin(), urls.begin() + 3);
  const DeviceID device = platform().objects.open(home.url()).value()->device().value();
  for (const URL& url : urls) {
    const auto cached = url.resources().snapshot();
    ASSERT_TRUE(cached) << url.description();
    EXPECT_EQ(cached->size, url.lastPathComponent().size()) << url.description();
    const ResourceValues values = valuesOf(url.lastPathComponent());
    EXPECT_EQ(cached->fileID, values.fileID) << url.description();
    EXPECT_FALSE(cached->isPackage || values.isPackage) << url.description();
    EXPECT_EQ(platform().objects.pathOfFileID(device, cached->fileID), url.path());
  }
}

TEST_F(ResourceValuesOnDisk, ReadingEntriesTogetherTellsOfTheirFolderTheSame) {
  home.makeFolder("plain");
  home.makeFolder("packed.package");
  for (const char* name : {"plain", "packed.package"}) {
    home.writeFile(std::string(name) + "/f");
    const URL folder = home.url().appendingPathComponent(name);
    const URL entry = folder.appendingPathComponent("f");
    ASSERT_TRUE(platform().resources.prefetch({&entry, 1}));
    const ResourceReader reader(platform().resources);
    for (const ResourceKey key :
         {ResourceKey::typeIdentifier, ResourceKey::creationDate,
          ResourceKey::contentModificationDate, ResourceKey::isDirectory, ResourceKey::isPackage,
          ResourceKey::isWritable, ResourceKey::fileIdentifier, ResourceKey::documentIdentifier,
          ResourceKey::linkCount}) {
      const URL fresh = URL::fileURL(folder.path());
      EXPECT_EQ(reader.value(key, folder).value(), reader.value(key, fresh).value())
          << name << " " << nameOf(key);
    }
  }
}

TEST_F(ResourceValuesOnDisk, ADocumentThatWasReadIsNotLookedAtOnceMoreToRefreshIt) {
  home.writeFile("f");
  const URL url = home.url().appendingPathComponent("f");
  ASSERT_TRUE(platform().resources.prefetch({&url, 1}));
  const std::uint32_t known = url.resources().snapshot()->documentID;
  home.remove("f");
  GenerationalStore& documents = platform().documents;
  EXPECT_EQ(documents.permanentStorageForItemAtURL(url, Allocation::never).value_or(0), known);
  EXPECT_FALSE(documents.permanentStorageForItemAtURL(url, Allocation::ifNone));
}

TEST_F(ResourceValuesOnDisk, WhatIsNotThereIsNoSuchFile) {
  home.writeFile("file");
  for (const std::string_view name : {"missing/below", "file/below"}) {
    EXPECT_EQ(platform().resources.readValues(home.url(name)).error(),
              Error::file(FileErrorCode::noSuchFile));
  }
  EXPECT_EQ(failureOf(platform().resources.readValues(URL::fromString("x:"))), EINVAL);
}

TEST_F(ResourceValuesOnDisk, WritableMeansThatThisUserMayWrite) {
  struct Case {
    std::string_view name;
    mode_t mode;
    bool isWritable;
  };
  const Case files[] = {{"plain", 0644, true},
                        {"readOnly", 0444, false},
                        {"writeOnly", 0200, true},
                        {"groupOnly", 0060, false},
                        {"nothing", 0, false}};
  for (const Case& file : files)
    home.writeFile(file.name, "1");
  home.makeFolder("locked");
  home.makeFolder("listed");
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  for (const Case& file : files)
    home.setMode(file.name, file.mode);
  home.setMode("locked", 0);
  home.setMode("listed", 0555);

  const OrdinaryUser user;
  std::vector<URL> urls;
  for (const Case& file : files)
    urls.push_back(home.url(file.name));
  ASSERT_TRUE(platform().resources.prefetch(urls));
  for (std::size_t i = 0; i < urls.size(); ++i) {
    EXPECT_EQ(valuesOf(files[i].name).isWritable, files[i].isWritable) << files[i].name;
    EXPECT_EQ(urls[i].resources().snapshot()->isWritable, files[i].isWritable) << files[i].name;
  }
  EXPECT_FALSE(valuesOf("listed").isWritable);
  EXPECT_EQ(failureOf(platform().sizes.directorySize(home.url())), EACCES);
  closePlatform();
}

TEST_F(ResourceValuesOnDisk, AFolderThatCanNotBeCountedForTheMomentIsNotAnEmptyOne) {
  if (NoDescriptors::areNeeded) GTEST_SKIP() << "the sanitizer takes descriptors itself";
  for (const char* name : {"folder", "folder/sub", "closed", "closed/sub"})
    home.makeFolder(name);
  const URL folder = home.url("folder"), closed = home.url("closed");
  const auto status = [this](const URL& url) { return platform().objects.status(url); };
  // Of which all but the count is known.
  for (const URL* url : {&folder, &closed})
    ASSERT_TRUE(platform().resources.prefetch({url, 1}));
  {
    const NoDescriptors none;
    EXPECT_EQ(failureOf(status(folder)), EMFILE);
  }
  EXPECT_EQ(status(folder).value().linkCount, 3);
  std::filesystem::remove_all(folder.path());
  EXPECT_EQ(failureOf(status(folder)), ENOENT);

  home.setMode("closed", 0);
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  const OrdinaryUser user;
  EXPECT_EQ(status(closed).value().linkCount, 2) << "it is not ours to read";
}

TEST_F(ResourceValuesOnDisk, SizesCountEachFileOnceAndLinksNot) {
  home.makeFolder("a");
  home.writeFile("a/file", "12345");
  home.link("a/file", "a/same");
  home.makeSymlink("a/link", "/usr");
  home.makeFifo("a/fifo");
  EXPECT_EQ(platform().sizes.directorySize(home.url("a")).value(), 5U);
  EXPECT_EQ(failureOf(platform().sizes.directorySize(home.url("a/file"))), ENOTDIR);
  EXPECT_FALSE(platform().sizes.directorySize(home.url("a/link")));
}

TEST_F(ResourceValuesOnDisk, DepthCostsNoDescriptors) {
  std::string path = "d";
  for (int depth = 0; depth < 300; ++depth)
    path += "/d";
  ASSERT_TRUE(platform().operations.createDirectory(home.url(path)));
  home.writeFile(path + "/file", "1234567");
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_NOFILE, &before), 0);
  rlimit few = before;
  few.rlim_cur = 64;
  ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &few), 0);
  const auto size = platform().sizes.directorySize(home.url());
  ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &before), 0);
  EXPECT_EQ(size.value(), 7U);
}

}  // namespace
}  // namespace mirabel::testing
