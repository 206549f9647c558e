#include <algorithm>
#include <filesystem>
#include <map>
#include <random>
#include <set>
#include <sstream>

#include "linux/KilledProcess.h"
#include "linux/VolumeFixture.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

std::string lineOf(const JournalRecord& record) {
  std::ostringstream line;
  line << "event " << record.id << ' ' << record.fileID << ' ' << record.documentID << ' '
       << record.source << ' ' << record.destination << ' ' << record.path;
  return line.str();
}

/// Processes that change files and ask the index about them are killed at any moment. What they
/// were told must hold for whoever comes after.
class KilledWork : public VolumeFixture {
 protected:
  static constexpr int rounds = 50;
  static constexpr int roundSize = 50;  // things that one process makes, at most

  // Runs in the process. Each thing has a number of its own and is called after it, so that its
  // name tells which one it is wherever it went.
  void work(const KilledProcess::Self& self, int round, std::mt19937_64 random) {
    std::vector<int> things;
    fs::remove(path("tmp"));
    removeThingsBefore((round - 4) * roundSize);
    std::uint64_t since = index().currentEventID().value();
    self.say("history " + index().historyUUID().description());
    for (int number = round * roundSize; number < (round + 1) * roundSize; ++number) {
      const std::string name = "thing" + std::to_string(number);
      write(folderOf(random()) + "/" + name);
      things.push_back(number);
      // Looked at before the next one: a file that is moved and saved unseen is another document.
      index().reconcile().value();
      alter(things[random() % things.size()], random);
      index().reconcile().value();
      const std::size_t told = random() % 4;
      if (told == 0) tellIdentities(self, folderOf(random()));
      if (told == 1) since = tellAnchor(self, since);
    }
  }

  // Few in each: the threads that share a large folder are not there in a forked process.
  static std::string folderOf(std::uint64_t number) { return "sub" + std::to_string(number % 4); }

  std::string placeOf(int number) const {
    const std::string name = "/thing" + std::to_string(number);
    for (std::uint64_t i = 0; i < 4; ++i) {
      if (fs::exists(path(folderOf(i) + name))) return folderOf(i) + name;
    }
    return {};
  }

  void removeThingsBefore(int number) const {
    for (std::uint64_t i = 0; i < 4; ++i) {
      for (const auto& entry : fs::directory_iterator(path(folderOf(i)))) {
        if (std::stoi(entry.path().filename().native().substr(5)) < number) fs::remove(entry);
      }
    }
  }

  void alter(int number, std::mt19937_64& random) const {
    const std::string place = placeOf(number);
    if (place.empty()) return;
    const std::size_t way = random() % 4;
    if (way == 0) {
      write("tmp", "saved");
      rename("tmp", place);
    }
    if (way == 1) rename(place, folderOf(random()) + "/" + fs::path(place).filename().native());
    if (way == 2) remove(place);
    if (way == 3) write(place, std::to_string(random()));
  }

  void tellIdentities(const KilledProcess::Self& self, const std::string& folder) {
    for (const Sighting& seen : list(folder)) {
      self.say("document " + std::to_string(seen.documentID) + " " + seen.name);
    }
  }

  std::vector<JournalRecord> eventsAfter(std::uint64_t since, std::size_t limit = 1'000'000) {
    return index().events(since, limit).value();
  }

  std::uint64_t tellAnchor(const KilledProcess::Self& self, std::uint64_t since) {
    const std::uint64_t last = index().currentEventID().value();
    self.say("anchor " + std::to_string(last));
    for (const JournalRecord& record : eventsAfter(since, 50))
      self.say(lineOf(record));
    return last;
  }

  void take(const std::string& line) {
    std::istringstream words(line);
    std::string what;
    words >> what;
    if (what == "history") {
      EXPECT_EQ(line, "history " + history_.description());
    } else if (what == "anchor") {
      std::uint64_t anchor = 0;
      words >> anchor;
      anchors_.insert(anchor);
    } else if (what == "document") {
      std::uint32_t document = 0;
      std::string name;
      words >> document >> name;
      const auto named = names_.emplace(document, name).first;
      EXPECT_EQ(named->second, name) << "document " << document << " was another thing's";
      EXPECT_EQ(documents_.emplace(name, document).first->second, document) << name;
    } else {
      std::uint64_t id = 0;
      words >> id;
      EXPECT_EQ(events_.emplace(id, line).first->second, line) << "an ID was used twice";
    }
  }

  void checkHistory() {
    ASSERT_EQ(index().historyUUID(), history_);
    const std::uint64_t last = index().currentEventID().value();
    for (const std::uint64_t anchor : anchors_) {
      ASSERT_LE(anchor, last);
      ASSERT_TRUE(index().events(anchor, 1)) << "anchor " << anchor << " is refused";
    }
    std::uint64_t expected = checked_;
    for (const JournalRecord& record : eventsAfter(checked_)) {
      ASSERT_EQ(record.id, ++expected);
      take(lineOf(record));
    }
    ASSERT_TRUE(events_.empty() || events_.rbegin()->first <= last) << "a told event is missing";
  }

  // The client has what it was told, and looks where the events say.
  void checkChanges() {
    for (const JournalRecord& record : eventsAfter(checked_)) {
      if (record.documentID == 0) continue;
      const std::string place = findDocument(record.documentID);
      if (place.empty()) {
        client_.erase(record.documentID);
      } else {
        client_[record.documentID] = place;
      }
    }
    checked_ = index().currentEventID().value();
    std::map<std::uint32_t, std::string> fresh;
    for (std::uint64_t i = 0; i < 4; ++i) {
      for (const Sighting& seen : list(folderOf(i))) {
        fresh[seen.documentID] = folderOf(i) + "/" + seen.name;
        take("document " + std::to_string(seen.documentID) + " " + seen.name);
      }
    }
    std::erase_if(client_, [](const auto& held) { return held.second == "tmp"; });
    EXPECT_EQ(client_, fresh);
  }

  UUID history_;
  std::uint64_t checked_ = 0;
  std::set<std::uint64_t> anchors_;
  std::map<std::uint64_t, std::string> events_;
  std::map<std::uint32_t, std::string> names_;
  std::map<std::string, std::uint32_t> documents_;
  std::map<std::uint32_t, std::string> client_;
};

TEST_F(KilledWork, LeavesAllThatItWasToldStanding) {
  const unsigned long chosen = seedOr(std::random_device()());
  SCOPED_TRACE("MIRABEL_TEST_SEED=" + std::to_string(chosen));
  std::mt19937_64 random(chosen);
  for (std::uint64_t i = 0; i < 4; ++i)
    makeFolder(folderOf(i));
  checked_ = index().currentEventID().value();
  history_ = index().historyUUID();
  close();
  for (int round = 0; round < rounds; ++round) {
    KilledProcess process([&](const KilledProcess::Self& self) { work(self, round, random); });
    // Some while it starts, most while it works, at no moment of its own choosing.
    for (std::uint64_t lines = random() % 8 == 0 ? 0 : random() % 60; lines > 0; --lines) {
      const std::string line = process.line();
      if (line.empty()) break;
      take(line);
    }
    process.listen(static_cast<long>(random() % 12'000));
    for (const std::string& line : process.kill())
      take(line);
    // A few in a row find what a killed one left, as well as what was looked after in between.
    if (random() % 3 != 0 && round + 1 < rounds) continue;
    checkHistory();
    checkChanges();
    close();
    if (HasFailure()) break;
  }
  EXPECT_TRUE(notices_.empty());
  EXPECT_GT(anchors_.size(), 10u);
  EXPECT_GT(names_.size(), 50u);
}

}  // namespace
}  // namespace mirabel
