#include <algorithm>
#include <cerrno>

#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

const Error invalidIdentifier = Error::local(LocalVesselError::invalidItemIdentifier);

class LocalVesselTest : public ProviderFixture {
 protected:
  LocalVesselTest() : folder(id("folder")) { fake.volume.writeFile(fake.path("folder/file"), "1"); }

  const std::string folder;
};

TEST_F(LocalVesselTest, EachLookAtAURLIsAFreshOne) {
  const URL url = URL::fileURL(fake.path("folder/file"));
  const auto before = vessel->_propertiesForItemAtURL(url).value();
  fake.volume.writeFile(fake.path("folder/other"), "longer");
  fake.volume.remove(fake.path("folder/file"));
  EXPECT_EQ(vessel->_propertiesForItemAtURL(url).error(), invalidIdentifier);
  fake.volume.rename(fake.path("folder/other"), fake.path("folder/file"));
  const auto after = vessel->_propertiesForItemAtURL(url).value();
  EXPECT_EQ(after->documentSize(), Number::of(std::int64_t{6}));
  EXPECT_NE(after->itemIdentifier(), before->itemIdentifier());
  EXPECT_EQ(vessel->persistentIdentifierForItemAtURL(url), after->itemIdentifier());
}

TEST_F(LocalVesselTest, UnknownIdentifierIsNoItemAndNoURL) {
  const std::string working(VesselWorkingSetContainerItemIdentifier);
  for (const std::string& identifier :
       {std::string("#"), std::string("#org.example.none"), std::string("fid=1"),
        std::string("did=99"), std::string("junk"), working}) {
    EXPECT_EQ(vessel->itemForIdentifier(identifier).error(), invalidIdentifier);
    EXPECT_FALSE(vessel->URLForItemWithPersistentIdentifier(identifier));
    EXPECT_EQ(vessel->urlForIdentifier(identifier).error(), Error::nonExistentItem(identifier));
  }
}

TEST_F(LocalVesselTest, RootIsLookedAtAnewEachTime) {
  const std::string root(VesselRootContainerItemIdentifier);
  ASSERT_TRUE(vessel->itemForIdentifier(root));
  fake.volume.at(fake.path("")).modified = {1'800'000'000, 0};
  EXPECT_EQ(vessel->itemForIdentifier(root).value()->contentModificationDate(),
            (Date{1'800'000'000, 0}));
}

TEST_F(LocalVesselTest, TemporaryLocalFolderIsMadeOnDemand) {
  const std::string identifier(VesselTemporaryLocalFolderItemIdentifier);
  const auto first = vessel->itemForIdentifier(identifier);
  const auto second = vessel->itemForIdentifier(identifier);
  ASSERT_TRUE(first && second);
  EXPECT_EQ((*first)->url().path(), fake.path(".TemporaryLocalFolder"));
  EXPECT_EQ((*first)->itemIdentifier(), (*second)->itemIdentifier());
  EXPECT_EQ((*first)->parentItemIdentifier(), VesselRootContainerItemIdentifier);

  fake.faults.fail(Op::createDirectory, Error::posix(EROFS));
  EXPECT_FALSE(vessel->lookUpItem(identifier));
}

TEST_F(LocalVesselTest, URLLeadsToItsIdentifier) {
  const URL library = URL::fileURL("/apps/draw/Documents");
  EXPECT_EQ(vessel->persistentIdentifierForItemAtURL(library), "#org.example.draw");
  // A folder of that name is asked for in the registry, and is otherwise like any other.
  fake.volume.makeFolder(fake.path("folder/Documents"));
  const URL namesake = fake.url("folder/Documents");
  EXPECT_EQ(vessel->persistentIdentifierForItemAtURL(namesake),
            vessel->identity().itemIdentifier(namesake).value());
  EXPECT_FALSE(vessel->persistentIdentifierForItemAtURL(fake.url("missing")));
}

TEST_F(LocalVesselTest, AnyFailingCallGivesTheRightAnswerOrALoggedError) {
  ASSERT_EQ(vessel->_persistentIdentifierForItemAt(fake.url("folder/file")), "did=1");
  for (std::size_t n = 1; n < 1000; ++n) {
    fake.faults.reset();
    fake.faults.failCall(n, Error::posix(EIO));
    log.clear();
    const auto item = vessel->itemForIdentifier("did=1");
    const auto properties = vessel->_propertiesForItemAtURL(fake.url("folder/file"));
    if (fake.faults.calls() < n) return;
    for (const auto& made : {item, properties}) {
      EXPECT_TRUE(made ? (*made)->itemIdentifier() == "did=1" : made.error() == invalidIdentifier)
          << n;
    }
    const auto lines = log.messages();
    const bool isLogged = std::ranges::any_of(
        lines, [](const LogLine& line) { return line.level == LogLevel::error; });
    EXPECT_TRUE(isLogged || (item && properties)) << n;
  }
  FAIL() << "the lookups never came to an end";
}

}  // namespace
}  // namespace mirabel::testing
