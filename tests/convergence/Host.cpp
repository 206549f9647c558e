#include "convergence/Host.h"

#include <gtest/gtest.h>
#include <stdexcept>
#include <utility>

#include "host/ItemRecords.h"
#include "host/LocalContainer.h"
#include "mirabel/Values.h"

namespace mirabel::testing {
namespace {

std::string text(const std::optional<Date>& date) {
  return date ? date->rfc3339() : "-";
}

HeldItem heldItem(const ItemRecord& item) {
  std::string properties = item.typeIdentifier;
  const auto add = [&](const std::string& value) { properties += " | " + value; };
  add(item.documentSize ? item.documentSize->description() : "-");
  add(text(item.creationDate));
  add(text(item.contentModificationDate));
  add(item.childItemCount ? std::to_string(*item.childItemCount) : "-");
  add(std::to_string(item.capabilities));
  add(item.isTrashed ? "trashed" : "-");
  add(text(item.lastUsedDate));
  add(item.tagData ? std::string(stringView(*item.tagData)) : "-");
  add(item.favoriteRank ? item.favoriteRank->description() : "-");
  add(item.fileID ? std::to_string(*item.fileID) : "-");
  return {item.parentItemIdentifier, item.filename, properties};
}

class PageCollector final : public VesselEnumerationObserver {
 public:
  void didEnumerateItems(const VesselItems& items) override {
    for (const auto& item : items)
      collected.push_back(recordOf(*item));
  }
  void finishEnumeratingUpToPage(const std::optional<Data>& page) override { next = page; }
  void finishEnumeratingWithError(const Error& failure) override {
    ADD_FAILURE() << failure.description();
  }

  std::vector<ItemRecord> collected;
  std::optional<Data> next;
};

}  // namespace

Host::Host(const std::string& home) {
  LinuxPlatform::Options options;
  options.home = home;
  options.makeWatcher = [faults = faults_] { return makeFaultyWatcher(makeWatcher(), faults); };
  auto opened = HostedProvider::open(std::move(options));
  if (!opened) throw std::runtime_error(opened.error().description());
  provider_ = std::move(*opened);
}

std::string Host::identifierOf(const std::string& path) const {
  return provider_->vessel().persistentIdentifierForItemAtURL(URL::fileURL(path)).value_or("");
}

void Host::refreshAppLibraries() {
  MRBAppLibraryManager& libraries = provider_->libraries();
  libraries.refreshFromRegistry();
  libraries.upgradeFromMainCache();
  libraries.followLibraries(provider_->linuxPlatform().events());
}

std::shared_ptr<VesselEnumerator> Host::enumerator(const std::string& container) {
  if (const auto known = enumerators_.find(container); known != enumerators_.end()) {
    return known->second;
  }
  auto made = provider_->vessel().enumeratorForContainerItemIdentifier(container);
  EXPECT_TRUE(made) << container << ": " << (made ? "" : made.error().description());
  if (made && container.starts_with("Vessel")) enumerators_[container] = *made;
  return made.value_or(nullptr);
}

// A client of a folder holds what has that folder as its parent.
void Host::apply(Replica& replica, const ItemRecord& item) {
  const bool isFolder = replica.container != VesselWorkingSetContainerItemIdentifier &&
                        replica.container != VesselAllDirectoriesContainerItemIdentifier;
  if (isFolder && item.parentItemIdentifier != replica.container) {
    replica.items.erase(item.itemIdentifier);
    return;
  }
  HeldItem held = heldItem(item);
  // The working set is told of app libraries when they come or go, not of what they are called or
  // of their dates and counts.
  const bool isLibrary = item.itemIdentifier.starts_with('#');
  if (isLibrary && replica.container == VesselWorkingSetContainerItemIdentifier) {
    held.filename = "library";
    held.text.clear();
  }
  replica.items.insert_or_assign(item.itemIdentifier, std::move(held));
}

Replica Host::list(const std::string& container) {
  Replica replica{container, {}, {}};
  const auto enumerating = enumerator(container);
  if (!enumerating) return replica;
  replica.anchor = currentAnchorOf(*enumerating).value();
  Data page = dataFromString(VesselInitialPageSortedByName);
  while (true) {
    PageCollector collector;
    enumerating->enumerateItems(collector, page);
    for (const ItemRecord& item : collector.collected) {
      EXPECT_FALSE(replica.items.contains(item.itemIdentifier))
          << container << ": " << item.filename << " is listed twice";
      apply(replica, item);
    }
    if (!collector.next) return replica;
    page = *collector.next;
  }
}

void Host::catchUp(Replica& replica) {
  const auto enumerating = enumerator(replica.container);
  if (!enumerating) return;
  for (bool more = true; more;) {
    const auto changes = changesSince(*enumerating, replica.anchor);
    if (!changes) {
      ASSERT_TRUE(changes.error().is(VesselErrorCode::syncAnchorExpired))
          << changes.error().description();
      const int restarts = replica.restarts + 1;
      replica = list(replica.container);
      replica.restarts = restarts;
      return;
    }
    for (const ItemRecord& item : changes->updated)
      apply(replica, item);
    for (const std::string& identifier : changes->deleted)
      replica.items.erase(identifier);
    EXPECT_LE(changes->updated.size() + changes->deleted.size(), 100u);
    replica.anchor = changes->anchor;
    more = changes->moreComing;
  }
}

}  // namespace mirabel::testing
