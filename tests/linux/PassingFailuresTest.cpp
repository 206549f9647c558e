// A look that fails for the moment tells nothing: neither is what was looked at gone, nor are its
// changes forgotten.
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <sys/resource.h>

#include "linux/FailingLooks.h"
#include "linux/PrivateMount.h"
#include "linux/VolumeFixture.h"

namespace mirabel {
namespace {

class PassingFailuresTest : public VolumeFixture, public ::testing::WithParamInterface<bool> {
 protected:
  PassingFailuresTest() : VolumeFixture(Where::inMemory) {}

  void SetUp() override {
    if (GetParam()) makeWatcher_ = [] { return makeWatcher(); };
    makeFolder("a/b");
    makeFolder("c");
    for (const char* name : names_)
      write(name);
    anchor();
    for (const char* name : names_)
      files_[name] = file(name);
  }

  ::testing::AssertionResult isAtOrUnknown(const Result<std::string>& found, const char* name) {
    if (!found && !found.error().isPosix(ENOENT)) return ::testing::AssertionSuccess();
    if (found && *found == path(name)) return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure() << name << " is " << found.value_or("gone");
  }

  /// What events since then name, with whether it is there.
  std::map<std::string, bool> told(std::uint64_t since) {
    std::map<std::string, bool> paths;
    const auto records = index().events(since, 10'000'000);
    for (const JournalRecord& record : records.value()) {
      if (record.isDocument) continue;
      const std::string name = record.path.substr(documents_.size() + 1);
      paths[name] = std::filesystem::exists(path(name));
    }
    return paths;
  }

  const std::vector<const char*> names_{"a/f", "a/b/deep", "c/g", "c/h"};
  std::map<std::string, std::uint64_t> files_;
};

TEST_P(PassingFailuresTest, NothingIsTakenForGoneThatCouldNotBeLookedAt) {
  for (const int failure : {EIO, ENOMEM, ENOTCONN, ESTALE}) {
    for (const char* name : names_) {
      const std::uint64_t since = anchor();
      for (int n = 1;; ++n) {
        const FailingNthLook failing(n, failure, 1000);
        const auto found = index().pathOfFileID(files_[name]);
        EXPECT_TRUE(isAtOrUnknown(found, name)) << n;
        if (!failing.wasMet()) break;
      }
      EXPECT_EQ(told(since), (std::map<std::string, bool>())) << name << " " << failure;
    }
  }
}

TEST_P(PassingFailuresTest, NorWhileItIsSearchedFor) {
  for (int n = 1;; ++n) {
    run("mv a/f c/moved; mv a/b c/b");
    bool wasMet = false;
    {
      const FailingNthLook failing(n, EIO);
      for (const auto& [id, place] :
           {std::pair{files_["a/f"], "c/moved"}, std::pair{files_["a/b/deep"], "c/b/deep"}}) {
        const auto found = index().pathOfFileID(id);
        EXPECT_TRUE(isAtOrUnknown(found, place)) << n;
      }
      wasMet = failing.wasMet();
    }
    EXPECT_EQ(findFile(files_["a/f"]), "c/moved") << n;
    EXPECT_EQ(findFile(files_["a/b/deep"]), "c/b/deep") << n;
    run("mv c/moved a/f; mv c/b a/b");
    anchor();
    if (!wasMet) break;
  }
}

TEST_P(PassingFailuresTest, ACatchUpThatFailsIsMadeUpForByTheNext) {
  for (int n = 1;; ++n) {
    const std::uint64_t since = anchor();
    write("c/g", std::string(static_cast<std::size_t>(n), 'g'));
    run("mv a/f c/moved; rm c/h; mkdir d; mv a/b d/b");
    bool wasMet = false;
    {
      const FailingNthLook failing(n, EIO);
      static_cast<void>(index().currentEventID());
      wasMet = failing.wasMet();
    }
    anchor();
    const std::map<std::string, bool> events = told(since);
    for (const auto& [name, isThere] : std::map<std::string, bool>{
             {"a/f", false}, {"c/moved", true}, {"c/g", true}, {"c/h", false}, {"d/b", true}}) {
      ASSERT_TRUE(events.contains(name)) << n << ": " << name;
      EXPECT_EQ(events.at(name), isThere) << n << ": " << name;
    }
    EXPECT_FALSE(events.contains("d/b/deep") && !events.at("d/b/deep")) << n;
    EXPECT_EQ(file("c/moved"), files_["a/f"]) << n;
    EXPECT_EQ(file("d/b/deep"), files_["a/b/deep"]) << n;
    EXPECT_EQ(file("c/g"), files_["c/g"]) << n;
    run("mv c/moved a/f; mv d/b a/b; rm d; write c/h");
    if (!wasMet) break;
  }
}

TEST_P(PassingFailuresTest, AnErrorNamesWhatCouldNotBeLookedAt) {
  const FailingLooks failing(
      [](int, const char* name) { return std::string_view(name) == "h" ? EIO : 0; });
  const auto compared = index().reconcile();
  ASSERT_FALSE(compared);
  EXPECT_NE(compared.error().description().find(path("c/h")), std::string::npos);
}

TEST_P(PassingFailuresTest, ADeadMountIsUnreadableAndTheRestIsFollowed) {
  makeFolder("m/server");
  auto mounted = std::make_unique<PrivateMount>(path("m/server"));
  if (!mounted->isThere()) GTEST_SKIP() << "may not mount";
  close();  // what is open belongs to the mounts of before
  const auto unreadable = [this] { return index().status().following.unreadableFolders; };
  {
    const FailingLooks failing(
        [](int, const char* name) { return std::string_view(name) == "server" ? ENOTCONN : 0; });
    const std::uint64_t since = anchor();
    write("c/g", "longer");
    ASSERT_TRUE(index().currentEventID());
    EXPECT_TRUE(told(since).contains("c/g"));
    EXPECT_EQ(unreadable(), 1U);
    ASSERT_TRUE(index().reconcile());
    EXPECT_EQ(unreadable(), 1U);
  }
  mounted.reset();
  remove("m");
  anchor();
  EXPECT_EQ(unreadable(), 0U);
}

TEST_P(PassingFailuresTest, OfAnotherVolumeInThePlaceOfTheDocumentsNothingIsTold) {
  const std::uint64_t since = anchor();
  const auto isRefused = [](const auto& answer) {
    return !answer && answer.error().isPosix(EMEDIUMTYPE);
  };
  const auto expectRefused = [&](std::uint64_t known) {
    EXPECT_TRUE(isRefused(index().learnPath(path("new"), status(""), false)));
    EXPECT_TRUE(isRefused(index().learn(documents_, AT_FDCWD, {})));
    EXPECT_TRUE(isRefused(index().pathOfFileID(known)));
    EXPECT_TRUE(isRefused(index().fileIDOfDocument(1)));
    EXPECT_TRUE(isRefused(index().currentEventID()));
    EXPECT_TRUE(isRefused(index().events(0, 1)));
    EXPECT_FALSE(index().status().isUsable);
  };
  auto mounted = std::make_unique<PrivateMount>(documents_);
  if (!mounted->isThere()) GTEST_SKIP() << "may not mount";
  write("new");
  expectRefused(files_["c/g"]);
  EXPECT_EQ(timesBroken_, 1);
  close();
  EXPECT_EQ(document("new"), 1U) << "it is the first of its volume";
  anchor();
  const std::uint64_t mountedFile = file("new");
  mounted.reset();
  expectRefused(mountedFile);
  close();
  anchor();
  EXPECT_EQ(told(since), (std::map<std::string, bool>()));
  for (const char* name : names_)
    EXPECT_EQ(findFile(files_[name]), name);
}

TEST_P(PassingFailuresTest, TooManyOpenFilesIsNoDeletion) {
  const std::uint64_t since = anchor();
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_NOFILE, &before), 0);
  for (rlim_t most = 3; most < 40; ++most) {
    rlimit few = before;
    few.rlim_cur = most;
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &few), 0);
    const auto found = index().pathOfFileID(files_["a/b/deep"]);
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &before), 0);
    EXPECT_TRUE(isAtOrUnknown(found, "a/b/deep")) << most;
  }
  anchor();
  EXPECT_EQ(told(since), (std::map<std::string, bool>()));
}

TEST(LookFailures, OfADeadMountSayThatItIsOneAndOthersStayWhatTheyAre) {
  for (const int failure : {ENOTCONN, ESTALE, EIO, EHOSTDOWN, ETIMEDOUT, ENODEV}) {
    const FailingLooks failing([failure](int, const char*) { return failure; });
    EXPECT_TRUE(statusOf("/proc").error().isPosix(EXDEV)) << failure;
    EXPECT_TRUE(statusOf("/proc/self").error().isPosix(failure == ESTALE ? EREMOTEIO : failure));
  }
  const FailingLooks failing([](int, const char*) { return ENOENT; });
  EXPECT_TRUE(statusOf("/proc").error().isPosix(ENOENT));
}

TEST(ChangeTimes, AreSettledWhenTheNextChangeMustHaveAnotherOne) {
  constexpr std::int64_t second = nanosecondsPerSecond;
  constexpr std::int64_t fine = 7 * second + 123'456'789;
  EXPECT_FALSE(isSettled(fine, fine));
  EXPECT_FALSE(isSettled(fine, fine + second / 10));
  EXPECT_TRUE(isSettled(fine, fine + second / 10 + 1));
  for (const std::int64_t coarse : {7 * second, 7 * second + 250'000'000}) {
    EXPECT_FALSE(isSettled(coarse, coarse + 2 * second));
    EXPECT_TRUE(isSettled(coarse, coarse + 3 * second + 1));
  }
}

INSTANTIATE_TEST_SUITE_P(Watched, PassingFailuresTest, ::testing::Bool());

}  // namespace
}  // namespace mirabel
