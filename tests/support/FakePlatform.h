#pragma once

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/DiagnosticReporter.h"
#include "platform/Platform.h"
#include "support/FakeApplications.h"
#include "support/FakeCacheFiles.h"
#include "support/FakeReports.h"
#include "support/FakeVolume.h"
#include "support/FaultScript.h"

namespace mirabel::testing {

/// Stands still but for sleeping, which it writes down instead of doing it.
class FakeClock final : public Clock {
 public:
  Date now() override { return time; }
  void sleep(std::chrono::milliseconds duration) override { sleeps.push_back(duration); }

  Date time{1'763'700'000, 0};
  std::vector<std::chrono::milliseconds> sleeps;
};

/// The host's ear: what it was told to ask about, and how it answers. Used by one thread at a time.
struct FakeSignals {
  std::vector<std::string> containers;
  /// What it answers, by container.
  std::map<std::string, Error, std::less<>> refusals;
  bool answers = true;
  /// The handlers of signals and deletions that were not answered.
  std::vector<VesselManager::SignalHandler> waiting;
  /// The domains that were to leave the search index, call by call, and the answer to each.
  std::vector<std::vector<std::string>> deletedDomains;
  std::optional<Error> deletionRefusal;
};

/// Writes the reports down.
class FakeDiagnostics final : public DiagnosticReporter {
 public:
  void report(std::string_view text) override { reports.emplace_back(text); }

  std::vector<std::string> reports;
};

/// Keeps all of them.
class FakePositions final : public ListingPositions {
 public:
  explicit FakePositions(FaultScript& faults) : faults_(faults) {}

  Result<void> keep(std::string_view container, const Data& cursor, const Data& position) override;
  std::optional<Data> find(std::string_view container, const Data& cursor) override;

  std::map<std::pair<std::string, Data>, Data> kept;

 private:
  FaultScript& faults_;
};

/// Every interface of the platform over a volume in memory: what the Linux layer promises, kept
/// without a disk, with failures as scripted. The interfaces may be called from any thread; the
/// volume is set up while nothing else runs.
class FakePlatform {
 public:
  static constexpr DeviceID deviceID = 7;

  explicit FakePlatform(std::string_view documentStorage = "/home/me/Documents");
  ~FakePlatform();

  [[nodiscard]] const Platform& platform() const { return *platform_; }
  /// A URL below the document storage, made step by step; the storage itself for "".
  [[nodiscard]] URL url(std::string_view relative = {}) const;
  [[nodiscard]] std::string path(std::string_view relative) const;
  /// Adds an application that shows its documents, with an empty folder for them in its container.
  BundleProxy install(std::string_view bundleIdentifier, std::string_view container,
                      std::optional<std::string> localizedName = {});
  void uninstall(std::string_view bundleIdentifier);

  FakeVolume volume;
  FaultScript faults;
  FakeApplications applications{faults};
  FakeCacheFiles caches{faults};
  FakeClock clock;
  FakeSignals signals;
  FakeDiagnostics diagnostics;
  FakePositions positions{faults};
  FakeReports reports;
  UUID historyUUID = UUID::fromString("11111111-2222-3333-4444-555555555555").value();

 private:
  struct Interfaces;
  std::unique_ptr<Interfaces> interfaces_;
  std::unique_ptr<Platform> platform_;
};

}  // namespace mirabel::testing
