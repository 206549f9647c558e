#include <cerrno>
#include <gtest/gtest.h>

#include "host/LocalDocuments.h"
#include "linux/FailingLooks.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

TEST(ItemLookupTest, WhatCannotBeLookedAtIsNotSaidToBeMissing) {
  TempHome home;
  home.makeFolder("folder");
  home.writeFile("folder/letter.txt", "text");
  LinuxPlatform::Options options;
  options.home = home.path();
  const auto documents = LocalDocuments::open(std::move(options)).value();
  for (const std::string& path : {home.at(""), home.at("folder"), home.at("folder/letter.txt")}) {
    const std::string identifier = documents->itemAtPath(path)->itemIdentifier;
    for (int n = 1;; ++n) {
      const FailingNthLook failing(n, EIO, 1000);
      const auto item = documents->lookup().byIdentifier(identifier);
      EXPECT_TRUE(item || item.error().isPosix(EIO)) << path << ": " << item.error().description();
      if (!failing.wasMet()) break;
    }
    EXPECT_TRUE(documents->lookup().byIdentifier(identifier)) << path;
  }
  const auto unknown = documents->lookup().byIdentifier("did=12345");
  EXPECT_TRUE(!unknown && unknown.error().is(VesselErrorCode::noSuchItem));
}

TEST(AnchorTest, ThatCannotBeTakenSaysWhy) {
  TempHome home;
  home.makeFolder("folder");
  LinuxPlatform::Options options;
  options.home = home.path();
  const auto documents = LocalDocuments::open(std::move(options)).value();
  const auto folder =
      documents->container(documents->itemAtPath(home.at("folder"))->itemIdentifier);
  for (int n = 1;; ++n) {
    const FailingNthLook failing(n, EIO, 1000);
    const auto anchor = (*folder)->currentSyncAnchor();
    EXPECT_TRUE(anchor || anchor.error().isPosix(EIO)) << n << anchor.error().description();
    if (!failing.wasMet()) break;
  }
}

}  // namespace
}  // namespace mirabel::testing
