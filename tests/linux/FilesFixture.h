#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <string_view>

#include "linux/files/LinuxPlatform.h"
#include "support/TempHome.h"

namespace mirabel::testing {

/// A home on a real disk and the platform on it, which is opened when it is first asked for.
class FilesTest : public ::testing::Test {
 protected:
  const Platform& platform() {
    if (!linux_) linux_ = LinuxPlatform::open({.home = home.path()}).value();
    return linux_->platform();
  }
  void closePlatform() { linux_.reset(); }

  ResourceValues valuesOf(std::string_view name) {
    return platform().resources.readValues(home.url(name)).value();
  }

  TempHome home;

 private:
  std::unique_ptr<LinuxPlatform> linux_;
};

/// The errno of a failure, 0 for a success, -1 for an error of another domain.
template <class T>
int failureOf(const Result<T>& result) {
  if (result) return 0;
  return result.error().domain == ErrorDomain::posix ? static_cast<int>(result.error().code) : -1;
}

}  // namespace mirabel::testing
