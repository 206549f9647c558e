#include <filesystem>

#include "cli/InstalledApps.h"
#include "host/bus/BusClient.h"
#include "host/bus/ServiceFixture.h"
#include "platform/VesselManager.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::IsEmpty;

const std::string rootItem(VesselRootContainerItemIdentifier);
const std::string workingSet(VesselWorkingSetContainerItemIdentifier);

class Watches : public ServiceFixture {
 protected:
  void SetUp() override {
    ServiceFixture::SetUp();
    if (IsSkipped()) return;
    for (const char* folder : {"a", "b", "c", "c/fence"})
      home.makeFolder(folder);
    serve();
  }

  static void watch(BusClient& client, const std::string& container) {
    EXPECT_EQ(client.provider("Watch", container).error, "");
  }
  static void unwatch(BusClient& client, const std::string& container) {
    EXPECT_EQ(client.provider("Unwatch", container).error, "");
  }

  /// Signals that the client gets for what was done before. The watches are looked at one after
  /// the other: once a watch of the fence is woken for a second thing, done after it was woken for
  /// a first, a whole round has been made.
  std::vector<std::string> takeSignals(BusClient& client) {
    BusClient guard;
    const std::string fence = guard.idOf(home.at("c/fence"));
    watch(guard, fence);
    for (int round = 0; round < 2; ++round) {
      home.writeFile("c/fence/" + std::to_string(++fenced_));
      EXPECT_EQ(guard.signal(), fence);
    }
    // The bus keeps the order of what one connection sends; this answer comes behind.
    EXPECT_EQ(client.provider("GetItem", fence).error, "");
    return client.takeSignals();
  }

  int fenced_ = 0;
};

TEST_F(Watches, WakeThoseWhoseContainerHasChangesAndNobodyElse) {
  BusClient ofA;
  BusClient ofB;
  BusClient ofRoot;
  BusClient ofWorkingSet;
  const std::string a = ofA.idOf(home.at("a"));
  const std::string b = ofB.idOf(home.at("b"));
  watch(ofA, a);
  watch(ofB, b);
  watch(ofRoot, rootItem);
  watch(ofWorkingSet, workingSet);
  home.writeFile("a/doc");
  EXPECT_EQ(ofA.signal(), a);
  // The folder itself has another count and date, which the root hands out.
  EXPECT_EQ(ofRoot.signal(), rootItem);
  EXPECT_EQ(ofWorkingSet.signal(), workingSet);
  EXPECT_THAT(takeSignals(ofB), IsEmpty());
  // What is written into the document is nothing of the root's.
  for (BusClient* client : {&ofA, &ofRoot})
    static_cast<void>(takeSignals(*client));
  fs::resize_file(home.at("a/doc"), 10);
  EXPECT_EQ(ofA.signal(), a);
  EXPECT_THAT(takeSignals(ofRoot), IsEmpty());
}

TEST_F(Watches, OfOneFolderAreAllWokenAndEndOneByOne) {
  BusClient one;
  auto two = std::make_unique<BusClient>();
  BusClient three;
  const std::string a = one.idOf(home.at("a"));
  for (BusClient* client : {&one, two.get(), &three})
    watch(*client, a);
  watch(one, a);  // once more is no second signal
  home.writeFile("a/1");
  EXPECT_EQ(one.signal(), a);
  EXPECT_EQ(two->signal(), a);
  EXPECT_EQ(three.signal(), a);
  two.reset();
  unwatch(one, a);
  unwatch(one, a);
  EXPECT_THAT(takeSignals(one), IsEmpty());
  home.writeFile("a/2");
  EXPECT_EQ(three.signal(), a);
  EXPECT_THAT(takeSignals(one), IsEmpty());
  watch(one, a);
  home.writeFile("a/3");
  EXPECT_EQ(one.signal(), a);
}

TEST_F(Watches, SeeAnApplicationThatIsInstalled) {
  BusClient client;
  watch(client, rootItem);
  const InstalledApps apps(home);
  apps.install("org.example.Draw", "Draw");
  EXPECT_EQ(client.signal(), rootItem);
  // What lies in it is followed from then on.
  const std::string draw = "#org.example.Draw";
  BusClient other;
  watch(other, draw);
  apps.write("org.example.Draw", "sketch", "a line");
  EXPECT_EQ(other.signal(), draw);
}

TEST_F(Watches, OfAFolderThatIsDeletedAreWokenOnce) {
  BusClient client;
  const std::string a = client.idOf(home.at("a"));
  watch(client, a);
  home.remove("a");
  EXPECT_EQ(client.signal(), a);
  EXPECT_THAT(takeSignals(client), IsEmpty());
  EXPECT_EQ(client.provider("EnumerateChanges", a, Data()).error,
            "com.norvane.Vessel1.Error.NoSuchItem");
  EXPECT_EQ(BusClient().provider("Watch", a).error, "com.norvane.Vessel1.Error.NoSuchItem");
  // What is no folder, or no longer: a package is an item of its own.
  home.makeFolder("notes");
  const std::string notes = client.idOf(home.at("notes"));
  home.rename("notes", "notes.quill");
  EXPECT_EQ(client.provider("ListItems", notes, Data()).error,
            "com.norvane.Vessel1.Error.NoSuchItem");
  home.writeFile("doc");
  for (const char* name : {"doc", "notes.quill"}) {
    EXPECT_EQ(BusClient().provider("Watch", client.idOf(home.at(name))).error,
              "com.norvane.Vessel1.Error.POSIX.ENOTDIR");
  }
}

TEST_F(Watches, AreNotMoreThanAClientMayHave) {
  BusClient client;
  for (int i = 0; i < 257; ++i)
    home.makeFolder(std::to_string(i));
  std::string refusal;
  int watched = 0;
  for (; watched < 257 && refusal.empty(); ++watched)
    refusal = client.provider("Watch", client.idOf(home.at(std::to_string(watched)))).error;
  EXPECT_EQ(refusal, "com.norvane.Vessel1.Error.POSIX.ENOBUFS");
  EXPECT_EQ(watched, 257);
  unwatch(client, client.idOf(home.at("0")));
  watch(client, client.idOf(home.at("256")));
  // Another client is not in its way.
  BusClient other;
  watch(other, rootItem);
}

}  // namespace
}  // namespace mirabel::testing
