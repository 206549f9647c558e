#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

namespace mirabel {

/// What the kernel's records say of one name in a folder. Never a fact to replay, for records are
/// merged and the disk may be ahead: it says where to look, and what to take for certain there.
struct Look {
  bool entryChanged = false;    ///< the name came, left, or stands for something else
  bool contentChanged = false;  ///< what it stands for was written to, or its attributes were
  bool isOfFolder = false;      ///< what came or left was a folder, at least once
  /// Handles of the objects that were linked, unlinked or written to under this name, where the
  /// kernel says so: they may have other names, which show that too.
  std::vector<std::string> objects;
  /// Handles of the objects that were unlinked under this name; "?" where the kernel does not say
  /// which it was.
  std::vector<std::string> unlinked;
};

/// Places to look at, each once: the names in the folders that are watched, by the number under
/// which the folder is. The empty name is the folder itself.
class LookList {
 public:
  using Names = std::unordered_map<std::string, Look>;
  using Folders = std::unordered_map<std::uint64_t, Names>;

  [[nodiscard]] Look& at(std::uint64_t folder, std::string_view name) {
    return folders_[folder][std::string(name)];
  }
  /// Takes in what another list says.
  void merge(Folders other) {
    for (auto& [folder, names] : other) {
      for (auto& [name, look] : names) {
        Look& known = folders_[folder][name];
        known.entryChanged |= look.entryChanged;
        known.contentChanged |= look.contentChanged;
        known.isOfFolder |= look.isOfFolder;
        known.objects.insert(known.objects.end(), look.objects.begin(), look.objects.end());
        known.unlinked.insert(known.unlinked.end(), look.unlinked.begin(), look.unlinked.end());
      }
    }
  }
  [[nodiscard]] bool isEmpty() const { return folders_.empty(); }
  [[nodiscard]] const Folders& folders() const { return folders_; }
  [[nodiscard]] Folders take() { return std::exchange(folders_, {}); }
  void clear() { folders_.clear(); }

 private:
  Folders folders_;
};

}  // namespace mirabel
