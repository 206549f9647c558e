#include "linux/files/LinuxPlatform.h"
#include "platform/CacheFilesConformance.h"
#include "platform/Conformance.h"
#include "platform/FileOperationsConformance.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

class LinuxVolumeUnderTest final : public Volume {
 public:
  const Platform& platform() override { return linux_->platform(); }
  void makeFolder(std::string_view name) override { home_.makeFolder(name); }
  void writeFile(std::string_view name, std::string_view contents) override {
    home_.writeFile(name, contents);
  }
  void makeSymlink(std::string_view name, std::string_view target) override {
    home_.makeSymlink(name, target);
  }
  void makeFifo(std::string_view name) override { home_.makeFifo(name); }
  void link(std::string_view existing, std::string_view added) override {
    home_.link(existing, added);
  }
  void rename(std::string_view from, std::string_view to) override { home_.rename(from, to); }
  void remove(std::string_view name) override { home_.remove(name); }
  std::string packageName() const override { return "letter.quill"; }

 private:
  TempHome home_;
  std::unique_ptr<LinuxPlatform> linux_ = LinuxPlatform::open({.home = home_.path()}).value();
};

std::unique_ptr<Volume> makeLinuxVolume() {
  return std::make_unique<LinuxVolumeUnderTest>();
}

INSTANTIATE_TEST_SUITE_P(Linux, PlatformConformance, ::testing::Values(makeLinuxVolume));
INSTANTIATE_TEST_SUITE_P(Linux, FileOperationsConformance, ::testing::Values(makeLinuxVolume));

}  // namespace
}  // namespace mirabel::testing
