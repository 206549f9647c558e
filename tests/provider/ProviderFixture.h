#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "provider/Lines.h"
#include "provider/LocalVessel.h"
#include "support/FakeAppLibraries.h"
#include "support/FakePlatform.h"

namespace mirabel::testing {

/// Takes down what operations complete with.
class Completions {
 public:
  LocalVessel::ItemHandler handler() {
    return [this](LocalVessel::ItemResult result) { results.push_back(std::move(result)); };
  }
  LocalVessel::ErrorHandler errorHandler() {
    return [this](std::optional<Error> error) {
      if (error)
        results.emplace_back(fail(*std::move(error)));
      else
        results.emplace_back(nullptr);
    };
  }
  /// The only one.
  LocalVessel::ItemResult result() const {
    EXPECT_EQ(results.size(), 1U);
    return results.empty() ? fail(Error::posix(0)) : results.back();
  }
  Error error() const {
    const auto only = result();
    EXPECT_FALSE(only);
    return only ? Error() : only.error();
  }
  std::shared_ptr<LocalItem> item() const {
    const auto only = result();
    EXPECT_TRUE(only) << only.error().description();
    return only.value_or(nullptr);
  }

  std::vector<LocalVessel::ItemResult> results;
};

/// Says of every place that this application has it.
class OneOwner final : public AppLibraryOwners {
 public:
  explicit OneOwner(BundleProxy owner) : owner_(std::move(owner)) {}
  std::optional<BundleProxy> applicationOwning(const URL&) const override { return owner_; }

 private:
  BundleProxy owner_;
};

/// A provider of a document storage with a folder and a file, and of one app library.
class ProviderFixture : public ::testing::Test {
 protected:
  explicit ProviderFixture(std::string_view documentStorage = "/home/me/Documents")
      : fake(documentStorage) {
    fake.install("org.example.draw", "/apps/draw", "Draw");
    fake.volume.makeFolder(fake.path("folder"));
    fake.volume.writeFile(fake.path("a.txt"), "12345");
    vessel = std::make_unique<LocalVessel>(fake.platform(), libraries, libraries);
  }

  std::string idAt(std::string_view path) {
    return vessel->identity().itemIdentifier(URL::fileURL(path)).value();
  }
  std::string id(std::string_view relative) { return idAt(fake.path(relative)); }
  bool existsAt(std::string_view path) { return fake.volume.find(path).has_value(); }
  bool exists(std::string_view relative) { return existsAt(fake.path(relative)); }
  void clear() {
    log.clear();
    done.results.clear();
    fake.faults.reset();
  }

  FakePlatform fake;
  FakeAppLibraries libraries{fake.applications};
  Completions done;
  LogCapture log;
  std::unique_ptr<LocalVessel> vessel;  // waits at its end for what is still to be completed
};

}  // namespace mirabel::testing
