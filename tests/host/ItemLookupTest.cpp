#include <cerrno>
#include <gtest/gtest.h>

#include "host/LocalDocuments.h"
#include "linux/FailingLooks.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

class ItemLookupTest : public ::testing::Test {
 protected:
  ItemLookupTest() {
    home.makeFolder("folder");
    home.writeFile("folder/letter.txt", "text");
    documents = LocalDocuments::open({.home = home.path()}).value();
  }
  std::string idOf(const std::string& name) const {
    return documents->itemAtPath(home.at(name))->itemIdentifier;
  }
  /// Asks while one look after the other fails.
  template <class Ask>
  static void expectTheErrorOrAnAnswer(const Ask& ask) {
    for (int n = 1;; ++n) {
      const FailingNthLook failing(n, EIO, 1000);
      const auto answer = ask();
      EXPECT_TRUE(answer || answer.error().isPosix(EIO)) << n << answer.error().description();
      if (!failing.wasMet()) break;
    }
    EXPECT_TRUE(ask());
  }

  TempHome home;
  std::unique_ptr<LocalDocuments> documents;
};

TEST_F(ItemLookupTest, WhatCannotBeLookedAtIsNotSaidToBeMissing) {
  for (const char* name : {"", "folder", "folder/letter.txt"}) {
    SCOPED_TRACE(name);
    const std::string identifier = idOf(name);
    expectTheErrorOrAnAnswer([&] { return documents->lookup().byIdentifier(identifier); });
  }
  const auto unknown = documents->lookup().byIdentifier("did=12345");
  EXPECT_TRUE(!unknown && unknown.error().is(VesselErrorCode::noSuchItem));
  const auto folder = documents->container(idOf("folder"));
  expectTheErrorOrAnAnswer([&] { return (*folder)->currentSyncAnchor(); });
}

}  // namespace
}  // namespace mirabel::testing
