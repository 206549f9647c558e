#include <cerrno>
#include <future>

#include "foundation/KeyedArchive.h"
#include "items/AttributeNames.h"
#include "provider/ProviderFixture.h"
#include "support/Transcript.h"

namespace mirabel::testing {
namespace {

class ProviderLogTest : public ProviderFixture {
 protected:
  ProviderLogTest() : provider(*vessel) {
    id("a.txt");
    fake.applications.installed.push_back({"bare", {}, "Bare"});
    log.clear();
  }
  LocalVessel::ItemHandler item() { return done.handler(); }
  LocalVessel::ErrorHandler error() { return done.errorHandler(); }
  /// The next such calls fail.
  void fail(Op op, std::size_t count = 1) {
    fake.faults.reset();
    fake.faults.fail(op, Error::posix(EIO), 1, count);
  }

  LocalVessel& provider;
};

TEST_F(ProviderLogTest, TellsOfLookups) {
  static_cast<void>(provider.itemForIdentifier("did=1"));
  static_cast<void>(provider.urlForIdentifier("did=1"));
  static_cast<void>(provider._persistentIdentifierForItemAt(fake.url("a.txt")));
  static_cast<void>(provider._persistentIdentifierForItemAt(fake.url("Documents")));
  static_cast<void>(provider.itemForIdentifier("junk"));
  static_cast<void>(provider.URLForItemWithPersistentIdentifier("#none"));
  static_cast<void>(provider._propertiesForItemAtURL(fake.url("missing")));
  fail(Op::createDirectory);
  static_cast<void>(provider.lookUpItem(VesselTemporaryLocalFolderItemIdentifier));
  expectTranscript(log, R"(
┏fetching item's properties for "did=1"
[DEBUG] found <LocalItem itemIdentifier: did=1, parentItemIdentifier: VesselRootContainerItemIdentifier, filename: a.txt>
┗
┏fetching URL for "did=1"
[DEBUG] found file:///home/me/Documents/a.txt
┏fetching item identifier for "/home/me/Documents/a.txt"
[DEBUG] found did=1
[ERROR] can't find bundle proxy at file:///home/me/Documents/Documents
[ERROR] can't create an item without an ID
┏fetching item's properties for "junk"
[ERROR] item lookup failed for identifier "junk"
┗
[ERROR] can't find URL matching identifier #none; Vessel error -1005: no such item
[ERROR] can't create an item without an ID
[ERROR] identifier lookup failed for URL "/home/me/Documents/missing"
[ERROR] can't create temporary directory; POSIX error 5: Input/output error
)");
}

// Of a missing parent or item, some leave it to the host to tell.
TEST_F(ProviderLogTest, TellsOfOperations) {
  provider.importDocumentAtURL(fake.url("a.txt"), "#p", item());
  provider.createDirectoryWithName("made", "#p", item());
  provider.renameItemWithIdentifier("#i", "b", item());
  provider.reparentItemWithIdentifier("did=1", "#p", {}, item());
  provider.reparentItemWithIdentifier("#i", "#org.example.draw", {}, item());
  provider.deleteItemWithIdentifier("#i", error());
  provider.trashItemWithIdentifier("#i", item());
  provider.untrashItemWithIdentifier("#i", {}, item());
  provider._defaultApplicationContainerForBundleIdentifier("none", item());
  provider._defaultApplicationContainerForBundleIdentifier("bare", item());
  expectTranscript(log, R"(
┏import document at "/home/me/Documents/a.txt" to parent "#p"
┏fetching URL for "#p"
┗
┗
┏create directory with name "made" in parent "#p"
┏fetching URL for "#p"
┏rename item "#i" to name "b"
┏fetching URL for "#i"
┏move item "did=1" to parent "#p"
[ERROR] can't find URL matching identifier #p; Vessel error -1005: no such item
┏move item "#i" to parent "#org.example.draw"
┏fetching URL for "#org.example.draw"
[ERROR] can't find URL matching identifier #i; Vessel error -1005: no such item
┏delete item "#i"
[ERROR] can't find URL matching identifier #i; Vessel error -1005: no such item
┏trash item "#i"
[ERROR] can't find URL matching identifier #i; Vessel error -1005: no such item
┏untrash item "#i"
[ERROR] can't find URL matching identifier #i; Vessel error -1005: no such item
┏default location for none
[ERROR] can't create bundle proxy with 'none'
┏default location for bare
[ERROR] can't create an app library item without a data container URL
[ERROR] can't create an app library item with <BundleProxy bundleIdentifier: bare, dataContainerURL: (null)>
)");
}

TEST_F(ProviderLogTest, TellsOfMetadata) {
  constexpr Date used{1'763'700'000, 0};
  provider.setLastUsedDate({}, "did=1", item());
  provider.setFavoriteRank({}, "did=1", item());
  fail(Op::readWriteAccess, 3);
  provider.setLastUsedDate(used, "did=1", item());
  provider.setTagData({}, "did=1", item());
  provider.setFavoriteRank(Number::of(2.5), "did=1", item());
  provider.setLastUsedDate(used, "#i", item());
  provider.setFavoriteRank({}, "#i", item());
  provider.setTagData({}, "#i", item());
  expectTranscript(log, R"log(
┏clearing last used date for item "did=1"
┏fetching item's properties for "did=1"
┗
┗
┏set favorite rank "(null)" to item "did=1"
┏set last used date "2025-11-21T04:40:00Z" to item "did=1"
[ERROR] can't set xattr com.norvane.lastuseddate#PS on file:///home/me/Documents/a.txt; POSIX error 5: Input/output error
┏set tag data to item "did=1"
[ERROR] can't set xattr com.norvane.metadata:_kMDItemUserTags; POSIX error 5: Input/output error
┏set favorite rank "2.5" to item "did=1"
[ERROR] can't set xattr com.norvane.favorite-rank.number#PS; POSIX error 5: Input/output error
┏set last used date "2025-11-21T04:40:00Z" to item "#i"
┏set favorite rank "(null)" to item "#i"
┏set tag data to item "#i"
[ERROR] can't find URL matching identifier #i; Vessel error -1005: no such item
[ERROR] can't find URL for item; Vessel error -1005: no such item
)log");
}

TEST_F(ProviderLogTest, TellsOfExpiry) {
  const auto trashed = [&](const std::string& path, const Data& payload) {
    fake.volume.makeFolder(URL::fileURL(path).deletingLastPathComponent().path());
    fake.volume.writeFile(path).attributes[std::string(attributename::trashDate)] = payload;
  };
  const auto expire = [&] {
    std::promise<void> heard;  // on another thread
    provider._removeTrashedItemsOlderThanDate(
        {1'760'000'000, 0}, [&](const std::optional<Error>&) { heard.set_value(); });
    heard.get_future().wait();
  };
  trashed("/home/me/Documents/.Trash/old", keyedarchive::archiveDate({0, 0}).value());
  trashed("/apps/draw/Documents/.Trash/unreadable", {});
  id(".Trash/old");
  log.clear();
  fail(Op::deleteItem);
  expire();
  fail(Op::readValues, 100);
  fake.faults.fail(Op::openObject, Error::posix(EIO), 1, 100);
  expire();
  fake.faults.reset();
  fake.volume.at("/home/me/Documents/.Trash/old").attributes.clear();
  expire();
  expectTranscript(log, R"(
┏remove trashed items older than 2025-10-09T08:53:20Z
[DEBUG] can't unarchive xattr data for URL "/apps/draw/Documents/.Trash/unreadable"; set current date
[DEBUG] item did=2 was trashed before reference date, let's remove it
┏delete item "did=2"
[ERROR] can't remove item did=2; POSIX error 5: Input/output error
[DEBUG] wait until all deletions are complete
[ERROR] can't create an item without an ID
[ERROR] identifier lookup failed for URL "/home/me/Documents/.Trash/old"
[DEBUG] can't find trash date for URL "/home/me/Documents/.Trash/old"; set current date
)");
}

}  // namespace
}  // namespace mirabel::testing
