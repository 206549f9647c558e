#pragma once

#include "enumeration/LocalFileEnumerator.h"
#include "support/ChangeLog.h"
#include "support/FakeEventStreams.h"
#include "support/ItemsFixture.h"

namespace mirabel::testing {

/// One answer to a request for a page.
struct ListedPage {
  std::vector<std::string> names;
  std::vector<std::string> identifiers;
  std::optional<Data> next;
  std::optional<Error> error;
  int batches = 0;
  int finishes = 0;
};

class PageObserver final : public VesselEnumerationObserver {
 public:
  void didEnumerateItems(const VesselItems& items) override {
    EXPECT_EQ(page.finishes, 0);
    ++page.batches;
    for (const auto& item : items) {
      page.names.push_back(item->filename());
      page.identifiers.push_back(item->itemIdentifier());
    }
  }
  void finishEnumeratingUpToPage(const std::optional<Data>& nextPage) override {
    ++page.finishes;
    page.next = nextPage;
  }
  void finishEnumeratingWithError(const Error& error) override {
    ++page.finishes;
    page.error = error;
  }

  ListedPage page;
};

/// An enumeration that reports what the test makes it report.
class FakeChangesEnumeration final : public ChangesEnumeration {
 public:
  FakeChangesEnumeration(const FSChangeToken& startToken, std::vector<URL> folders,
                         std::shared_ptr<VesselChangeObserver> target)
      : token(startToken), urls(std::move(folders)), observer(std::move(target)) {}
  void start() override { hasStarted = true; }
  void stop() override { hasStopped = true; }

  FSChangeToken token;
  std::vector<URL> urls;
  std::shared_ptr<VesselChangeObserver> observer;
  bool hasStarted = false;
  bool hasStopped = false;
};

class FakeChangesEnumerations final : public ChangesEnumerations {
 public:
  std::shared_ptr<ChangesEnumeration> make(
      const FSChangeToken& token, const std::string&, const std::vector<URL>& urls,
      std::shared_ptr<VesselChangeObserver> observer) override {
    auto enumeration = std::make_shared<FakeChangesEnumeration>(token, urls, std::move(observer));
    made.push_back(enumeration);
    return enumeration;
  }

  std::vector<std::weak_ptr<FakeChangesEnumeration>> made;
};

class EnumerationTest : public ItemsFixture {
 protected:
  static inline const std::string workingSet{VesselWorkingSetContainerItemIdentifier};
  static inline const std::string allDirectories{VesselAllDirectoriesContainerItemIdentifier};
  static Data firstPage() { return dataFromString(VesselInitialPageSortedByName); }

  void addFile(std::string_view name) {
    fake.volume.makeFolder(fake.url(name).deletingLastPathComponent().path());
    fake.volume.writeFile(fake.path(name));
  }
  void addFiles(std::string_view prefix, int count) {
    for (int i = 0; i < count; ++i)
      addFile(std::string(prefix) + std::to_string(i));
  }
  /// Renames and writes the two records of it.
  void rename(std::string_view from, std::string_view to) {
    const std::uint64_t fileID = fake.volume.at(fake.path(from)).fileID;
    fake.volume.rename(fake.path(from), fake.path(to));
    events.append(fake.path(from), fileID);
    events.append(fake.path(to), fileID);
  }
  std::shared_ptr<LocalFileEnumerator> enumerator(std::string container = "fid=1") {
    return LocalFileEnumerator::create(services, std::move(container), {fake.url()});
  }
  ListedPage list(LocalFileEnumerator& enumerator, const Data& page = firstPage()) {
    PageObserver observer;
    enumerator.enumerateItems(observer, page);
    EXPECT_EQ(observer.page.finishes, 1);
    EXPECT_EQ(observer.page.batches, observer.page.error ? observer.page.batches : 1);
    return observer.page;
  }
  /// As another process has it: no walk stands open.
  void forgetWalks() {
    for (std::size_t i = 0; i < OpenWalks::mostWalks; ++i) {
      walks.spoil("", {});
    }
  }

  /// As another process has it where no position was kept either.
  void forgetListings() {
    forgetWalks();
    fake.positions.kept.clear();
  }

  FakeEventStreams events;
  FakeChangesEnumerations changes;
  OpenWalks walks;
  EnumerationServices services{context, {events, fake.diagnostics, changes}, walks};
};

}  // namespace mirabel::testing
