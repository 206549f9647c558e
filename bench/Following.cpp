#include "Following.h"

#include <future>
#include <utility>

#include "linux/files/PackageTypes.h"

namespace mirabel::bench {
namespace {

constexpr std::size_t eventsPerRead = 1000;

class Page final : public VesselEnumerationObserver {
 public:
  void didEnumerateItems(const VesselItems& items) override { count += items.size(); }
  void finishEnumeratingUpToPage(const std::optional<Data>& page) override { next = page; }
  void finishEnumeratingWithError(const Error&) override { require(false, "a page is listed"); }

  std::size_t count = 0;
  std::optional<Data> next;
};

class Batch final : public VesselChangeObserver {
 public:
  void didUpdateItems(const VesselItems& items) override { count += items.size(); }
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override {
    count += identifiers.size();
  }
  void finishEnumeratingChangesUpToSyncAnchor(const Data& reached, bool more) override {
    anchor = reached;
    moreComing = more;
    finished.set_value();
  }
  void finishEnumeratingWithError(const Error&) override {
    hasFailed = true;
    finished.set_value();
  }

  std::size_t count = 0;
  Data anchor;
  bool moreComing = false;
  bool hasFailed = false;
  std::promise<void> finished;
};

}  // namespace

OpenIndex::OpenIndex(const std::string& home, Marks marks) : roots_({home + "/Documents"}) {
  VolumeIndex::Options options;
  options.stateFolder = home + "/.local/state/mirabel";
  std::filesystem::create_directories(options.stateFolder);
  options.volumePath = home + "/Documents";
  options.isPackageName = PackageTypes::isPackageName;
  if (marks == Marks::wanted) options.makeWatcher = [] { return makeWatcher(); };
  auto index = VolumeIndex::open(roots_, std::move(options));
  require(index.has_value(), "the index can be opened");
  index_ = std::move(*index);
}

std::uint64_t OpenIndex::sync() const {
  const auto last = index_->currentEventID();
  require(last.has_value(), "the index can be brought in step");
  return *last;
}

std::size_t OpenIndex::read(std::uint64_t& since) const {
  std::size_t count = 0;
  while (true) {
    const auto records = index_->events(since, eventsPerRead);
    require(records.has_value(), "events can be read");
    count += records->size();
    if (!records->empty()) since = records->back().id;
    if (records->size() < eventsPerRead) return count;
  }
}

bool OpenIndex::isFollowing() const {
  return index_->status().following.watcher.has_value();
}

OpenProvider::OpenProvider(const std::string& home) {
  LinuxPlatform::Options options;
  options.home = home;
  provider_ = std::move(HostedProvider::open(std::move(options)).value());
  enumerator_ = provider_->vessel()
                    .enumeratorForContainerItemIdentifier(VesselWorkingSetContainerItemIdentifier,
                                                          LiveUpdates::unwanted)
                    .value();
}

Data OpenProvider::anchor() const {
  std::optional<Data> taken;
  enumerator_->currentSyncAnchor([&](std::optional<Data> answer) { taken = std::move(answer); });
  require(taken.has_value(), "an anchor can be taken");
  return *taken;
}

std::size_t OpenProvider::changes(Data& since) const {
  std::size_t count = 0;
  for (bool more = true; more;) {
    const auto batch = std::make_shared<Batch>();
    enumerator_->enumerateChanges(batch, since);
    batch->finished.get_future().wait();
    require(!batch->hasFailed, "changes are told");
    count += batch->count;
    since = batch->anchor;
    more = batch->moreComing;
  }
  return count;
}

void OpenProvider::list(const std::function<void(std::size_t)>& visit) const {
  std::size_t count = 0;
  Data page = dataFromString(VesselInitialPageSortedByName);
  while (true) {
    Page listed;
    enumerator_->enumerateItems(listed, page);
    count += listed.count;
    visit(count);
    if (!listed.next) return;
    page = *listed.next;
  }
}

}  // namespace mirabel::bench
