#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "foundation/URL.h"
#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// The data containers of applications in one home: a folder of the application's identifier in
/// `pathInHome`. Nothing below the home is reached through a symbolic link. Any thread may call it.
class ContainerFolders {
 public:
  /// Of the folder that holds them all, below the home.
  static constexpr std::string_view pathInHome = ".var/app";

  /// The home's path is absolute and resolved. Documents on another file system than `device` (a
  /// makedev number) are not shown.
  ContainerFolders(const std::string& home, std::uint64_t device);

  /// What was found where an application's documents should be.
  struct Look {
    bool hasDocuments = false;
    std::uint64_t inode = 0;       ///< of the documents, where it has them
    std::string_view reason = {};  ///< why what is there is not shown; of static storage, or empty
  };
  /// The folder of all containers at one moment, to look at many.
  class Opened {
   public:
    /// Errors: passing ones, see `LookFailure`. What lies behind a mount whose server is gone is
    /// as good as not there: it may stay away for long, and would hold up everything else.
    [[nodiscard]] Result<Look> look(const std::string& identifier) const;
    /// Why none of them is shown though the folder is there; of static storage, or empty.
    [[nodiscard]] std::string_view reason() const { return reason_; }

   private:
    friend ContainerFolders;
    Opened() = default;
    UniqueFd folder_;  // closed where there is none
    std::uint64_t device_ = 0;
    std::string_view reason_;
  };
  /// The same errors.
  [[nodiscard]] Result<Opened> open() const;

  [[nodiscard]] URL containerOf(std::string_view identifier) const;
  /// Of the application whose documents are at `url`, by the path alone; empty when it can be none.
  /// Paths are compared in canonical form.
  [[nodiscard]] std::string identifierAt(const URL& url) const;

 private:
  std::string home_;
  std::string prefix_;     // of the paths of containers
  std::string canonical_;  // the same in canonical form
  std::uint64_t device_;
};

}  // namespace mirabel
