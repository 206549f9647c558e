#include <algorithm>
#include <atomic>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <map>
#include <random>
#include <thread>

#include "host/bus/RemoteDocuments.h"
#include "platform/EnumerationObservers.h"
#include "platform/VesselManager.h"
#include "soak/ServedHome.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

constexpr int kills = 50;
constexpr int mostUnderway = 50;
// Every name has it, so that a search finds everything.
constexpr const char* word = "document";

using Items = std::map<std::string, ItemRecord>;

/// Changes a tree at random, by itself and through the service, until it is told to end.
class Writer {
 public:
  Writer(const TempHome& home, Documents& documents, std::string folder, unsigned seed)
      : home_(home), documents_(documents), folder_(std::move(folder)), random_(seed) {
    thread_ = std::jthread([this](const std::stop_token& stop) {
      while (!stop.stop_requested()) {
        step();
        ++steps_;
        steps_.notify_all();
      }
    });
  }
  /// Returns when nothing is changed any more.
  ~Writer() {
    thread_ = {};
    for (int now = underway_; now > 0; now = underway_)
      underway_.wait(now);
  }
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;

  void waitForSteps(int count) const {
    for (int now = steps_; now < count; now = steps_)
      steps_.wait(now);
  }

 private:
  std::string someName() { return std::string(word) + " " + std::to_string(random_() % 40); }
  void step() {
    std::error_code ignored;
    const std::string name = someName();
    const std::string other = someName();
    switch (random_() % 6) {
      case 0:
        std::ofstream(home_.at("one/" + name)) << other;  // which fails where it is a folder
        break;
      case 1:
        std::filesystem::rename(home_.at("one/" + name), home_.at("two/" + other), ignored);
        break;
      case 2:
        std::filesystem::rename(home_.at("two/" + name), home_.at("one/" + other), ignored);
        break;
      case 3:
        std::filesystem::remove_all(home_.at("two/" + name), ignored);
        break;
      case 4:
        // A client that waits for no answer would have more of them than the bus allows.
        if (underway_ > mostUnderway) break;
        ++underway_;
        documents_.createDirectory(name, folder_, [this](const Documents::ItemResult&) {
          --underway_;
          underway_.notify_all();
        });
        break;
      default:
        std::ofstream(home_.at("two/.unseen")) << other;
        std::filesystem::rename(home_.at("two/.unseen"), home_.at("two/" + name), ignored);
    }
  }

  const TempHome& home_;
  Documents& documents_;
  const std::string folder_;
  std::mt19937 random_;
  std::atomic<int> steps_ = 0;
  std::atomic<int> underway_ = 0;
  std::jthread thread_;
};

/// A program that keeps a copy of the working set.
class Mirror {
 public:
  explicit Mirror(Documents& documents)
      : documents_(documents),
        container_(documents.container(VesselWorkingSetContainerItemIdentifier).value()),
        anchor_(container_->currentSyncAnchor().value()),
        items_(listing()) {}

  Items listing() {
    Items items;
    std::optional<Data> page = dataFromString(VesselInitialPageSortedByName);
    while (page) {
      ItemPage answer = container_->items(*page).value();
      for (ItemRecord& item : answer.items)
        add(items, std::move(item));
      page = std::move(answer.nextPage);
    }
    return items;
  }
  Result<void> catchUp() {
    for (bool more = true; more;) {
      auto changes = container_->changes(anchor_);
      if (!changes) return fail(changes.error());
      for (const std::string& identifier : changes->deleted)
        items_.erase(identifier);
      for (ItemRecord& item : changes->updated)
        add(items_, std::move(item));
      anchor_ = changes->anchor;
      more = changes->moreComing;
    }
    return {};
  }
  [[nodiscard]] const Items& items() const { return items_; }
  std::vector<std::string> found() {
    SearchQuery query;
    query.words = {word};
    query.limit = 10'000;
    std::vector<std::string> identifiers;
    const auto items = documents_.search(query).value();
    for (const ItemRecord& item : items)
      identifiers.push_back(item.itemIdentifier);
    std::sort(identifiers.begin(), identifiers.end());
    return identifiers;
  }

 private:
  // Where it lies is no property of an item: it changes with a folder above it.
  static void add(Items& items, ItemRecord item) {
    item.path.clear();
    const std::string identifier = item.itemIdentifier;
    items[identifier] = std::move(item);
  }

  Documents& documents_;
  std::unique_ptr<DocumentContainer> container_;
  Data anchor_;
  Items items_;
};

/// What is not the same, a line each.
std::string difference(const Items& held, const Items& listed) {
  std::string text;
  for (const auto& [identifier, item] : held) {
    const auto found = listed.find(identifier);
    if (found != listed.end() && found->second == item) continue;
    text += identifier + " is held as " + item.filename + " in " + item.parentItemIdentifier;
    text += found == listed.end() ? " and not listed\n"
                                  : " and listed as " + found->second.filename + " in " +
                                        found->second.parentItemIdentifier + "\n";
  }
  for (const auto& [identifier, item] : listed)
    if (!held.contains(identifier)) text += identifier + " " + item.filename + " is not held\n";
  return text;
}

TEST(KilledService, KeepsAnchorsAndTheSearchIndexThroughFiftyKills) {
  const TempHome home;
  home.makeFolder("one");
  home.makeFolder("two");
  ServedHome served(home.path());
  const auto documents = bus::RemoteDocuments::connect({home.path(), home.stateFolder()});
  ASSERT_NE(documents, nullptr);
  const std::string folder = documents->itemAtPath(home.at("two")).value().itemIdentifier;
  Mirror mirror(*documents);
  for (unsigned round = 0; round < kills; ++round) {
    {
      const Writer writer(home, *documents, folder, round);
      writer.waitForSteps(static_cast<int>(std::mt19937(round)() % 300));
      served.kill();
      served.start();
    }
    const auto caughtUp = mirror.catchUp();
    ASSERT_TRUE(caughtUp) << caughtUp.error().description() << " in round " << round;
    ASSERT_EQ(difference(mirror.items(), mirror.listing()), "") << "round " << round;
    std::vector<std::string> named;
    for (const auto& [identifier, item] : mirror.items())
      if (item.filename.starts_with(word)) named.push_back(identifier);
    ASSERT_EQ(mirror.found(), named) << "round " << round;
  }
}

}  // namespace

}  // namespace mirabel::testing
