#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/stat.h>

#include "host/bus/StagedImport.h"
#include "mirabel/UniqueFd.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

using bus::StagedImport;

class Staging : public ::testing::Test {
 protected:
  TempHome home;
  std::string folder = home.path() + "/imports";
  std::stop_source stopping;
};

TEST_F(Staging, KeepsThePermissionsThatSomebodyChose) {
  const auto stagedMode = [&](const UniqueFd& file) {
    const auto staged = StagedImport::of(file.get(), "name", folder, stopping.get_token());
    struct stat status {};
    EXPECT_TRUE(staged && ::stat(staged->path().c_str(), &status) == 0);
    return status.st_mode & 07777;
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

TEST_F(Staging, LeavesNothingWhenItIsToStop) {
  const UniqueFd file(::memfd_create("large", MFD_CLOEXEC));
  ASSERT_EQ(::ftruncate(file.get(), 1 << 20), 0);
  stopping.request_stop();
  const auto staged = StagedImport::of(file.get(), "name", folder, stopping.get_token());
  ASSERT_FALSE(staged);
  EXPECT_TRUE(staged.error().isPosix(ECANCELED));
  EXPECT_TRUE(std::filesystem::is_empty(folder));
}

}  // namespace
}  // namespace mirabel::testing
