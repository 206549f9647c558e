#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <sys/inotify.h>
#include <unordered_map>
#include <vector>

#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// Where applications come and go: paths that need not exist.
struct ApplicationPlaces {
  std::vector<std::string> directories;  ///< of entries
  std::string containers;                ///< the folder that holds all data containers
};

/// Hears from the kernel that the set of applications may have changed: an entry, a container, or
/// the document folder in a container. Folders that do not exist yet are waited for. One thread at
/// a time.
class ApplicationWatches {
 public:
  struct Bounds {
    std::size_t watches = 25'000;  ///< of all kinds
    std::size_t containers = 20'000;
    std::size_t foldersOfEntries = 1'000;  ///< in one directory
  };
  /// Watches nothing before `arm`.
  ApplicationWatches(ApplicationPlaces places, Bounds bounds);

  /// Watches everything anew. What happens after it has returned is not missed where `isComplete`.
  void arm();

  /// What may have happened.
  struct Changes {
    bool registered = false;    ///< something was made, moved in or changed
    bool unregistered = false;  ///< something was removed or moved away
  };
  /// Reads what the kernel has queued by now, without waiting. When it returns, what is new is
  /// watched.
  [[nodiscard]] Changes drain();

  /// Becomes readable when there is something to drain. Negative when nothing can be watched.
  /// Another one after `arm` and `drain`.
  [[nodiscard]] int descriptor() const { return instance_.get(); }
  /// Whether all there is is watched: false where the user's watches ran out.
  [[nodiscard]] bool isComplete() const { return isComplete_; }

 private:
  enum class Role {
    above,       ///< of a folder that is waited for, or may be replaced
    entries,     ///< a directory of entries, or a folder in it
    containers,  ///< the folder that holds all containers
    container,
  };
  struct Watched {
    Role role;
    std::string path;
    std::string awaited = {};  ///< the name that counts in a folder above
    unsigned depth = 0;        ///< of a folder of entries below its directory
  };
  struct Record {
    int watch;
    std::uint32_t mask;
    std::string_view name;
    [[nodiscard]] bool isAnyOf(std::uint32_t bits) const { return (mask & bits) != 0; }
  };

  void watchChain(const std::string& target, Role role);
  void watchFoldersOfEntries(const std::string& directory, unsigned depth);
  void watchContainers();
  /// The watch's number, or negative with errno set.
  int add(Watched folder);
  void note(int watch, Watched folder);

  void take(const Record& record, Changes& changes);
  void takeInFolder(const Watched& folder, const Record& record, Changes& changes);
  void takeOfFolder(const Record& record, Changes& changes);
  [[nodiscard]] bool counts(const Watched& folder, const Record& record) const;
  void extend(const Watched& folder, const Record& record);

  const ApplicationPlaces places_;
  const Bounds bounds_;
  UniqueFd instance_;
  // One folder may be watched for several reasons, and has one watch.
  std::unordered_map<int, std::vector<Watched>> watched_;
  std::size_t containers_ = 0;
  bool isComplete_ = false;
  bool mustRearm_ = false;
};

}  // namespace mirabel
