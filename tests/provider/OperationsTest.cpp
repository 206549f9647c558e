#include <cerrno>
#include <latch>
#include <thread>

#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

using ::testing::IsEmpty;

class OperationsTest : public ProviderFixture {
 protected:
  /// One that ends later than the call.
  struct Operation {
    std::string_view name;
    Op op;
    std::function<void(const std::string& item, const std::string& parent)> start;
    /// What it makes of "a.txt" and "folder".
    std::string made;

    bool writesIntoParent() const { return made.starts_with("folder/"); }
  };

  OperationsTest() : folder(id("folder")), file(id("a.txt")) {
    fake.volume.makeFolder("/elsewhere");
    fake.volume.writeFile("/elsewhere/new.txt", "123");
    log.clear();
  }
  LocalVessel::ItemHandler item() { return done.handler(); }

  const std::string folder;
  const std::string file;
  /// Each succeeds after those before it.
  const std::vector<Operation> operations = {
      {"import", Op::importUnderFolder,
       [this](const std::string&, const std::string& parent) {
         vessel->importDocumentAtURL(URL::fileURL("/elsewhere/new.txt"), parent, item());
       },
       "folder/new.txt"},
      {"create", Op::createSubFolder,
       [this](const std::string&, const std::string& parent) {
         vessel->createDirectoryWithName("made", parent, item());
       },
       "folder/made"},
      {"rename", Op::renameWithNewName,
       [this](const std::string& identifier, const std::string&) {
         vessel->renameItemWithIdentifier(identifier, "b.txt", item());
       },
       "b.txt"},
      {"move", Op::reparentUnderFolder,
       [this](const std::string& identifier, const std::string& parent) {
         vessel->reparentItemWithIdentifier(identifier, parent, "c.txt", item());
       },
       "folder/c.txt"},
      {"trash", Op::trashUnderFolder,
       [this](const std::string& identifier, const std::string&) {
         vessel->trashItemWithIdentifier(identifier, item());
       },
       ".Trash/a.txt"},
      {"untrash", Op::reparentUnderFolder,
       [this](const std::string& identifier, const std::string& parent) {
         vessel->untrashItemWithIdentifier(identifier, parent, item());
       },
       "a.txt"},
      {"delete", Op::deleteItem,
       [this](const std::string& identifier, const std::string&) {
         vessel->deleteItemWithIdentifier(identifier, done.errorHandler());
       },
       ""},
  };
};

TEST_F(OperationsTest, NothingIsWrittenIntoTheRoot) {
  for (const Operation& operation : operations) {
    if (!operation.writesIntoParent()) continue;
    for (const std::string& identifier : {file, std::string("fid=4711")}) {
      clear();
      operation.start(identifier, std::string(VesselRootContainerItemIdentifier));
      EXPECT_EQ(done.error(), Error::file(FileErrorCode::writeNotPermitted)) << operation.name;
      EXPECT_EQ(fake.faults.calls(), 0U) << operation.name;
    }
  }
  // A library's own folder is left to the file operation.
  clear();
  vessel->renameItemWithIdentifier("#org.example.draw", "Documents", item());
  EXPECT_EQ(done.item()->itemIdentifier(), "#org.example.draw");
}

TEST_F(OperationsTest, AnUnknownIdentifierIsNamedAndNothingIsTouched) {
  for (const Operation& operation : operations) {
    const std::string missing = operation.writesIntoParent() ? "#p" : "#i";
    clear();
    operation.start("#i", missing == "#p" ? missing : folder);
    EXPECT_EQ(done.error(), Error::nonExistentItem(missing)) << operation.name;
    EXPECT_EQ(fake.faults.calls(operation.op), 0U) << operation.name;
    EXPECT_EQ(fake.faults.calls(Op::createDirectory), 0U) << operation.name;
  }
  clear();
  vessel->reparentItemWithIdentifier("#i", folder, {}, item());
  EXPECT_EQ(done.error(), Error::nonExistentItem("#i"));
}

TEST_F(OperationsTest, TheSectionEndsWhenTheWorkHasBegunAndTheReportComesOnce) {
  for (const Operation& operation : operations) {
    clear();
    fake.reports.hold();
    operation.start(file, folder);
    EXPECT_THAT(done.results, IsEmpty()) << operation.name;
    ASSERT_EQ(fake.reports.held(), 1U) << operation.name;
    const auto lines = log.lines();
    EXPECT_EQ(lines.size() - log.messages().size(), 2 * log.sectionLabels().size());
    EXPECT_TRUE(lines.back().text.starts_with("[DEBUG] ┗")) << operation.name;
    fake.reports.release();
    EXPECT_TRUE(done.result()) << operation.name;
  }
}

TEST_F(OperationsTest, ATakenNameIsTheCollisionWithTheItemThatHasIt) {
  for (const Operation& operation : operations) {
    if (operation.name == "trash") break;  // which finds another name, as its way back does
    fake.volume.writeFile(fake.path(operation.made));
    clear();
    operation.start(file, folder);
    EXPECT_EQ(done.error(), Error::collision(id(operation.made))) << operation.name;
  }
  // What is in the way is never shown, so there is no item to name.
  fake.volume.makeFolder(fake.path("folder/Inbox"));
  clear();
  vessel->createDirectoryWithName("Inbox", folder, item());
  EXPECT_EQ(done.error(), fileExists(fake.url("folder/Inbox")));
}

TEST_F(OperationsTest, OtherErrorsPassUnchanged) {
  const Error cases[] = {Error::file(FileErrorCode::fileExists),  // without what is in the way
                         Error::file(FileErrorCode::writeNotPermitted), Error::posix(ENOSPC),
                         Error::posix(516), Error::collision("fid=1")};
  for (const Error& failure : cases) {
    for (const Operation& operation : operations) {
      if (operation.name == "untrash") continue;  // of what is not in the trash
      clear();
      fake.faults.fail(operation.op, failure);
      operation.start(file, folder);
      EXPECT_EQ(done.error(), failure) << operation.name;
      EXPECT_TRUE(exists("a.txt")) << operation.name;
    }
  }
}

TEST_F(OperationsTest, AChangeWhoseItemCannotBeBuiltStays) {
  vessel->renameItemWithIdentifier(folder, "Inbox", item());
  EXPECT_EQ(done.error(), Error::local(LocalVesselError::invalidItemIdentifier));
  EXPECT_TRUE(exists("Inbox"));
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
  for (const Operation& operation : operations) {
    clear();
    fake.reports.hold();
    operation.start(file, folder);
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
  fake.applications.installed.push_back({"org.example.bare", {}, "Bare"});
  for (const std::string identifier : {"org.example.none", "org.example.bare"}) {
    clear();
    vessel->_defaultApplicationContainerForBundleIdentifier(identifier, item());
    EXPECT_EQ(done.error(), Error::invalidParameter("bundleIdentifier", identifier));
  }
}

/// With an item in the trash as well, and with operations that are done when the call returns.
class UnreliablePlatform : public OperationsTest {
 public:
  UnreliablePlatform() {
    fake.volume.makeFolder("/apps/draw/Documents/Notes");
    fake.volume.writeFile("/apps/draw/Documents/Notes/b.txt");
    trashed = idAt("/apps/draw/Documents/Notes/b.txt");
    vessel->trashItemWithIdentifier(trashed, Completions().handler());
    all = operations;
    const std::pair<std::string_view, void (*)(UnreliablePlatform&)> others[] = {
        {"rename to a taken name",
         [](auto& s) { s.vessel->renameItemWithIdentifier(s.folder, "a.txt", s.item()); }},
        {"untrash to where it was",
         [](auto& s) { s.vessel->untrashItemWithIdentifier(s.trashed, {}, s.item()); }},
        {"last used date",
         [](auto& s) {
           s.vessel->setLastUsedDate(Date{1, 0}, s.file, s.item());
         }},
        {"tags", [](auto& s) { s.vessel->setTagData({}, s.file, s.item()); }},
        {"favorite rank", [](auto& s) { s.vessel->setFavoriteRank({}, s.file, s.item()); }},
    };
    for (const auto& [name, start] : others)
      all.push_back({name, {}, [this, start = start](auto&, auto&) { start(*this); }, {}});
  }
  void TestBody() override {}

  /// What comes of it where the `n`-th call fails, and whether there were as many.
  std::pair<LocalVessel::ItemResult, bool> outcomeOf(const Operation& operation, std::size_t n) {
    clear();
    fake.faults.failCall(n, Error::posix(EIO));
    operation.start(operation.name == "untrash" ? trashed : file, folder);
    return {done.result(), fake.faults.calls() >= n};
  }
  /// How many places hold a file of that identifier.
  std::size_t placesOf(const std::string& identifier) {
    const std::uint64_t documentID = std::stoull(identifier.substr(4));
    return fake.volume.pathsOfFileID(fake.volume.fileIDOfDocument(documentID)).size();
  }

  using OperationsTest::file;
  std::string trashed;
  std::vector<Operation> all;
};

TEST(UnreliablePlatformTest, WhicheverCallFailsTheHostIsToldOnceAndNothingIsLost) {
  const std::size_t count = UnreliablePlatform().all.size();
  for (std::size_t i = 0; i < count; ++i) {
    std::size_t n = 0;
    std::size_t failures = 0;
    for (bool wasReached = true; wasReached;) {
      UnreliablePlatform scene;
      const auto& operation = scene.all[i];
      ASSERT_LT(++n, 500U) << operation.name << " never came to an end";
      const auto [outcome, hasFailed] = scene.outcomeOf(operation, n);
      wasReached = hasFailed;
      if (!outcome) ++failures;
      EXPECT_TRUE(outcome || wasReached || operation.name == "rename to a taken name")
          << operation.name << " without a failing call";
      EXPECT_EQ(scene.placesOf(scene.trashed), 1U) << operation.name << " " << n;
      const bool isGone = operation.name == "delete" && outcome;
      EXPECT_EQ(scene.placesOf(scene.file), isGone ? 0U : 1U) << operation.name << " " << n;
    }
    EXPECT_GE(failures, 3U) << i;
  }
}

}  // namespace
}  // namespace mirabel::testing
