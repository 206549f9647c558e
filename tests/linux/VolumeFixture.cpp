#include "linux/VolumeFixture.h"

#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

std::string makeBase(bool inMemory) {
  const char* given = std::getenv("MIRABEL_TEST_DIR");
  const bool canBeInMemory = inMemory && ::access("/dev/shm", W_OK) == 0;
  std::string pattern = given != nullptr ? given
                        : canBeInMemory  ? "/dev/shm"
                                         : std::filesystem::temp_directory_path().string();
  pattern += "/mirabel-volume-XXXXXX";
  if (::mkdtemp(pattern.data()) == nullptr) throw std::runtime_error("can't make " + pattern);
  return std::filesystem::canonical(pattern);
}

}  // namespace

VolumeFixture::VolumeFixture(Where where)
    : base_(makeBase(where == Where::inMemory)),
      documents_(base_ + "/Documents"),
      state_(base_ + "/state") {
  ::mkdir(documents_.c_str(), 0755);
}

VolumeFixture::~VolumeFixture() {
  index_.reset();
  std::filesystem::remove_all(base_);
}

void VolumeFixture::write(std::string_view relative, std::string_view contents) const {
  std::ofstream file(path(relative), std::ios::trunc | std::ios::binary);
  file << contents;
  file.close();
  ASSERT_TRUE(file.good()) << relative;
}

void VolumeFixture::makeFolder(std::string_view relative) const {
  std::filesystem::create_directories(path(relative));
}

void VolumeFixture::rename(std::string_view from, std::string_view to) const {
  ASSERT_EQ(::rename(path(from).c_str(), path(to).c_str()), 0) << from;
}

void VolumeFixture::exchange(std::string_view a, std::string_view b) const {
  ASSERT_EQ(::renameat2(AT_FDCWD, path(a).c_str(), AT_FDCWD, path(b).c_str(), RENAME_EXCHANGE), 0);
}

void VolumeFixture::remove(std::string_view relative) const {
  ASSERT_GT(std::filesystem::remove_all(path(relative)), 0u) << relative;
}

void VolumeFixture::link(std::string_view from, std::string_view to) const {
  ASSERT_EQ(::link(path(from).c_str(), path(to).c_str()), 0);
}

unsigned long VolumeFixture::seedOr(unsigned long otherwise) {
  const char* given = std::getenv("MIRABEL_TEST_SEED");
  return given == nullptr ? otherwise : std::strtoul(given, nullptr, 10);
}

void VolumeFixture::run(const std::string& steps) {
  std::istringstream all(steps);
  for (std::string step; std::getline(all, step, ';');) {
    std::istringstream words(step);
    std::string verb, one, two;
    words >> verb >> one >> two;
    const std::map<std::string, std::function<void()>> verbs{
        {"write", [&] { write(one, two.empty() ? "x" : two); }},
        {"mkdir", [&] { makeFolder(one); }},
        {"mv", [&] { rename(one, two); }},
        {"ln", [&] { link(one, two); }},
        {"swap", [&] { exchange(one, two); }},
        {"rm", [&] { remove(one); }},
        {"look", [&] { see(one); }},
        {"close", [&] { close(); }}};
    verbs.at(verb)();
  }
}

std::uint64_t VolumeFixture::inode(std::string_view relative) const {
  return status(relative).inode;
}

ObjectStatus VolumeFixture::status(std::string_view relative) const {
  ObjectStatus seen = statusOf(path(relative)).value();
  seen.seenAt += age_;
  return seen;
}

Result<std::unique_ptr<VolumeIndex>> VolumeFixture::tryOpen(std::chrono::milliseconds timeout) {
  roots_ = std::make_unique<MonitoredRoots>(std::vector<std::string>{documents_});
  VolumeIndex::Options options;
  options.stateFolder = state_;
  options.volumePath = documents_;
  options.timeout = timeout;
  options.isPackageName = [](std::string_view name) { return name.ends_with(".package"); };
  options.notice = [this](std::string_view line) { notices_.emplace_back(line); };
  options.broken = [this](std::string_view) { ++timesBroken_; };
  options.makeWatcher = makeWatcher_;
  options.followsInBackground = false;
  return VolumeIndex::open(*roots_, std::move(options));
}

VolumeIndex& VolumeFixture::index() {
  if (!index_) index_ = std::move(tryOpen().value());
  return *index_;
}

std::uint64_t VolumeFixture::anchor() {
  const auto id = index().currentEventID();
  EXPECT_TRUE(id) << (id ? "" : id.error().description());
  return id.value_or(0);
}

std::string VolumeFixture::volumeFolder() const {
  return std::filesystem::directory_iterator(state_)->path();
}

Sighting VolumeFixture::see(std::string_view relative) {
  VolumeIndex& opened = index();
  const std::string full = path(relative);
  auto seen = opened.learnPath(full, status(relative), relative.ends_with(".package"));
  EXPECT_TRUE(seen) << relative << ": " << (seen ? "" : seen.error().description());
  return seen.value_or(Sighting{});
}

std::vector<Sighting> VolumeFixture::list(std::string_view folder) {
  VolumeIndex& opened = index();
  const std::string full = folder.empty() ? documents_ : path(folder);
  RawDirectory directory(roots_->open(full, O_RDONLY | O_DIRECTORY).value());
  std::vector<Sighting> result;
  while (auto entry = directory.next().value()) {
    if (entry->name == "." || entry->name == "..") continue;
    const std::string name(entry->name);
    result.push_back(
        {name, statusAt(directory.descriptor(), name).value(), name.ends_with(".package")});
    result.back().status.seenAt += age_;
  }
  auto learned = opened.learn(full, directory.descriptor(), result);
  EXPECT_TRUE(learned) << (learned ? "" : learned.error().description());
  return result;
}

std::string VolumeFixture::findFile(std::uint64_t fileID) {
  auto found = index().pathOfFileID(fileID);
  if (!found) {
    EXPECT_TRUE(found.error().isPosix(ENOENT)) << found.error().description();
    return "";
  }
  return found->substr(documents_.size() + 1);
}

std::string VolumeFixture::findDocument(std::uint32_t documentID) {
  auto fileID = index().fileIDOfDocument(documentID);
  if (!fileID) {
    EXPECT_TRUE(fileID.error().isPosix(ENOENT)) << fileID.error().description();
    return "";
  }
  return findFile(*fileID);
}

}  // namespace mirabel
