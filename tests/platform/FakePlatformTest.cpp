#include "platform/CacheFilesConformance.h"
#include "platform/Conformance.h"
#include "platform/FileOperationsConformance.h"
#include "support/FakePlatform.h"

namespace mirabel::testing {
namespace {

class FakeVolumeUnderTest final : public Volume {
 public:
  const Platform& platform() override { return fake_.platform(); }
  void makeFolder(std::string_view name) override { fake_.volume.makeFolder(at(name)); }
  void writeFile(std::string_view name, std::string_view contents) override {
    fake_.volume.writeFile(at(name), contents);
  }
  void makeSymlink(std::string_view name, std::string_view target) override {
    fake_.volume.makeSymlink(at(name), target);
  }
  void makeFifo(std::string_view name) override { fake_.volume.makeFifo(at(name)); }
  void link(std::string_view existing, std::string_view added) override {
    fake_.volume.link(at(existing), at(added));
  }
  void rename(std::string_view from, std::string_view to) override {
    fake_.volume.rename(at(from), at(to));
  }
  void remove(std::string_view name) override { fake_.volume.remove(at(name)); }
  std::string packageName() const override { return "letter.quill"; }

 private:
  std::string at(std::string_view name) const { return fake_.path(name); }

  FakePlatform fake_;
};

std::unique_ptr<Volume> makeFakeVolume() {
  return std::make_unique<FakeVolumeUnderTest>();
}

INSTANTIATE_TEST_SUITE_P(Fake, PlatformConformance, ::testing::Values(makeFakeVolume));
INSTANTIATE_TEST_SUITE_P(Fake, FileOperationsConformance, ::testing::Values(makeFakeVolume));

}  // namespace
}  // namespace mirabel::testing
