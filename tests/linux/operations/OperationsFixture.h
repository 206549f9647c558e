#pragma once

#include <functional>
#include <future>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "linux/FilesFixture.h"

namespace mirabel::testing {

/// What is visible below a folder: contents by path, "/" for a folder, "-> …" for a link. Hidden
/// names of operations are left out.
using Tree = std::map<std::string, std::string>;

/// A home on a real disk, a platform whose operations can be made to fail or to be interrupted, and
/// its operations as calls that wait.
class OperationsTest : public ::testing::Test {
 protected:
  /// Opened when first asked for; it clears away what was left.
  LinuxPlatform& opened();
  FileOperations& operations() { return opened().platform().operations; }
  void close() { platform_.reset(); }
  /// Asked before each system call of an operation from now on.
  void setCheck(std::function<int(std::string_view)> check) { check_ = std::move(check); }

  /// Before it is opened.
  void addRoot(const std::string& path) { furtherRoots_.push_back(path); }

  Result<URL> import(const std::string& source, std::string_view folder);
  Result<URL> createFolder(std::string_view folder, std::string_view name);
  Result<URL> rename(std::string_view item, std::string_view name);
  Result<URL> move(std::string_view item, std::string_view folder,
                   std::optional<std::string> name = {}, Bouncing bouncing = Bouncing::refused);
  Result<URL> moveURL(const URL& item, const URL& folder, std::optional<std::string> name,
                      Bouncing bouncing);
  Result<URL> trash(std::string_view item);
  std::optional<Error> remove(std::string_view item);

  /// With what is missing above it.
  void makeFolder(std::string_view folder) const;
  [[nodiscard]] Tree tree(std::string_view folder = {}) const;
  /// Hidden names of operations anywhere in the home.
  [[nodiscard]] std::vector<std::string> hiddenNames() const;
  [[nodiscard]] bool hasPendingWork() const;

  TempHome home;

 private:
  Result<URL> wait(const std::function<void(FileOperations::URLHandler)>& operation);

  std::function<int(std::string_view)> check_;
  std::vector<std::string> furtherRoots_;
  std::unique_ptr<LinuxPlatform> platform_;
};

}  // namespace mirabel::testing
