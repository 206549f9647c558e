#include <cerrno>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>

#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

/// A provider with a file in an app library's folder and one in its trash.
class Scene : public ProviderFixture {
 public:
  Scene() {
    fake.volume.makeFolder(library + "/Notes");
    for (const char* name : {"kept.txt", "trashed.txt"})
      fake.volume.writeFile(library + "/Notes/" + name, "12345");
    kept = idAt(library + "/Notes/kept.txt");
    trashed = idAt(library + "/Notes/trashed.txt");
    folder = idAt(library + "/Notes");
    vessel->trashItemWithIdentifier(trashed, Completions().handler());
  }
  void TestBody() override {}

  /// How many places hold a file of that identifier.
  std::size_t placesOf(const std::string& identifier) {
    const std::uint64_t documentID = std::stoull(identifier.substr(4));
    return fake.volume.pathsOfFileID(fake.volume.fileIDOfDocument(documentID)).size();
  }
  LocalVessel& provider() { return *vessel; }
  FakePlatform& platform() { return fake; }
  Completions& completions() { return done; }
  LocalVessel::ItemHandler item() { return done.handler(); }

  const std::string library = "/apps/draw/Documents";
  std::string kept;
  std::string trashed;
  std::string folder;
};

struct Operation {
  const char* name;
  std::function<void(Scene&)> start;
  bool isRemoval = false;
};

const Operation operations[] = {
    {"import",
     [](Scene& s) {
       s.provider().importDocumentAtURL(s.platform().url("a.txt"), s.folder, s.item());
     }},
    {"create", [](Scene& s) { s.provider().createDirectoryWithName("b", s.folder, s.item()); }},
    {"rename", [](Scene& s) { s.provider().renameItemWithIdentifier(s.kept, "b", s.item()); }},
    {"rename to a taken name",
     [](Scene& s) { s.provider().renameItemWithIdentifier(s.folder, ".Trash", s.item()); }},
    {"move",
     [](Scene& s) {
       s.provider().reparentItemWithIdentifier(s.kept, "#org.example.draw", "b", s.item());
     }},
    {"trash", [](Scene& s) { s.provider().trashItemWithIdentifier(s.kept, s.item()); }},
    {"untrash", [](Scene& s) { s.provider().untrashItemWithIdentifier(s.trashed, {}, s.item()); }},
    {"untrash into a parent",
     [](Scene& s) { s.provider().untrashItemWithIdentifier(s.trashed, s.folder, s.item()); }},
    {"delete",
     [](Scene& s) {
       s.provider().deleteItemWithIdentifier(s.kept, s.completions().errorHandler());
     },
     true},
    {"default container",
     [](Scene& s) {
       s.provider()._defaultApplicationContainerForBundleIdentifier("org.example.draw", s.item());
     }},
    {"last used date",
     [](Scene& s) {
       s.provider().setLastUsedDate(Date{1, 0}, s.kept, s.item());
     }},
    {"tags", [](Scene& s) { s.provider().setTagData({}, s.kept, s.item()); }},
    {"favorite rank", [](Scene& s) { s.provider().setFavoriteRank({}, s.kept, s.item()); }},
};

TEST(UnreliablePlatformTest, WhicheverCallFailsTheHostIsToldOnceAndNothingIsLost) {
  for (const Operation& operation : operations) {
    std::size_t n = 0;
    std::size_t failures = 0;
    for (bool wasReached = true; wasReached;) {
      ASSERT_LT(++n, 500U) << operation.name << " never came to an end";
      Scene scene;
      scene.platform().faults.reset();
      scene.platform().faults.failCall(n, Error::posix(EIO));
      operation.start(scene);
      wasReached = scene.platform().faults.calls() >= n;
      const auto outcome = scene.completions().result();
      if (!outcome) ++failures;
      EXPECT_TRUE(outcome || wasReached || operation.name == std::string("rename to a taken name"))
          << operation.name << " without a failing call";
      EXPECT_EQ(scene.placesOf(scene.trashed), 1U) << operation.name << " " << n;
      const bool isGone = operation.isRemoval && outcome;
      EXPECT_EQ(scene.placesOf(scene.kept), isGone ? 0U : 1U) << operation.name << " " << n;
    }
    const bool asksTheRegistryFirst = operation.name == std::string("default container");
    EXPECT_GE(failures, asksTheRegistryFirst ? 1U : 3U) << operation.name;
  }
}

}  // namespace
}  // namespace mirabel::testing
