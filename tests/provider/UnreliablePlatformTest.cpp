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
    fake.faults.reset();
  }
  void TestBody() override {}

  /// How many places hold a file of that identifier.
  std::size_t placesOf(const std::string& identifier) {
    const std::uint64_t documentID = std::stoull(identifier.substr(4));
    return fake.volume.pathsOfFileID(fake.volume.fileIDOfDocument(documentID)).size();
  }

  using ProviderFixture::done;
  using ProviderFixture::fake;
  using ProviderFixture::vessel;
  const std::string library = "/apps/draw/Documents";
  std::string kept;
  std::string trashed;
  std::string folder;
};

struct Operation {
  const char* name;
  std::function<void(Scene&, LocalVessel&, const LocalVessel::ItemHandler&)> start;
  bool isRemoval = false;
};

const Operation operations[] = {
    {"import", [](Scene& s, auto& v,
                  auto& done) { v.importDocumentAtURL(s.fake.url("a.txt"), s.folder, done); }},
    {"create",
     [](Scene& s, auto& v, auto& done) { v.createDirectoryWithName("b", s.folder, done); }},
    {"rename",
     [](Scene& s, auto& v, auto& done) { v.renameItemWithIdentifier(s.kept, "b", done); }},
    {"rename to a taken name",
     [](Scene& s, auto& v, auto& done) { v.renameItemWithIdentifier(s.folder, ".Trash", done); }},
    {"move",
     [](Scene& s, auto& v, auto& done) {
       v.reparentItemWithIdentifier(s.kept, "#org.example.draw", "b", done);
     }},
    {"trash", [](Scene& s, auto& v, auto& done) { v.trashItemWithIdentifier(s.kept, done); }},
    {"untrash",
     [](Scene& s, auto& v, auto& done) { v.untrashItemWithIdentifier(s.trashed, {}, done); }},
    {"untrash into a parent",
     [](Scene& s, auto& v, auto& done) { v.untrashItemWithIdentifier(s.trashed, s.folder, done); }},
    {"delete",
     [](Scene& s, auto& v, auto&) { v.deleteItemWithIdentifier(s.kept, s.done.errorHandler()); },
     true},
    {"default container",
     [](Scene&, auto& v, auto& done) {
       v._defaultApplicationContainerForBundleIdentifier("org.example.draw", done);
     }},
    {"last used date",
     [](Scene& s, auto& v, auto& done) {
       v.setLastUsedDate(Date{1, 0}, s.kept, done);
     }},
    {"tags", [](Scene& s, auto& v, auto& done) { v.setTagData({}, s.kept, done); }},
    {"favorite rank", [](Scene& s, auto& v, auto& done) { v.setFavoriteRank({}, s.kept, done); }},
};

TEST(UnreliablePlatformTest, WhicheverCallFailsTheHostIsToldOnceAndNothingIsLost) {
  for (const Operation& operation : operations) {
    std::size_t n = 0;
    std::size_t failures = 0;
    for (bool wasReached = true; wasReached;) {
      ASSERT_LT(++n, 500U) << operation.name << " never came to an end";
      Scene scene;
      scene.fake.faults.failCall(n, Error::posix(EIO));
      operation.start(scene, *scene.vessel, scene.done.handler());
      wasReached = scene.fake.faults.calls() >= n;
      const auto outcome = scene.done.result();
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
