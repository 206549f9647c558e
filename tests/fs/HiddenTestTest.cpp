#include <gtest/gtest.h>

#include "fs/HiddenTest.h"
#include "support/FakePlatform.h"

namespace mirabel::testing {
namespace {

class HiddenTestTest : public ::testing::Test {
 protected:
  ResourceValueSource& resources() { return fake.platform().resources; }

  FakePlatform fake{"/home/.me/Documents"};
};

TEST_F(HiddenTestTest, OnlyWhatStandsBelowAMonitoredFolderCounts) {
  fake.volume.makeFolder(fake.path("pack.bundle/sub"));
  fake.volume.makeFolder(fake.path("plain/Inbox"));
  fake.volume.writeFile(fake.path("file.bundle"));
  const HiddenTest test({fake.url()}, resources());
  const std::pair<std::string_view, bool> cases[] = {
      {"", false},
      {"a", false},
      {"plain/b", false},
      {".a", true},
      {"plain/.a", true},
      {".a/b", true},
      {"Inbox", true},
      {"plain/Inbox", true},
      {"plain/Inbox/b", true},
      {"Inbox2", false},
      {"inbox", false},
      {"pack.bundle", false},
      {"pack.bundle/a", true},
      {"pack.bundle/sub/a", true},
      {"file.bundle", false},
      {"missing.bundle/a", false},
      {".Trash", true},
      {".Trash/a", false},
      {".Trash/pack.bundle", false},
      {".Trash/.a", true},
      {".Trash/Inbox", true},
      {".Trash/a/b", true},
      {".Trash2/a", true},
      {"plain/.Trash/a", true},
  };
  for (const auto& [path, hidden] : cases) {
    EXPECT_EQ(test.isHidden(fake.url(path)), hidden) << path;
    EXPECT_EQ(test.isHidden(URL::fileURL(fake.path(path))), hidden) << path;
    EXPECT_TRUE(test.isMonitored(fake.url(path))) << path;
  }
}

/// A platform that tells packages by their name.
class NamedPackages final : public ResourceValueSource {
 public:
  explicit NamedPackages(ResourceValueSource& source) : source_(source) {}
  Result<ResourceValues> readValues(const URL& url) override {
    ++reads;
    return source_.readValues(url);
  }
  bool mayBePackage(std::string_view name) const override { return name.ends_with(".bundle"); }
  Result<void> prefetch(std::span<const URL> urls) override { return source_.prefetch(urls); }

  int reads = 0;

 private:
  ResourceValueSource& source_;
};

TEST_F(HiddenTestTest, FoldersWhoseNameTellsThatTheyAreNoPackagesAreNotRead) {
  fake.volume.makeFolder(fake.path("a/b/pack.bundle/sub"));
  NamedPackages named(resources());
  const HiddenTest test({fake.url()}, named);
  EXPECT_FALSE(test.isHidden(fake.url("a/b/c")));
  EXPECT_EQ(named.reads, 0);
  EXPECT_TRUE(test.isHidden(fake.url("a/b/pack.bundle/sub/c")));
  EXPECT_EQ(named.reads, 1);
}

TEST_F(HiddenTestTest, PathsAreComparedByComponentsInCanonicalForm) {
  const HiddenTest test({URL::fileURL("/var/x"), URL::fileURL("/y/.in/z"), URL::fileURL("/y")},
                        resources());
  const std::pair<std::string_view, bool> cases[] = {
      {"/private/var/x/a", true}, {"/var/x/a", true}, {"/var/x2/a", false}, {"/var", false},
      {"/y/.in/z/a", true},       {"/y/.in/a", true}, {"/z/a", false},
  };
  for (const auto& [path, monitored] : cases)
    EXPECT_EQ(test.isMonitored(URL::fileURL(path)), monitored) << path;
  // In sight of one folder, though the other, further up, would hide it.
  EXPECT_FALSE(test.isHidden(URL::fileURL("/y/.in/z/a")));
  EXPECT_TRUE(test.isHidden(URL::fileURL("/y/.in/a")));
  EXPECT_TRUE(test.isHidden(URL::fileURL("/z/a")));
}

}  // namespace
}  // namespace mirabel::testing
