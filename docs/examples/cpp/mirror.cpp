// Keeps a replica of everything that a home shows up to date. A sync client or an indexer does the
// same; its own work begins where this one prints a line. usage: mirror HOME

#include <atomic>
#include <cerrno>
#include <iostream>
#include <map>
#include <optional>
#include <string>
#include <utility>

#include "mirabel/Session.h"

using mirabel::Result;

/// What a container held when it was last brought up to date. A real client keeps both fields on
/// disk, changed in one transaction: the anchor is good for its next start.
class Replica {
 public:
  explicit Replica(mirabel::DocumentContainer& container) : container_(container) {}

  /// Afterwards it is what a fresh listing would show.
  Result<void> bringUpToDate() {
    while (true) {
      auto done = anchor_ ? Result<void>() : listAll();
      if (done) done = applyChanges();
      if (done || !done.error().is(mirabel::VesselErrorCode::syncAnchorExpired)) return done;
      anchor_.reset();  // what has happened since can't be told exactly: all of it again
    }
  }

 private:
  Result<void> listAll() {
    // The anchor comes first, so that what happens during the listing is told afterwards.
    auto anchor = container_.currentSyncAnchor();
    if (!anchor) return fail(anchor.error());
    std::map<std::string, mirabel::ItemRecord> listed;
    std::optional page = mirabel::dataFromString(mirabel::VesselInitialPageSortedByName);
    while (page) {
      auto answer = container_.items(*page);
      if (!answer) return fail(answer.error());
      for (const auto& item : answer->items)
        listed[item.itemIdentifier] = item;
      page = std::move(answer->nextPage);
    }
    items_ = std::move(listed);
    anchor_ = *std::move(anchor);
    std::cout << "listed: " << items_.size() << " items" << std::endl;
    return {};
  }

  Result<void> applyChanges() {
    for (bool more = true; more;) {
      const auto changes = container_.changes(*anchor_);
      if (!changes) return fail(changes.error());
      // Some of it may be known already, or never have been: both are taken as they are.
      for (const auto& identifier : changes->deleted) {
        if (const auto gone = items_.extract(identifier))
          std::cout << "gone: " << gone.mapped().filename << std::endl;
      }
      // Of everything, which this follows, each is to be held. Of a folder, what has another parent
      // would have to go: it has left, or never was in it.
      for (const auto& item : changes->updated) {
        items_[item.itemIdentifier] = item;
        std::cout << "there: " << item.filename << std::endl;
      }
      anchor_ = changes->anchor;
      more = changes->moreComing;
    }
    return {};
  }

  mirabel::DocumentContainer& container_;
  std::map<std::string, mirabel::ItemRecord> items_;
  std::optional<mirabel::Data> anchor_;
};

int main(int argc, char** argv) {
  if (argc != 2) return 2;
  const auto complain = [](const mirabel::Error& error) {
    std::cerr << "mirror: " << error.description() << std::endl;
    return 1;
  };
  const auto documents = mirabel::openDocuments({.home = argv[1]});
  if (!documents) return complain(documents.error());
  const auto everything = mirabel::VesselWorkingSetContainerItemIdentifier;
  const auto container = (*documents)->container(everything);
  if (!container) return complain(container.error());

  // The watch begins before the anchor is taken, so that nothing happens unheard.
  std::atomic changed = true;
  const auto watch = (*documents)->watch(everything, [&] {
    changed = true;
    changed.notify_one();
  });
  if (!watch) return complain(watch.error());

  Replica replica(**container);
  while (true) {
    changed.wait(false);
    changed = false;
    // Without the service there is nothing to ask; the watch tells when it is back.
    const auto done = replica.bringUpToDate();
    if (!done && !done.error().isPosix(ENOTCONN)) return complain(done.error());
  }
}
