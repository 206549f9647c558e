#include <cerrno>

#include "fs/ShownItems.h"
#include "support/ItemsFixture.h"

namespace mirabel::testing {
namespace {

using ShownItemsTest = ItemsFixture;

TEST_F(ShownItemsTest, OnlyWhatTheVolumeSaysIsNowhereIsNotShown) {
  fake.volume.makeFolder(fake.path("folder"));
  fake.volume.writeFile(fake.path("file"));
  ShownItems shown(context, libraries, {fake.url()}, LinkNames::Depth::children);
  for (const char* name : {"folder", "file"}) {
    const std::string identifier = identity.itemIdentifier(fake.url(name)).value();
    ASSERT_TRUE(shown.ofIdentifier(identifier).value()) << name;
    for (const Op op : {Op::device, Op::pathOfFileID, Op::fileIDOfDocument}) {
      if (op == Op::fileIDOfDocument && identifier.starts_with("fid=")) continue;
      for (const int failure : {EIO, EMFILE, ENOTCONN, ENOENT}) {
        // One failure is made up for by the second look, which asks for the reason.
        fake.faults.fail(op, Error::posix(failure), 1, 1);
        EXPECT_TRUE(shown.ofIdentifier(identifier).value()) << name << " " << failure;
        fake.faults.reset();
        fake.faults.fail(op, Error::posix(failure), 1, 100);
        const auto item = shown.ofIdentifier(identifier);
        fake.faults.reset();
        if (failure == ENOENT) {
          EXPECT_EQ(item.value(), nullptr) << name;
        } else {
          EXPECT_TRUE(!item && item.error().isPosix(failure)) << name << " " << failure;
        }
      }
    }
  }
}

}  // namespace
}  // namespace mirabel::testing
