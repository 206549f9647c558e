#include <filesystem>
#include <map>
#include <random>

#include "linux/VolumeFixture.h"

namespace mirabel {
namespace {

std::string folderOf(const std::string& path) {
  return std::filesystem::path(path).parent_path();
}

std::string join(const std::string& folder, const std::string& name) {
  return folder.empty() ? name : folder + "/" + name;
}

// Documents and folders under random changes, and where each document must be. A document that was
// saved over is looked at before it changes again: what was moved and saved over unseen is another
// thing to everybody. Only its folders go on moving meanwhile.
class RandomChanges : public VolumeFixture {
 protected:
  struct Document {
    std::uint32_t id = 0;
    bool isUnseen = false;
  };
  using Model = std::map<std::string, Document>;

  std::size_t pick(std::size_t n) { return random_() % n; }
  Model::iterator any() { return std::next(model_.begin(), pick(model_.size())); }
  std::string anyFolder() { return folders_[pick(folders_.size())]; }
  std::string fresh(const char* prefix) { return prefix + std::to_string(fresh_++); }

  void look(Model::value_type& entry) {
    auto& [name, document] = entry;
    if (pick(2) == 0) {
      EXPECT_EQ(this->document(name), document.id) << name;
    } else {
      EXPECT_EQ(findDocument(document.id), name);
    }
    document.isUnseen = false;
  }
  Model::iterator anySeen() {
    const auto entry = any();
    if (entry->second.isUnseen) look(*entry);
    return entry;
  }

  void create() {
    const std::string name = join(anyFolder(), fresh("f"));
    write(name);
    model_[name] = {document(name)};
  }

  void createFolder() {
    if (folders_.size() >= 12) return;
    folders_.push_back(join(anyFolder(), fresh("d")));
    makeFolder(folders_.back());
  }

  void move() {
    const auto from = anySeen();
    const std::string to = join(anyFolder(), fresh("m"));
    rename(from->first, to);
    model_[to] = from->second;
    model_.erase(from);
  }

  void swap() {
    const auto a = anySeen(), b = anySeen();
    if (a == b) return;
    exchange(a->first, b->first);
    std::swap(a->second, b->second);
    // Looked at before one of them can go: unseen, that would have been a save.
    look(*a);
  }

  void removeOne() {
    const auto gone = anySeen();
    look(*gone);
    remove(gone->first);
    if (pick(2) == 0) {
      EXPECT_EQ(findDocument(gone->second.id), "");
    }
    model_.erase(gone);
  }

  void save() {
    const auto saved = any();
    look(*saved);
    const std::string& name = saved->first;
    const std::string backup = name + "~", temporary = join(folderOf(name), fresh("t"));
    const std::size_t way = pick(5);
    if (way == 0 || way == 3 || way == 4) write(temporary, "new");
    if (way == 1 || way == 2) rename(name, backup);
    if (way == 3) exchange(temporary, name);
    if (way == 4) {
      std::filesystem::remove(path(backup));
      link(name, backup);
    }
    if (pick(2) == 0 && way != 3) list(folderOf(name));
    if (way == 0 || way == 4) rename(temporary, name);
    if (way == 1 || way == 2) write(name, "new");
    if (way == 2) remove(backup);
    if (way == 3) remove(temporary);
    saved->second.isUnseen = true;
  }

  void moveFolder() {
    const std::string from = anyFolder();
    if (from.empty()) return;
    file(from);
    const std::string to = join(folderOf(from), fresh("d"));
    rename(from, to);
    const auto moved = [&](const std::string& path) {
      return path == from || path.starts_with(from + "/") ? to + path.substr(from.size()) : path;
    };
    for (std::string& folder : folders_)
      folder = moved(folder);
    Model model;
    for (const auto& [name, document] : model_)
      model[moved(name)] = document;
    model_ = std::move(model);
  }

  void listOne() {
    if (pick(3) == 0) close();
    const std::string folder = anyFolder();
    for (const Sighting& sighting : list(folder)) {
      const auto found = model_.find(join(folder, sighting.name));
      if (found == model_.end()) continue;
      EXPECT_EQ(sighting.documentID, found->second.id) << found->first;
      found->second.isUnseen = false;
    }
  }

  void step() {
    const std::size_t what = pick(10);
    if (what < 2 || model_.empty()) return create();
    if (what == 2) return createFolder();
    if (what == 3) return move();
    if (what == 4) return swap();
    if (what == 5) return removeOne();
    if (what < 8) return save();
    if (what == 8) return moveFolder();
    return listOne();
  }

  void expectEachIdentityOnce() {
    std::map<std::uint32_t, std::string> places;
    for (const std::string& folder : folders_) {
      for (const Sighting& sighting : list(folder)) {
        if (sighting.documentID == 0) continue;
        const std::string name = join(folder, sighting.name);
        const auto [place, isNew] = places.emplace(sighting.documentID, name);
        EXPECT_TRUE(isNew) << place->second << " and " << name;
      }
    }
  }

  std::mt19937 random_;
  std::vector<std::string> folders_ = {""};
  Model model_;
  int fresh_ = 0;
};

TEST_F(RandomChanges, NeverLoseOrMixIdentities) {
  const auto seed = static_cast<unsigned>(seedOr(std::random_device{}()));
  SCOPED_TRACE("MIRABEL_TEST_SEED=" + std::to_string(seed));
  random_.seed(seed);
  for (int i = 0; i < 400 && !HasFailure(); ++i)
    step();
  expectEachIdentityOnce();
  for (Model::value_type& entry : model_)
    look(entry);
}

}  // namespace
}  // namespace mirabel
