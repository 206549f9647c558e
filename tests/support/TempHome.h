#pragma once

#include <string>
#include <string_view>
#include <sys/types.h>

#include "foundation/URL.h"

namespace mirabel::testing {

/// A home folder of its own, with "Documents" in it, removed with everything in it at the end. It
/// lies in $MIRABEL_TEST_DIR, so that the same tests run on any file system; else in $TMPDIR or
/// the system's folder for temporary files. Failures throw.
class TempHome {
 public:
  TempHome();
  ~TempHome();
  TempHome(const TempHome&) = delete;
  TempHome& operator=(const TempHome&) = delete;

  /// Absolute, without symbolic links.
  [[nodiscard]] const std::string& path() const { return path_; }
  [[nodiscard]] std::string documents() const { return path_ + "/Documents"; }
  /// Not there until somebody makes it.
  [[nodiscard]] std::string stateFolder() const { return path_ + "/.local/state/mirabel"; }

  /// Names are relative to "Documents"; the folder itself for "".
  [[nodiscard]] std::string at(std::string_view name) const;
  [[nodiscard]] URL url(std::string_view name = {}) const { return URL::fileURL(at(name)); }

  void makeFolder(std::string_view name) const;
  /// Creates, or replaces the contents of the object that is there.
  void writeFile(std::string_view name, std::string_view contents = {}) const;
  void makeSymlink(std::string_view name, std::string_view target) const;
  void makeFifo(std::string_view name) const;
  void makeSocket(std::string_view name) const;
  void link(std::string_view existing, std::string_view added) const;
  void rename(std::string_view from, std::string_view to) const;
  void setMode(std::string_view name, mode_t mode) const;
  /// With everything below it.
  void remove(std::string_view name) const;

  /// Hands everything that is there to another user. Needs root.
  void giveTo(uid_t user) const;

 private:
  std::string path_;
};

/// Whether files below `folder` can have extended attributes of users.
[[nodiscard]] bool hasUserAttributes(const std::string& folder);

}  // namespace mirabel::testing
