#include <algorithm>
#include <cerrno>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <latch>
#include <string>
#include <thread>
#include <vector>

#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::StartsWith;

const std::string rootItem(VesselRootContainerItemIdentifier);

class OperationsTest : public ProviderFixture {
 protected:
  OperationsTest() : folder(id("folder")), file(id("a.txt")) { log.clear(); }

  struct Operation {
    const char* name;
    std::function<void()> start;
    std::string label;
  };
  /// Each operation that ends later than the call, with arguments that let it succeed.
  std::vector<Operation> operations() {
    const std::string other = "/elsewhere/new.txt";
    fake.volume.makeFolder("/elsewhere");
    fake.volume.writeFile(other, "123");
    return {
        {"import", [=, this] { vessel->importDocumentAtURL(URL::fileURL(other), folder, item()); },
         "import document at \"" + other + "\" to parent \"" + folder + "\""},
        {"create", [this] { vessel->createDirectoryWithName("made", folder, item()); },
         "create directory with name \"made\" in parent \"" + folder + "\""},
        {"rename", [this] { vessel->renameItemWithIdentifier(file, "b.txt", item()); },
         "rename item \"" + file + "\" to name \"b.txt\""},
        {"move", [this] { vessel->reparentItemWithIdentifier(file, folder, {}, item()); },
         "move item \"" + file + "\" to parent \"" + folder + "\""},
        {"trash", [this] { vessel->trashItemWithIdentifier(file, item()); },
         "trash item \"" + file + "\""},
        {"untrash", [this] { vessel->untrashItemWithIdentifier(file, folder, item()); },
         "untrash item \"" + file + "\""},
        {"delete", [this] { vessel->deleteItemWithIdentifier(file, done.errorHandler()); },
         "delete item \"" + file + "\""},
    };
  }
  LocalVessel::ItemHandler item() { return done.handler(); }

  std::string folder;
  std::string file;
};

TEST_F(OperationsTest, EachAnswersWithTheItemAsItIsAfterwards) {
  fake.volume.makeFolder("/elsewhere");
  fake.volume.writeFile("/elsewhere/new.txt", "123");
  vessel->importDocumentAtURL(URL::fileURL("/elsewhere/new.txt"), folder, item());
  EXPECT_EQ(done.item()->fileURL().path(), fake.path("folder/new.txt"));
  EXPECT_EQ(done.item()->documentSize(), Number::of(std::int64_t{3}));
  EXPECT_EQ(done.item()->parentItemIdentifier(), folder);
  EXPECT_TRUE(existsAt("/elsewhere/new.txt"));

  clear();
  vessel->createDirectoryWithName("made", "#org.example.draw", item());
  const std::string made = done.item()->itemIdentifier();
  EXPECT_EQ(done.item()->parentItemIdentifier(), "#org.example.draw");
  EXPECT_EQ(done.item()->childItemCount(), 0);

  clear();
  vessel->renameItemWithIdentifier(file, "b.txt", item());
  EXPECT_EQ(done.item()->itemIdentifier(), file);
  EXPECT_EQ(done.item()->filename(), "b.txt");

  clear();
  vessel->reparentItemWithIdentifier(file, made, {}, item());
  EXPECT_EQ(done.item()->itemIdentifier(), file);
  EXPECT_EQ(done.item()->parentItemIdentifier(), made);
  EXPECT_EQ(done.item()->filename(), "b.txt");
  EXPECT_EQ(done.item()->vs_appContainerBundleIdentifier(), "org.example.draw");

  clear();
  vessel->reparentItemWithIdentifier(file, folder, "c.txt", item());
  EXPECT_EQ(done.item()->fileURL().path(), fake.path("folder/c.txt"));

  clear();
  vessel->deleteItemWithIdentifier(folder, done.errorHandler());
  EXPECT_EQ(done.item(), nullptr);
  EXPECT_FALSE(exists("folder"));
}

TEST_F(OperationsTest, WhatTheHostsURLHasCachedIsNotBelieved) {
  const URL stale = URL::fileURL(fake.path("b.txt"));
  ResourceValues wrong;
  wrong.fileID = 4711;
  wrong.documentID = 4711;
  wrong.typeIdentifier = "inode/directory";
  stale.resources().fill(wrong);
  stale.resources().setAttributeNames({});
  fake.reports.outcome = stale;
  vessel->renameItemWithIdentifier(file, "b.txt", item());
  EXPECT_EQ(done.item()->itemIdentifier(), file);
  EXPECT_EQ(done.item()->typeIdentifier(), "text/plain");
}

TEST_F(OperationsTest, NothingIsWrittenIntoTheRoot) {
  const std::function<void()> refused[] = {
      [&] { vessel->importDocumentAtURL(fake.url("a.txt"), rootItem, item()); },
      [&] { vessel->createDirectoryWithName("made", rootItem, item()); },
      [&] { vessel->reparentItemWithIdentifier(file, rootItem, {}, item()); },
      [&] { vessel->reparentItemWithIdentifier("fid=4711", rootItem, "b", item()); },
  };
  for (const auto& start : refused) {
    clear();
    start();
    EXPECT_EQ(done.error(), Error::file(FileErrorCode::writeNotPermitted));
    EXPECT_EQ(fake.faults.calls(), 0U);
    EXPECT_THAT(log.messages(), IsEmpty());
    EXPECT_EQ(log.sectionLabels().size(), 1U);
  }
  EXPECT_FALSE(exists("made"));

  // A library's own folder is left to the file operation.
  clear();
  vessel->renameItemWithIdentifier("#org.example.draw", "Documents", item());
  EXPECT_EQ(done.item()->itemIdentifier(), "#org.example.draw");
}

TEST_F(OperationsTest, AnUnknownIdentifierIsNamedAndNothingIsTouched) {
  // Import, create folder and rename say nothing about it: the host has the lookup's error.
  const auto line = [](const std::string& identifier) {
    return error("can't find URL matching identifier " + identifier + "; " +
                 Error::nonExistentItem(identifier).description());
  };
  struct Case {
    std::function<void()> start;
    std::string missing;
    std::vector<LogLine> errors;
    std::vector<std::string> lookedUp;
  };
  const Case cases[] = {
      {[&] { vessel->importDocumentAtURL(fake.url("a.txt"), "#p", item()); }, "#p", {}, {"#p"}},
      {[&] { vessel->createDirectoryWithName("b", "#p", item()); }, "#p", {}, {"#p"}},
      {[&] { vessel->renameItemWithIdentifier("#i", "b", item()); }, "#i", {}, {"#i"}},
      {[&] { vessel->reparentItemWithIdentifier("#i", "#p", {}, item()); },
       "#p",
       {line("#p")},
       {"#p"}},
      {[&] { vessel->reparentItemWithIdentifier("#i", folder, {}, item()); },
       "#i",
       {line("#i")},
       {folder, "#i"}},
      {[&] { vessel->deleteItemWithIdentifier("#i", done.errorHandler()); },
       "#i",
       {line("#i")},
       {"#i"}},
      {[&] { vessel->trashItemWithIdentifier("#i", item()); }, "#i", {line("#i")}, {"#i"}},
      {[&] { vessel->untrashItemWithIdentifier("#i", folder, item()); },
       "#i",
       {line("#i")},
       {"#i"}},
  };
  for (const Case& c : cases) {
    clear();
    c.start();
    EXPECT_EQ(done.error(), Error::nonExistentItem(c.missing));
    auto messages = log.messages();
    std::erase_if(messages, [](const LogLine& l) { return l.level != LogLevel::error; });
    EXPECT_EQ(messages, c.errors);
    auto labels = log.sectionLabels();
    labels.erase(labels.begin());
    for (const std::string& identifier : c.lookedUp) {
      ASSERT_FALSE(labels.empty());
      EXPECT_EQ(labels.front(), "fetching URL for \"" + identifier + "\"");
      labels.erase(labels.begin());
    }
    EXPECT_THAT(labels, IsEmpty());
    for (const Op op : {Op::importUnderFolder, Op::createSubFolder, Op::renameWithNewName,
                        Op::reparentUnderFolder, Op::deleteItem, Op::createDirectory})
      EXPECT_EQ(fake.faults.calls(op), 0U);
  }
}

TEST_F(OperationsTest, TheSectionEndsWhenTheWorkHasBegunAndTheReportComesOnce) {
  for (const Operation& operation : operations()) {
    clear();
    fake.reports.hold();
    operation.start();
    EXPECT_THAT(done.results, IsEmpty()) << operation.name;
    ASSERT_EQ(fake.reports.held(), 1U) << operation.name;
    EXPECT_EQ(log.sectionLabels().front(), operation.label);
    const std::string opening = log.lines().front().text;
    const std::string number = opening.substr(opening.find("┏") + std::string("┏").size());
    EXPECT_EQ(log.lines().back(), debug("┗" + number.substr(0, number.find(' '))));
    fake.reports.release();
    EXPECT_TRUE(done.result()) << operation.name;
  }
}

TEST_F(OperationsTest, ATakenNameIsTheCollisionWithTheItemThatHasIt) {
  fake.volume.writeFile(fake.path("folder/a.txt"));
  fake.volume.makeFolder(fake.path("folder/Inbox"));
  const std::string taken = id("folder/a.txt");
  const std::function<void()> colliding[] = {
      [&] { vessel->importDocumentAtURL(fake.url("a.txt"), folder, item()); },
      [&] { vessel->createDirectoryWithName("a.txt", folder, item()); },
      [&] { vessel->reparentItemWithIdentifier(file, folder, {}, item()); },
  };
  for (const auto& start : colliding) {
    clear();
    start();
    EXPECT_EQ(done.error(), Error::collision(taken));
  }
  clear();
  vessel->renameItemWithIdentifier(file, "folder", item());
  EXPECT_EQ(done.error(), Error::collision(folder));
  // What is in the way is never shown, so there is no item to name.
  clear();
  vessel->createDirectoryWithName("Inbox", folder, item());
  EXPECT_EQ(done.error(), fileExists(fake.url("folder/Inbox")));
}

TEST_F(OperationsTest, OtherErrorsPassUnchanged) {
  const Error cases[] = {Error::file(FileErrorCode::fileExists),  // without what is in the way
                         Error::file(FileErrorCode::writeNotPermitted), Error::posix(ENOSPC),
                         Error::posix(516), Error::collision("fid=1")};
  const std::pair<Op, std::function<void()>> operations[] = {
      {Op::importUnderFolder,
       [&] { vessel->importDocumentAtURL(fake.url("a.txt"), folder, item()); }},
      {Op::createSubFolder, [&] { vessel->createDirectoryWithName("b", folder, item()); }},
      {Op::renameWithNewName, [&] { vessel->renameItemWithIdentifier(file, "b", item()); }},
      {Op::reparentUnderFolder,
       [&] { vessel->reparentItemWithIdentifier(file, folder, {}, item()); }},
      {Op::deleteItem, [&] { vessel->deleteItemWithIdentifier(file, done.errorHandler()); }},
  };
  for (const Error& failure : cases) {
    for (const auto& [op, start] : operations) {
      clear();
      fake.faults.fail(op, failure);
      start();
      EXPECT_EQ(done.error(), failure);
      EXPECT_TRUE(exists("a.txt"));
    }
  }
}

TEST_F(OperationsTest, AChangeWhoseItemCannotBeBuiltStays) {
  vessel->renameItemWithIdentifier(folder, "Inbox", item());
  EXPECT_EQ(done.error(), Error::local(LocalVesselError::invalidItemIdentifier));
  EXPECT_TRUE(exists("Inbox"));
  EXPECT_EQ(log.messages().back(),
            error("identifier lookup failed for URL \"" + fake.path("Inbox") + "\""));
}

// Under a name that has it run before others have started threads.
using OperationsDeathTest = OperationsTest;

TEST_F(OperationsDeathTest, SuccessWithoutAFileURLEndsTheProcess) {
  fake.reports.outcome = URL::fromString("https://example.org");
  EXPECT_DEATH(
      {
        Log::shared().setSink(nullptr, LogLevel::error);
        vessel->renameItemWithIdentifier(file, "b.txt", item());
      },
      "succeeded without a file URL");
}

TEST_F(OperationsTest, TheProviderWaitsForItsOperations) {
  for (const Operation& operation : operations()) {
    clear();
    fake.reports.hold();
    operation.start();
    std::latch isEnding(1);
    std::jthread host([&] {
      isEnding.wait();
      fake.reports.release();
    });
    isEnding.count_down();
    vessel.reset();
    EXPECT_EQ(done.results.size(), 1U) << operation.name;
    vessel = std::make_unique<LocalVessel>(fake.platform(), libraries, libraries);
  }
}

TEST_F(OperationsTest, DefaultContainerIsTheApplicationsLibrary) {
  vessel->_defaultApplicationContainerForBundleIdentifier("org.example.draw", item());
  EXPECT_EQ(done.item()->itemIdentifier(), "#org.example.draw");
  EXPECT_THAT(log.sectionLabels(), ElementsAre("default location for org.example.draw"));
  EXPECT_THAT(log.messages(), IsEmpty());

  fake.applications.installed.push_back({"org.example.bare", {}, "Bare"});
  const std::pair<std::string, std::vector<LogLine>> refused[] = {
      {"org.example.none", {error("can't create bundle proxy with 'org.example.none'")}},
      {"org.example.bare",
       {error("can't create an app library item without a data container URL"),
        error("can't create an app library item with "
              "<BundleProxy bundleIdentifier: org.example.bare, dataContainerURL: (null)>")}},
  };
  for (const auto& [identifier, lines] : refused) {
    clear();
    vessel->_defaultApplicationContainerForBundleIdentifier(
        identifier, [&](LocalVessel::ItemResult result) {
          // Unlike those that end later, this one is over when its completion is.
          EXPECT_THAT(log.lines().back().text, StartsWith("[ERROR]"));
          done.results.push_back(std::move(result));
        });
    EXPECT_EQ(done.error(), Error::invalidParameter("bundleIdentifier", identifier));
    EXPECT_EQ(log.messages(), lines);
  }
}

}  // namespace
}  // namespace mirabel::testing
