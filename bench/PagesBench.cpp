// One folder of 100,000 files, handed over in pages of 200 as a host asks for them. Reading to the
// offset anew for each page is quadratic: the last page would cost five hundred times the first. So
// what counts is what all pages cost beside one pass over the open folder that makes the same items
// in the same steps, and what the last page costs beside the first: in one process, and with a new
// provider for each page, which knows no more than the volume's state.
#include <algorithm>
#include <cstdio>
#include <memory>
#include <optional>

#include "BenchHome.h"
#include "fs/FSDirectoryWalk.h"
#include "host/HostedProvider.h"
#include "items/ItemBatch.h"

namespace mirabel::bench {
namespace {

constexpr const char* allRow = "all pages of 200 / one pass over the open folder";
constexpr const char* oneProcessRow = "last pages / first pages, one process";
constexpr const char* newProvidersRow = "last pages / first pages, a new provider each";
constexpr std::uint64_t pageSize = 200;

class Page final : public VesselEnumerationObserver {
 public:
  void didEnumerateItems(const VesselItems& items) override { count += items.size(); }
  void finishEnumeratingUpToPage(const std::optional<Data>& page) override { next = page; }
  void finishEnumeratingWithError(const Error&) override {
    require(false, "a page is handed over");
  }

  std::size_t count = 0;
  std::optional<Data> next;
};

/// A provider with everything that listing takes. The end of it is the end of a process.
class Provider {
 public:
  explicit Provider(const BenchHome& home) {
    LinuxPlatform::Options options;
    options.home = home.path();
    provider_ = std::move(HostedProvider::open(std::move(options)).value());
  }

  std::shared_ptr<VesselEnumerator> enumerator(const std::string& container) {
    return provider_->vessel()
        .enumeratorForContainerItemIdentifier(container, LiveUpdates::unwanted)
        .value();
  }
  std::string containerOf(const std::string& folder) const {
    return provider_->vessel().persistentIdentifierForItemAtURL(URL::fileURL(folder)).value();
  }
  /// The pass over the open folder.
  std::size_t pass(const std::string& folder) {
    const Platform& platform = provider_->platform();
    FSDirectoryWalk walk({{URL::fileURL(folder)}}, platform.directories, platform.resources);
    std::size_t count = 0;
    std::vector<URL> entries;
    do {
      entries.clear();
      const auto visit = [&](const URL& url) -> Result<void> {
        entries.push_back(url);
        return {};
      };
      require(walk.next(pageSize, visit).has_value(), "the folder is read");
      count += makeItems(provider_->vessel().itemContext(), entries).value().size();
    } while (entries.size() == pageSize);
    return count;
  }

 private:
  std::unique_ptr<HostedProvider> provider_;
};

struct Listing {
  std::size_t items = 0;
  std::vector<double> pages;  ///< seconds of each full page
};

Page take(VesselEnumerator& enumerator, const Data& at, Listing& listing) {
  Page page;
  const double seconds = secondsOf([&] { enumerator.enumerateItems(page, at); });
  if (page.count == pageSize) listing.pages.push_back(seconds);
  listing.items += page.count;
  return page;
}

/// What the pages at one end cost, a few of them, for one alone is noise.
double endOf(const Listing& listing, bool last) {
  const std::size_t few = std::min<std::size_t>(20, listing.pages.size() / 2);
  require(few > 1, "there are pages to compare");
  // The very first one compares the index with the disk.
  const auto begin =
      last ? listing.pages.end() - static_cast<std::ptrdiff_t>(few) : listing.pages.begin() + 1;
  return median(std::vector<double>(begin, begin + static_cast<std::ptrdiff_t>(few)));
}

void benchOneProcess(const BenchHome& home, const std::string& folder, const Scale& scale) {
  Comparison all{allRow, {}, {}, 1.2};
  Comparison ends{oneProcessRow, {}, {}, 1.5};
  if (!scale.includes(all.name) && !scale.includes(ends.name)) return;
  Provider provider(home);
  const auto enumerator = provider.enumerator(provider.containerOf(folder));
  enumerator->currentSyncAnchor([](const auto&) {});
  provider.pass(folder);
  for (int round = 0; round < scale.rounds; ++round) {
    all.reference.push_back(secondsOf(
        [&] { require(provider.pass(folder) == scale.files, "the pass meets all files"); }));
    Listing listing;
    all.ours.push_back(secondsOf([&] {
      std::optional<Data> next = dataFromString(VesselInitialPageSortedByName);
      while (next)
        next = take(*enumerator, *next, listing).next;
    }));
    require(listing.items == scale.files, "the pages hold all files");
    ends.ours.push_back(endOf(listing, true));
    ends.reference.push_back(endOf(listing, false));
  }
  print(all);
  print(ends);
}

/// The first and the last pages of a listing in providers of their own, those between in one go. A
/// page is measured behind the look at the volume that a new provider begins with.
void benchNewProviders(const BenchHome& home, const std::string& folder, const Scale& scale) {
  Comparison ends{newProvidersRow, {}, {}, 1.5};
  if (!scale.includes(ends.name)) return;
  const std::size_t pages = scale.files / pageSize;
  const std::size_t few = std::min<std::size_t>(20, pages / 2);
  for (int round = 0; round < scale.rounds; ++round) {
    Listing listing;
    std::optional<Data> next = dataFromString(VesselInitialPageSortedByName);
    std::unique_ptr<Provider> provider;
    std::shared_ptr<VesselEnumerator> enumerator;
    for (std::size_t page = 0; next; ++page) {
      if (page <= few + 1 || page + few >= pages) {
        enumerator.reset();
        provider.reset();
        provider = std::make_unique<Provider>(home);
        enumerator = provider->enumerator(provider->containerOf(folder));
        enumerator->currentSyncAnchor([](const auto&) {});
      }
      next = take(*enumerator, *next, listing).next;
    }
    require(listing.items == scale.files, "the pages hold all files");
    ends.ours.push_back(endOf(listing, true));
    ends.reference.push_back(endOf(listing, false));
  }
  print(ends);
}

}  // namespace

void runPagesBenchmarks(const Scale& scale) {
  if (!scale.includesAny({allRow, oneProcessRow, newProvidersRow})) return;
  const BenchHome home;
  const std::string folder = home.makeFolder("paged", scale.files);
  benchOneProcess(home, folder, scale);
  benchNewProviders(home, folder, scale);
}

}  // namespace mirabel::bench
