#pragma once

#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Platform.h"

namespace mirabel::testing {

/// An empty document storage and the means to change it behind the platform's back, as other
/// programs do. Names are relative to the storage; a failing change throws.
class Volume {
 public:
  virtual ~Volume() = default;
  [[nodiscard]] virtual const Platform& platform() = 0;
  virtual void makeFolder(std::string_view name) = 0;
  /// Creates, or replaces the contents of the object that is there.
  virtual void writeFile(std::string_view name, std::string_view contents) = 0;
  virtual void makeSymlink(std::string_view name, std::string_view target) = 0;
  virtual void makeFifo(std::string_view name) = 0;
  virtual void link(std::string_view existing, std::string_view added) = 0;
  virtual void rename(std::string_view from, std::string_view to) = 0;
  virtual void remove(std::string_view name) = 0;
  /// A name that makes a folder a package.
  [[nodiscard]] virtual std::string packageName() const = 0;
};

using VolumeFactory = std::function<std::unique_ptr<Volume>()>;

/// What every implementation of the platform keeps to. A test program includes a header of rules
/// and instantiates its suite with the factories of its volumes:
///   INSTANTIATE_TEST_SUITE_P(Fake, PlatformConformance, ::testing::Values(makeFakeVolume));
class PlatformConformance : public ::testing::TestWithParam<VolumeFactory> {
 protected:
  const Platform& platform() { return volume->platform(); }

  /// Made anew, so that nothing of it is cached.
  URL at(std::string_view name) {
    const std::string root = platform().manager.documentStorageURL().path();
    return URL::fileURL(name.empty() ? root : root + "/" + std::string(name));
  }
  ResourceValues valuesOf(std::string_view name) {
    return platform().resources.readValues(at(name)).value();
  }
  std::uint64_t fileID(std::string_view name) { return valuesOf(name).fileID; }
  std::uint32_t documentID(std::string_view name, Allocation allocation = Allocation::ifNone) {
    return platform().documents.permanentStorageForItemAtURL(at(name), allocation).value();
  }
  DeviceID device() { return platform().objects.open(at("")).value()->device().value(); }
  Result<std::string> pathOf(std::uint64_t fileID) {
    return platform().objects.pathOfFileID(device(), fileID);
  }
  std::vector<std::string> pathsOf(std::uint64_t fileID) {
    return platform().objects.pathsOfFileID(device(), fileID).value();
  }
  std::uint16_t linkCount(std::string_view name) {
    return platform().objects.status(at(name)).value().linkCount;
  }
  Result<void> setAttribute(std::string_view name, std::string_view attribute, const Data& value) {
    auto target = platform().attributes.open(at(name));
    if (!target) return fail(target.error());
    return (*target)->set(attribute, value);
  }
  Result<Data> attribute(std::string_view name, std::string_view attribute) {
    const auto size = platform().attributes.size(attribute, at(name));
    if (!size) return fail(size.error());
    return platform().attributes.read(attribute, at(name), *size);
  }

  std::unique_ptr<Volume> volume = GetParam()();
};

template <class T>
int posixCode(const Result<T>& result) {
  if (result) return 0;
  return result.error().domain == ErrorDomain::posix ? static_cast<int>(result.error().code) : -1;
}

}  // namespace mirabel::testing
