#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include "host/bus/StagedImport.h"
#include "linux/kernel/ObjectStatus.h"
#include "mirabel/UniqueFd.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

using bus::StagedImport;

class Staging : public ::testing::Test {
 protected:
  TempHome home;
  std::string folder = home.path() + "/imports";

  bus::StagedImport stage(const UniqueFd& file, const FileCalls& calls = FileCalls()) {
    return StagedImport::of(file.get(), "name", folder, calls).value();
  }
};

TEST_F(Staging, KeepsThePermissionsThatSomebodyChose) {
  const auto stagedMode = [&](const UniqueFd& file) {
    return statusOf(stage(file).path()).value().mode & 07777;
  };
  home.writeFile("letter.txt", "Dear Aunt");
  const UniqueFd file(::open(home.at("letter.txt").c_str(), O_RDONLY | O_CLOEXEC));
  const std::pair<mode_t, mode_t> cases[] = {
      {0644, 0644}, {0750, 0750}, {0444, 0444}, {04755, 0755}, {0000, 0400}};
  for (const auto& [mode, expected] : cases) {
    ASSERT_EQ(::fchmod(file.get(), mode), 0);
    EXPECT_EQ(stagedMode(file), expected) << std::oct << mode;
  }
  EXPECT_EQ(stagedMode(UniqueFd(::memfd_create("in memory", MFD_CLOEXEC))), 0600u);
}

TEST_F(Staging, IsOfTheFileAsItWasAtOneMoment) {
  constexpr std::size_t size = 1 << 20;
  const UniqueFd file(::memfd_create("written to", MFD_CLOEXEC));
  // Written to in the midst of so many attempts.
  const auto writing = [&](int attempts) {
    return FileCalls([&, attempts, copied = 0](std::string_view call) mutable {
      if (call != "copy contents" || copied == attempts) return 0;
      const std::string contents(size, static_cast<char>('a' + ++copied));
      EXPECT_EQ(::pwrite(file.get(), contents.data(), size, 0), ssize_t{size});
      const timespec times[2] = {{copied, 0}, {copied, 0}};
      EXPECT_EQ(::futimens(file.get(), times), 0);
      return 0;
    });
  };
  ASSERT_EQ(::ftruncate(file.get(), size), 0);
  ASSERT_EQ(::lseek(file.get(), 7, SEEK_SET), 7);
  std::ostringstream contents;
  contents << std::ifstream(stage(file, writing(2)).path()).rdbuf();
  EXPECT_EQ(contents.str(), std::string(size, 'c'));
  EXPECT_EQ(::lseek(file.get(), 0, SEEK_CUR), 7) << "the caller's position";
  const auto never = StagedImport::of(file.get(), "name", folder, writing(1000));
  ASSERT_FALSE(never);
  EXPECT_TRUE(never.error().isPosix(EAGAIN));
  EXPECT_TRUE(std::filesystem::is_empty(folder));
}

TEST_F(Staging, KeepsHolesWhereTheFileCanBeOpenedOnceMore) {
  const UniqueFd file(::memfd_create("sparse", MFD_CLOEXEC));
  constexpr off_t size = off_t{1} << 30;
  ASSERT_EQ(::ftruncate(file.get(), size), 0);
  ASSERT_EQ(::pwrite(file.get(), "end", 3, size - 3), 3);
  const auto staged = stage(file);
  struct stat status {};
  ASSERT_EQ(::stat(staged.path().c_str(), &status), 0);
  EXPECT_EQ(status.st_size, size);
  EXPECT_LT(status.st_blocks * 512, size / 100);
}

TEST_F(Staging, LeavesNothingWhenItIsToStop) {
  const UniqueFd file(::memfd_create("large", MFD_CLOEXEC));
  ASSERT_EQ(::ftruncate(file.get(), 1 << 20), 0);
  const FileCalls stopping([](std::string_view) { return ECANCELED; });
  const auto staged = StagedImport::of(file.get(), "name", folder, stopping);
  ASSERT_FALSE(staged);
  EXPECT_TRUE(staged.error().isPosix(ECANCELED));
  EXPECT_TRUE(std::filesystem::is_empty(folder));
}

}  // namespace
}  // namespace mirabel::testing
