#include <atomic>
#include <cerrno>
#include <chrono>
#include <future>
#include <semaphore>

#include "host/bus/ServiceFixture.h"
#include "mirabel/Session.h"

namespace mirabel::testing {
namespace {

class RemoteDocumentsTest : public ServiceFixture {
 protected:
  void SetUp() override {
    ServiceFixture::SetUp();
    if (IsSkipped()) return;
    home.makeFolder("folder");
    home.makeFolder("folder/taken");
    serve();
    documents = openDocuments({.home = home.path()}).value();
    folder = documents->itemAtPath(home.at("folder")).value().itemIdentifier;
  }

  std::unique_ptr<Documents> documents;
  std::string folder;
};

TEST_F(RemoteDocumentsTest, ErrorsSayWhatTheyAreAbout) {
  EXPECT_EQ(documents->item("did=99").error().userInfo.at(std::string(errorkey::itemIdentifier)),
            "did=99");
  const std::string taken = documents->itemAtPath(home.at("folder/taken")).value().itemIdentifier;
  std::promise<Documents::ItemResult> made;
  documents->createDirectory("taken", folder, [&](auto result) { made.set_value(result); });
  const Error collision = made.get_future().get().error();
  EXPECT_EQ(collision.userInfo.at(std::string(errorkey::collidingItem)), taken);
}

// The answer would arrive on the thread that waits for it.
TEST_F(RemoteDocumentsTest, QuestionsFromItsOwnCallsAreRefusedAtOnce) {
  std::promise<Documents::ItemResult> asked;
  std::promise<Documents::ItemResult> next;
  documents->createDirectory("new", folder, [&](const Documents::ItemResult& result) {
    asked.set_value(documents->item(result.value().itemIdentifier));
    documents->createDirectory("newer", folder, [&](auto second) { next.set_value(second); });
  });
  EXPECT_TRUE(asked.get_future().get().error().isPosix(EDEADLK));
  EXPECT_TRUE(next.get_future().get()) << "what waits for nothing can be begun";

  std::promise<Documents::ItemResult> askedAgain;
  std::once_flag once;
  const auto watch = documents->watch(folder, [&] {
    std::call_once(once, [&] { askedAgain.set_value(documents->item(folder)); });
  });
  home.writeFile("folder/change");
  EXPECT_TRUE(askedAgain.get_future().get().error().isPosix(EDEADLK));
}

TEST_F(RemoteDocumentsTest, AWatchThatAnotherCallHasEndedIsNotCalledAnyMore) {
  std::unique_ptr<ContainerWatch> watches[2];
  int calls[2] = {};
  std::atomic<bool> areBothThere = false;
  for (int i = 0; i < 2; ++i) {
    const auto endOther = [&, i] {
      if (areBothThere && ++calls[i] == 1) watches[1 - i].reset();
    };
    watches[i] = documents->watch(folder, endOther).value();
  }
  areBothThere = true;
  // Once it is woken for a second thing, all have been for the first.
  std::counting_semaphore<> fence{0};
  const auto last = documents->watch(folder, [&] { fence.release(); }).value();
  for (const char* file : {"folder/one", "folder/two"}) {
    home.writeFile(file);
    ASSERT_TRUE(fence.try_acquire_for(std::chrono::seconds(30)));
  }
  EXPECT_NE(calls[0] > 0, calls[1] > 0);
}

}  // namespace
}  // namespace mirabel::testing
