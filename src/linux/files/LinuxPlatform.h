#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "linux/files/LinuxVesselManager.h"
#include "linux/operations/OperationProgress.h"
#include "linux/volume/VolumeIndex.h"
#include "linux/watch/FolderWatcher.h"
#include "mirabel/Error.h"
#include "platform/EventStreams.h"
#include "platform/IconService.h"
#include "platform/NotificationCenter.h"
#include "platform/Platform.h"

namespace mirabel {

class LinuxApplicationRegistry;

/// The platform on Linux for one home folder: resolves what it works on once, opens the volume's
/// index, and owns every interface of `Platform`. Owned by the program; `platform()` may be used
/// from any thread as long as this lives.
class LinuxPlatform {
 public:
  struct Options {
    /// The home folder. Absent: $HOME, or else what the user database says, and $XDG_STATE_HOME
    /// counts. Given: everything hangs below it and no XDG variable counts.
    std::optional<std::string> home{};
    /// The document storage; absent: "Documents" in the home folder. It may be a symbolic link.
    std::optional<std::string> documents{};
    /// Where state is kept; absent: "mirabel" in the XDG state folder.
    std::optional<std::string> stateFolder{};
    /// Hears of changes from the kernel; empty: every question about them is answered by a look at
    /// all files.
    std::function<Result<std::unique_ptr<FolderWatcher>>()> makeWatcher = [] {
      return mirabel::makeWatcher();
    };
    /// Asked before each system call of an operation, see `FileCalls`.
    std::function<int(std::string_view call)> checkFileCall{};
    /// How long to wait for another process that owns the volume.
    std::chrono::milliseconds timeout{30'000};
    /// Told what a person should know: that it has to wait, that a damaged database was set aside.
    std::function<void(std::string_view)> notice{};
    /// Told once, on any thread, when calls fail until all of this is opened anew, and why, for
    /// people: an error of the disk has made the volume's state unusable, or the document storage
    /// is on another volume now. It may wake somebody, and call nothing of this.
    std::function<void(std::string_view why)> broken{};
  };

  /// Makes nothing but the state folder. A document storage that is missing is empty. Errors, with
  /// a detail for people: POSIX ENOENT and ENOTDIR for a home or a document storage that is none;
  /// EINVAL for a document storage below another folder named "Documents", which would take its
  /// trash; those of opening the volume's index.
  [[nodiscard]] static Result<std::unique_ptr<LinuxPlatform>> open(Options options);
  ~LinuxPlatform();
  LinuxPlatform(const LinuxPlatform&) = delete;
  LinuxPlatform& operator=(const LinuxPlatform&) = delete;

  [[nodiscard]] const Platform& platform() const;
  /// The event history of the documents' volume.
  [[nodiscard]] EventStreams& events() const;
  [[nodiscard]] LinuxApplicationRegistry& applications() const;
  [[nodiscard]] IconService& icons() const;
  /// From now on it is told when applications are installed or removed, and once at the start, for
  /// what may have happened since the last look; a command that ends soon need not hear of it. Not
  /// thread-safe.
  void watchApplications();
  /// Where that is told.
  [[nodiscard]] NotificationCenter& notifications() const;
  /// Gives the signals to whoever listens.
  [[nodiscard]] LinuxVesselManager& manager() const;
  /// How far the operations on files have come.
  [[nodiscard]] const OperationProgress& progress() const;
  /// How changes are followed, and what the history holds.
  [[nodiscard]] VolumeIndex& index() const;
  /// Absolute and resolved.
  [[nodiscard]] const std::string& home() const;
  [[nodiscard]] const std::string& stateFolder() const;

 private:
  struct Parts;
  explicit LinuxPlatform(std::unique_ptr<Parts> parts);
  std::unique_ptr<Parts> parts_;
};

}  // namespace mirabel
