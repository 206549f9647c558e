#include <algorithm>
#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "provider/Lines.h"
#include "provider/LocalVessel.h"
#include "support/FakeAppLibraries.h"
#include "support/FakePlatform.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

const Error invalidIdentifier = Error::local(LocalVesselError::invalidItemIdentifier);

class LocalVesselTest : public ::testing::Test {
 protected:
  LocalVesselTest() {
    fake.install("org.example.draw", "/apps/draw", "Draw");
    folder = "fid=" + std::to_string(fake.volume.makeFolder(fake.path("folder")).fileID);
    fake.volume.writeFile(fake.path("folder/file"), "1");
  }

  FakePlatform fake;
  FakeAppLibraries libraries{fake.applications};
  LocalVessel vessel{fake.platform(), libraries, libraries};
  std::string folder;
  LogCapture log;
};

TEST_F(LocalVesselTest, IdentifierLeadsToItsItemAndURL) {
  const std::pair<std::string, std::string> cases[] = {
      {std::string(VesselRootContainerItemIdentifier), fake.path("")},
      {"#org.example.draw", "/apps/draw/Documents"},
      {folder, fake.path("folder")},
  };
  for (const auto& [identifier, path] : cases) {
    log.clear();
    const auto item = vessel.itemForIdentifier(identifier);
    ASSERT_TRUE(item) << identifier;
    EXPECT_EQ((*item)->itemIdentifier(), identifier);
    EXPECT_THAT(log.messages(), ElementsAre(debug("found " + (*item)->description())));
    EXPECT_THAT(log.sectionLabels(),
                ElementsAre("fetching item's properties for \"" + identifier + "\""));

    log.clear();
    const auto url = vessel.URLForItemWithPersistentIdentifier(identifier);
    EXPECT_EQ(url, URL::fileURL(path));
    EXPECT_THAT(log.messages(), ElementsAre(debug("found " + url->description())));
    EXPECT_THAT(log.sectionLabels(), ElementsAre("fetching URL for \"" + identifier + "\""));
  }
}

TEST_F(LocalVesselTest, EachLookAtAURLIsAFreshOne) {
  const URL url = URL::fileURL(fake.path("folder/file"));
  const auto before = vessel._propertiesForItemAtURL(url).value();
  fake.volume.writeFile(fake.path("folder/other"), "longer");
  fake.volume.remove(fake.path("folder/file"));
  EXPECT_EQ(vessel._propertiesForItemAtURL(url).error(), invalidIdentifier);
  fake.volume.rename(fake.path("folder/other"), fake.path("folder/file"));
  const auto after = vessel._propertiesForItemAtURL(url).value();
  EXPECT_EQ(after->documentSize(), Number::of(std::int64_t{6}));
  EXPECT_NE(after->itemIdentifier(), before->itemIdentifier());
  EXPECT_EQ(vessel.persistentIdentifierForItemAtURL(url), after->itemIdentifier());
}

TEST_F(LocalVesselTest, UnknownIdentifierIsNoItemAndNoURL) {
  const std::string working(VesselWorkingSetContainerItemIdentifier);
  for (const std::string& identifier :
       {std::string("#"), std::string("#org.example.none"), std::string("fid=1"),
        std::string("did=99"), std::string("junk"), working}) {
    log.clear();
    EXPECT_EQ(vessel.itemForIdentifier(identifier).error(), invalidIdentifier);
    EXPECT_EQ(log.messages().back(),
              error("item lookup failed for identifier \"" + identifier + "\""));
    // The section is closed on this path too.
    EXPECT_THAT(log.lines().back().text, HasSubstr("┗"));

    log.clear();
    EXPECT_FALSE(vessel.URLForItemWithPersistentIdentifier(identifier));
    const Error missing = Error::nonExistentItem(identifier);
    EXPECT_EQ(vessel.urlForIdentifier(identifier).error(), missing);
    EXPECT_THAT(log.messages(),
                ::testing::Contains(error("can't find URL matching identifier " + identifier +
                                          "; " + missing.description())));
  }
}

TEST_F(LocalVesselTest, RootIsLookedAtAnewEachTime) {
  const std::string root(VesselRootContainerItemIdentifier);
  ASSERT_TRUE(vessel.itemForIdentifier(root));
  fake.volume.at(fake.path("")).modified = {1'800'000'000, 0};
  EXPECT_EQ(vessel.itemForIdentifier(root).value()->contentModificationDate(),
            (Date{1'800'000'000, 0}));
}

TEST_F(LocalVesselTest, TemporaryLocalFolderIsMadeOnDemand) {
  const std::string identifier(VesselTemporaryLocalFolderItemIdentifier);
  const auto first = vessel.itemForIdentifier(identifier);
  const auto second = vessel.itemForIdentifier(identifier);
  ASSERT_TRUE(first && second);
  EXPECT_EQ((*first)->url().path(), fake.path(".TemporaryLocalFolder"));
  EXPECT_EQ((*first)->itemIdentifier(), (*second)->itemIdentifier());
  EXPECT_EQ((*first)->parentItemIdentifier(), VesselRootContainerItemIdentifier);

  log.clear();
  fake.faults.fail(Op::createDirectory, Error::posix(EROFS));
  EXPECT_FALSE(vessel.lookUpItem(identifier));
  EXPECT_THAT(log.lines(), ElementsAre(error("can't create temporary directory; " +
                                             Error::posix(EROFS).description())));
}

TEST_F(LocalVesselTest, URLLeadsToItsIdentifier) {
  const auto label = [](const URL& url) {
    return "fetching item identifier for \"" + url.path() + "\"";
  };
  const URL library = URL::fileURL("/apps/draw/Documents");
  EXPECT_EQ(vessel.persistentIdentifierForItemAtURL(library), "#org.example.draw");
  EXPECT_THAT(log.messages(), ElementsAre(debug("found #org.example.draw")));
  EXPECT_THAT(log.sectionLabels(), ElementsAre(label(library)));

  // A folder of that name is asked for in the registry, and is otherwise like any other.
  log.clear();
  fake.volume.makeFolder(fake.path("folder/Documents"));
  const URL namesake = fake.url("folder/Documents");
  const auto identifier = vessel.persistentIdentifierForItemAtURL(namesake);
  EXPECT_EQ(identifier, vessel.identity().itemIdentifier(namesake));
  EXPECT_THAT(log.messages(),
              ElementsAre(error("can't find bundle proxy at " + namesake.description()),
                          debug("found " + identifier.value())));

  log.clear();
  const URL missing = fake.url("missing");
  EXPECT_FALSE(vessel.persistentIdentifierForItemAtURL(missing));
  EXPECT_EQ(log.messages().back(), error("can't create an item without an ID"));
  EXPECT_THAT(log.sectionLabels(), ElementsAre(label(missing)));
}

TEST_F(LocalVesselTest, PropertiesOfAURLAreThoseOfItsItem) {
  const auto file = vessel._propertiesForItemAtURL(fake.url("folder/file"));
  ASSERT_TRUE(file);
  EXPECT_EQ((*file)->itemIdentifier(), "did=1");
  EXPECT_EQ((*file)->parentItemIdentifier(), folder);
  const auto library = vessel._propertiesForItemAtURL(URL::fileURL("/apps/draw/Documents"));
  ASSERT_TRUE(library);
  EXPECT_EQ((*library)->filename(), "Draw");

  log.clear();
  EXPECT_EQ(vessel._propertiesForItemAtURL(fake.url("missing")).error(), invalidIdentifier);
  EXPECT_EQ(log.lines().back(),
            error("identifier lookup failed for URL \"" + fake.path("missing") + "\""));
}

TEST_F(LocalVesselTest, ProvidingCompletesAtOnceWithoutAnError) {
  std::vector<std::optional<Error>> completions;
  const auto complete = [&](std::optional<Error> outcome) { completions.push_back(outcome); };
  vessel.providePlaceholderAtURL(fake.url("missing"), complete);
  vessel.startProvidingItemAtURL(URL::fromString("https://example.org"), complete);
  vessel.stopProvidingItemAtURL(fake.url("missing"));
  vessel.itemChangedAtURL(fake.url("missing"));
  EXPECT_THAT(completions, ElementsAre(std::nullopt, std::nullopt));
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(LocalVesselTest, AnyFailingCallGivesTheRightAnswerOrALoggedError) {
  ASSERT_EQ(vessel._persistentIdentifierForItemAt(fake.url("folder/file")), "did=1");
  for (std::size_t n = 1; n < 1000; ++n) {
    fake.faults.reset();
    fake.faults.failCall(n, Error::posix(EIO));
    log.clear();
    const auto item = vessel.itemForIdentifier("did=1");
    const auto properties = vessel._propertiesForItemAtURL(fake.url("folder/file"));
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
