#pragma once

#include <cerrno>
#include <future>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/ConformanceFixture.h"

// What every implementation of the host's file operations keeps to:
//
//   INSTANTIATE_TEST_SUITE_P(Fake, FileOperationsConformance, ::testing::Values(makeFakeVolume));

namespace mirabel::testing {

/// The one report of an operation, from whatever thread it comes.
template <class Outcome>
class Report {
 public:
  /// A second call ends the process: the promise is kept already.
  std::function<void(Outcome)> handler() {
    return [promise = promise_](Outcome outcome) { promise->set_value(std::move(outcome)); };
  }
  Outcome wait() { return promise_->get_future().get(); }

 private:
  std::shared_ptr<std::promise<Outcome>> promise_ = std::make_shared<std::promise<Outcome>>();
};

/// Names are relative to the document storage, "" being the storage itself.
class FileOperationsConformance : public PlatformConformance {
 protected:
  Result<URL> import(std::string_view source, std::string_view folder) {
    Report<Result<URL>> report;
    operations().vs_importUnderFolder(at(source), at(folder), report.handler());
    return report.wait();
  }
  Result<URL> create(std::string_view folder, std::string_view name) {
    Report<Result<URL>> report;
    operations().vs_createSubFolder(at(folder), name, report.handler());
    return report.wait();
  }
  Result<URL> rename(std::string_view item, std::string_view name) {
    Report<Result<URL>> report;
    operations().vs_renameWithNewName(at(item), name, report.handler());
    return report.wait();
  }
  Result<URL> reparent(std::string_view item, std::string_view folder,
                       std::optional<std::string> name = {},
                       Bouncing bouncing = Bouncing::refused) {
    Report<Result<URL>> report;
    operations().vs_reparentUnderFolder(at(item), at(folder), std::move(name), bouncing,
                                        report.handler());
    return report.wait();
  }
  Result<URL> trash(std::string_view item, std::string_view folder = ".Trash") {
    Report<Result<URL>> report;
    operations().vs_trashUnderFolder(at(item), at(folder), report.handler());
    return report.wait();
  }
  std::optional<Error> remove(std::string_view item) {
    Report<std::optional<Error>> report;
    operations().vs_deleteWithCompletionHandler(at(item), report.handler());
    return report.wait();
  }
  int removeCode(std::string_view item) {
    const auto error = remove(item);
    if (!error) return 0;
    return error->domain == ErrorDomain::posix ? static_cast<int>(error->code) : -1;
  }

  FileOperations& operations() { return platform().operations; }
  bool exists(std::string_view name) {
    return platform().resources.readValues(at(name)).has_value();
  }
  /// The names in a folder, in no order.
  std::vector<std::string> namesIn(std::string_view folder) {
    const auto stream = platform().directories.open(at(folder)).value();
    std::vector<std::string> names;
    while (const auto entry = stream->next())
      if (entry->name != "." && entry->name != "..") names.emplace_back(entry->name);
    return names;
  }
  void expectAt(const Result<URL>& made, std::string_view name) {
    ASSERT_TRUE(made) << made.error().description();
    EXPECT_EQ(made->path(), at(name).path());
  }
};

TEST_P(FileOperationsConformance, WhatIsNoNameIsRefusedAndNothingIsTouched) {
  volume->writeFile("a", "1");
  volume->makeFolder("folder");
  const std::pair<std::string, int> cases[] = {
      {"", EINVAL},
      {".", EINVAL},
      {"..", EINVAL},
      {"b/c", EINVAL},
      {"/", EINVAL},
      {std::string("b\0c", 3), EINVAL},
      {std::string(256, 'n'), ENAMETOOLONG},
  };
  for (const auto& [name, code] : cases) {
    EXPECT_EQ(posixCode(create("folder", name)), code) << name;
    EXPECT_EQ(posixCode(rename("a", name)), code) << name;
    for (const Bouncing bouncing : {Bouncing::refused, Bouncing::allowed})
      EXPECT_EQ(posixCode(reparent("a", "folder", name, bouncing)), code) << name;
  }
  EXPECT_TRUE(exists("a"));
  EXPECT_THAT(namesIn("folder"), ::testing::IsEmpty());
}

TEST_P(FileOperationsConformance, AnyBytesThatAreANameAreTakenAsTheyAre) {
  volume->writeFile("a", "1");
  std::string before = "a";
  for (const std::string& name :
       {std::string("100%"), std::string("new\nline"), std::string("\xff\xfe bytes"),
        std::string(".hidden"), std::string(255, 'n'), std::string("...")}) {
    expectAt(rename(before, name), name);
    EXPECT_EQ(valuesOf(name).size, 1U);
    before = name;
  }
}

TEST_P(FileOperationsConformance, ATakenNameIsACollisionAndNothingIsReplaced) {
  volume->writeFile("a", "12345");
  volume->makeFolder("folder");
  volume->makeFolder("taken");
  volume->writeFile("taken/a", "1");
  volume->makeFolder("taken/empty");
  volume->makeSymlink("taken/link", "nowhere");
  volume->makeFolder("import");
  for (const std::string_view name : {"a", "empty", "link"}) {
    const std::string place = "taken/" + std::string(name);
    volume->writeFile("taken/other", "");
    volume->writeFile("import/" + std::string(name), "12345");
    const std::uint64_t before = fileID(place);
    const Result<URL> outcomes[] = {
        create("taken", name),
        rename("taken/other", name),
        reparent("a", "taken", std::string(name)),
        reparent("folder", "taken", std::string(name)),
        reparent("import/" + std::string(name), "taken"),
        import("import/" + std::string(name), "taken"),
    };
    for (const auto& outcome : outcomes) {
      ASSERT_FALSE(outcome) << name;
      EXPECT_TRUE(outcome.error().is(FileErrorCode::fileExists)) << outcome.error().description();
      EXPECT_EQ(vs_collidingURL(outcome.error()), at(place));
    }
    EXPECT_EQ(fileID(place), before);
    EXPECT_TRUE(exists("a") && exists("folder") && exists("taken/other"));
    EXPECT_TRUE(exists("import/" + std::string(name)));
  }
  EXPECT_EQ(valuesOf("taken/a").size, 1U);
  EXPECT_THAT(namesIn("taken"), ::testing::UnorderedElementsAre("a", "empty", "link", "other"));
}

TEST_P(FileOperationsConformance, AnItemThatMovesKeepsItsIdentityAndAttributes) {
  volume->makeFolder("folder");
  volume->makeFolder(".Trash");
  volume->writeFile("a.txt", "12345");
  ASSERT_TRUE(setAttribute("a.txt", "com.norvane.test", {1}));
  const std::uint64_t file = fileID("a.txt");
  const std::uint32_t document = documentID("a.txt");
  const auto expectSame = [&](std::string_view name) {
    EXPECT_EQ(fileID(name), file) << name;
    EXPECT_EQ(documentID(name, Allocation::never), document) << name;
    EXPECT_EQ(attribute(name, "com.norvane.test"), Data{1}) << name;
    EXPECT_EQ(pathsOf(file), std::vector{at(name).path()});
  };
  expectAt(rename("a.txt", "b.txt"), "b.txt");
  expectSame("b.txt");
  expectAt(reparent("b.txt", "folder"), "folder/b.txt");
  expectSame("folder/b.txt");
  expectAt(reparent("folder/b.txt", "", "c.txt"), "c.txt");
  expectSame("c.txt");
  expectAt(trash("c.txt"), ".Trash/c.txt");
  expectSame(".Trash/c.txt");
  EXPECT_THAT(namesIn(""), ::testing::UnorderedElementsAre("folder", ".Trash"));
}

TEST_P(FileOperationsConformance, ImportCopiesAllThatAFolderHolds) {
  volume->makeFolder("source");
  volume->makeFolder("source/deep");
  volume->makeFolder("source/empty");
  volume->writeFile("source/deep/.hidden", "12345");
  volume->makeSymlink("source/link", "deep/.hidden");
  volume->makeFolder("target");
  ASSERT_TRUE(setAttribute("source/deep", "com.norvane.test", {1}));
  ASSERT_TRUE(setAttribute("source/deep/.hidden", "com.norvane.test", Data(500, 0xff)));

  expectAt(import("source", "target"), "target/source");
  EXPECT_THAT(namesIn("target/source"), ::testing::UnorderedElementsAre("deep", "empty", "link"));
  EXPECT_THAT(namesIn("target/source/empty"), ::testing::IsEmpty());
  EXPECT_EQ(valuesOf("target/source/link").kind, FileKind::symbolicLink);
  EXPECT_EQ(attribute("target/source/deep", "com.norvane.test"), Data{1});
  EXPECT_EQ(attribute("target/source/deep/.hidden", "com.norvane.test"), Data(500, 0xff));
  const auto original = valuesOf("source/deep/.hidden");
  const auto copy = valuesOf("target/source/deep/.hidden");
  EXPECT_EQ(copy.size, 5U);
  EXPECT_EQ(copy.contentModificationDate, original.contentModificationDate);
  EXPECT_EQ(valuesOf("target/source/deep").contentModificationDate,
            valuesOf("source/deep").contentModificationDate);
  EXPECT_NE(copy.fileID, original.fileID);

  // The copy is a thing of its own.
  volume->writeFile("target/source/deep/.hidden", "1");
  EXPECT_EQ(valuesOf("source/deep/.hidden").size, 5U);
  EXPECT_NE(documentID("source/deep/.hidden"), documentID("target/source/deep/.hidden"));
}

TEST_P(FileOperationsConformance, BouncingTakesTheWantedNameOrElseOneThatIsFree) {
  volume->makeFolder("folder");
  volume->makeFolder("a");
  std::vector<std::string> taken;
  for (const std::string& name :
       {std::string("a.txt"), std::string("plain"), std::string(".hidden"), std::string(255, 'n'),
        std::string(251, 'n') + ".txt"}) {
    volume->writeFile("a/" + name, "12345");
    expectAt(reparent("a/" + name, "folder", {}, Bouncing::allowed), "folder/" + name);
    for (int time = 0; time < 3; ++time) {
      volume->writeFile("a/other", "");
      const std::uint64_t file = fileID("a/other");
      const auto made = reparent("a/other", "folder", name, Bouncing::allowed);
      ASSERT_TRUE(made) << name << "; " << made.error().description();
      EXPECT_EQ(made->deletingLastPathComponent(), at("folder"));
      EXPECT_NE(made->lastPathComponent(), name);
      EXPECT_EQ(made->lastPathComponent().ends_with(".txt"), name.ends_with(".txt"));
      EXPECT_EQ(pathsOf(file), std::vector{made->path()});
    }
    EXPECT_EQ(valuesOf("folder/" + name).size, 5U);
  }
  EXPECT_THAT(namesIn("folder"), ::testing::SizeIs(5 * 4));
}

TEST_P(FileOperationsConformance, TrashKeepsAllThatHaveTheSameName) {
  volume->makeFolder(".Trash");
  std::vector<std::uint64_t> files;
  for (int time = 0; time < 3; ++time) {
    volume->writeFile("a.txt", std::string(static_cast<std::size_t>(time), 'x'));
    files.push_back(fileID("a.txt"));
    const auto trashed = trash("a.txt");
    ASSERT_TRUE(trashed);
    EXPECT_EQ(pathsOf(files.back()), std::vector{trashed->path()});
    EXPECT_FALSE(exists("a.txt"));
  }
  EXPECT_EQ(fileID(".Trash/a.txt"), files.front());
  EXPECT_THAT(namesIn(".Trash"), ::testing::SizeIs(3));
  volume->makeFolder("a.txt");
  volume->writeFile("a.txt/inside", "");
  const auto folder = trash("a.txt");
  ASSERT_TRUE(folder);
  EXPECT_EQ(valuesOf(".Trash/" + std::string(folder->lastPathComponent()) + "/inside").size, 0U);
}

TEST_P(FileOperationsConformance, AnItemThatIsAlreadyThereStays) {
  volume->makeFolder("folder");
  volume->writeFile("folder/a", "1");
  const std::uint64_t file = fileID("folder/a");
  expectAt(rename("folder/a", "a"), "folder/a");
  expectAt(reparent("folder/a", "folder"), "folder/a");
  expectAt(reparent("folder/a", "folder", "a", Bouncing::allowed), "folder/a");
  EXPECT_EQ(fileID("folder/a"), file);
  EXPECT_THAT(namesIn("folder"), ::testing::ElementsAre("a"));
}

TEST_P(FileOperationsConformance, AFolderDoesNotGoIntoItself) {
  volume->makeFolder("a");
  volume->makeFolder("a/b");
  volume->makeFolder("a/b/c");
  volume->makeFolder("ab");
  for (const std::string_view target : {"a", "a/b", "a/b/c"}) {
    for (const Bouncing bouncing : {Bouncing::refused, Bouncing::allowed})
      EXPECT_EQ(posixCode(reparent("a", target, {}, bouncing)), EINVAL) << target;
    EXPECT_EQ(posixCode(trash("a", target)), EINVAL) << target;
  }
  EXPECT_TRUE(exists("a/b/c"));
  expectAt(reparent("a", "ab"), "ab/a");  // a name that begins alike is another folder
  EXPECT_TRUE(exists("ab/a/b/c"));
}

TEST_P(FileOperationsConformance, DeleteRemovesWholeTreesAndOneNameOfAHardLink) {
  volume->makeFolder("a");
  volume->makeFolder("a/deep");
  volume->makeFolder("a/deep/deeper");
  volume->writeFile("a/.hidden", "");
  volume->writeFile("a/deep/deeper/file", "");
  volume->makeFifo("a/fifo");
  volume->makeSymlink("a/deep/link", "deeper");
  volume->writeFile("linked", "1");
  volume->link("linked", "a/linked");
  EXPECT_EQ(removeCode("a"), 0);
  EXPECT_FALSE(exists("a"));
  EXPECT_EQ(removeCode("a"), ENOENT);
  EXPECT_EQ(valuesOf("linked").linkCount, 1U);
  EXPECT_EQ(removeCode("linked"), 0);
  EXPECT_THAT(namesIn(""), ::testing::IsEmpty());
}

TEST_P(FileOperationsConformance, ASymbolicLinkIsTheItemAndIsNotFollowed) {
  volume->makeFolder("folder");
  volume->writeFile("folder/file", "1");
  volume->makeFolder("other");
  volume->makeFolder(".Trash");
  volume->makeSymlink("link", "folder");
  const std::uint64_t link = fileID("link");
  expectAt(rename("link", "renamed"), "renamed");
  expectAt(reparent("renamed", "other"), "other/renamed");
  expectAt(trash("other/renamed"), ".Trash/renamed");
  EXPECT_EQ(fileID(".Trash/renamed"), link);
  expectAt(import(".Trash/renamed", "other"), "other/renamed");
  EXPECT_EQ(valuesOf("other/renamed").kind, FileKind::symbolicLink);
  EXPECT_EQ(removeCode(".Trash/renamed"), 0);
  EXPECT_TRUE(exists("folder/file"));

  // Nor is one that stands where a folder is wanted.
  volume->makeSymlink("link", "folder");
  volume->writeFile("a", "");
  const auto isRefusal = ::testing::AnyOf(ELOOP, ENOTDIR);
  EXPECT_THAT(posixCode(create("link", "b")), isRefusal);
  EXPECT_THAT(posixCode(import("a", "link")), isRefusal);
  EXPECT_THAT(posixCode(reparent("a", "link")), isRefusal);
  EXPECT_THAT(posixCode(trash("a", "link")), isRefusal);
  EXPECT_THAT(posixCode(rename("link/file", "b")), isRefusal);
  EXPECT_THAT(removeCode("link/file"), isRefusal);
  EXPECT_THAT(namesIn("folder"), ::testing::ElementsAre("file"));
  EXPECT_TRUE(exists("a"));
}

TEST_P(FileOperationsConformance, WhatIsMissingOrNoFolderIsThePOSIXErrorForIt) {
  volume->writeFile("file", "1");
  volume->makeFolder("folder");
  EXPECT_EQ(posixCode(import("missing", "folder")), ENOENT);
  EXPECT_EQ(posixCode(rename("missing", "b")), ENOENT);
  EXPECT_EQ(posixCode(reparent("missing", "folder")), ENOENT);
  EXPECT_EQ(posixCode(trash("missing", "folder")), ENOENT);
  EXPECT_EQ(removeCode("missing"), ENOENT);
  for (const auto& [folder, code] : {std::pair{"missing", ENOENT}, std::pair{"file", ENOTDIR}}) {
    EXPECT_EQ(posixCode(create(folder, "b")), code);
    EXPECT_EQ(posixCode(import("folder", folder)), code);
    EXPECT_EQ(posixCode(reparent("folder", folder)), code);
    EXPECT_EQ(posixCode(trash("folder", folder)), code);
    EXPECT_EQ(removeCode(std::string(folder) + "/b"), code);
  }
  EXPECT_THAT(namesIn(""), ::testing::UnorderedElementsAre("file", "folder"));
}

TEST_P(FileOperationsConformance, ReadWriteAccessIsToTheItemAndItsErrorIsHandedOn) {
  volume->writeFile("a", "1");
  volume->makeFolder("folder");
  volume->makeSymlink("link", "a");
  const auto write = [](AttributeTarget& target) -> std::optional<Error> {
    const auto outcome = target.set("com.norvane.test", {1});
    return outcome ? std::nullopt : std::optional(outcome.error());
  };
  const auto expectError = [&](std::string_view name, const FileOperations::AccessBlock& block,
                               int code) {
    const auto error = operations().vs_withReadWriteAccess(at(name), block);
    ASSERT_TRUE(error) << name;
    EXPECT_TRUE(error->isPosix(code)) << name << "; " << error->description();
  };
  for (const std::string_view name : {"a", "folder"}) {
    EXPECT_FALSE(operations().vs_withReadWriteAccess(at(name), write)) << name;
    EXPECT_EQ(attribute(name, "com.norvane.test"), Data{1}) << name;
  }
  expectError("link", write, EPERM);
  EXPECT_FALSE(attribute("link", "com.norvane.test"));
  expectError(
      "missing",
      [](AttributeTarget&) -> std::optional<Error> {
        ADD_FAILURE() << "there is nothing to write";
        return {};
      },
      ENOENT);
  expectError(
      "a", [](AttributeTarget&) { return std::optional(Error::posix(ENOSPC)); }, ENOSPC);
}

}  // namespace mirabel::testing
