#include <cerrno>

#include "enumeration/EnumerationFixture.h"
#include "support/Transcript.h"

namespace mirabel::testing {
namespace {

class EnumerationLogTest : public EnumerationTest {
 protected:
  Data token(std::uint64_t offset, std::uint64_t event = 0) const {
    return FSChangeToken{0, fake.historyUUID, event, offset, 0}.encode();
  }
  void failHistory() { fake.faults.fail(Op::historyUUID, Error::posix(EIO)); }
};

TEST_F(EnumerationLogTest, TellsOfListings) {
  addFiles("", 201);
  const auto listing = enumerator();
  list(*listing, list(*listing).next.value());
  list(*listing, dataFromString(VesselInitialPageSortedByDate));
  for (const Data& page : {FSChangeToken{}.encode(), token(500), token(0, 99)})
    list(*listing, page);
  events.append(fake.path("gone"), 4711);
  list(*listing, token(200));
  failHistory();
  list(*listing);
  failHistory();
  enumerator();
  list(*listing, dataFromString("junk"));
  expectTranscript(log, R"(
┏enumerate items for fid=1 with page initialPageSortedByName
[DEBUG] start gather phase
[DEBUG] discovered 200 items for fid=1
┗
┏enumerate items for fid=1 with page <FSChangeToken version:0 deviceUUID:11111111-2222-3333-4444-555555555555 streamEventID:0 offset:200 appLibraryVersionToken:0>
[DEBUG] resume gather phase at offset 200
[DEBUG] safe to resume gather phase from FSEventID 0
[DEBUG] discovered 1 items for fid=1
[DEBUG] gather phase finished for ["/home/me/Documents"]
┏enumerate items for fid=1 with page initialPageSortedByDate
[INFO] device UUID changed (00000000-0000-0000-0000-000000000000 -> 11111111-2222-3333-4444-555555555555)
[INFO] enumerator returned an offset (201) smaller than the initial offset 500
[INFO] can't replay historical FSEvents, need to re-start gather phase from scratch
[INFO] deletion of [fid=4711, path:'/home/me/Documents/gone'] requires to re-gather from scratch
[ERROR] can't get volume UUID for /home/me/Documents
[ERROR] can't get volume UUID for "/home/me/Documents"
[ERROR] can't create notifier for "/home/me/Documents"; enumeration will have no live update
[ERROR] can't decode token from provided data; property list error 0: unreadable data; too short
[ERROR] can't create change token from anchor data, resetting
)");
}

TEST_F(EnumerationLogTest, TellsOfChanges) {
  addFile("a");
  const auto listing = enumerator(workingSet);
  const auto observer = std::make_shared<ChangeLog>();
  list(*listing);
  for (const Data& anchor : {token(0), FSChangeToken{}.encode(), dataFromString("junk")})
    listing->enumerateChanges(observer, anchor);
  failHistory();
  listing->currentSyncAnchor([](const std::optional<Data>&) {});
  expectTranscript(log, R"(
[DEBUG] updating fileID in palimpsest for <LocalItem itemIdentifier: did=1, parentItemIdentifier: VesselRootContainerItemIdentifier, filename: a>
┏enumerate changes for VesselWorkingSetContainerItemIdentifier with token <FSChangeToken version:0 deviceUUID:11111111-2222-3333-4444-555555555555 streamEventID:0 offset:0 appLibraryVersionToken:0>
[INFO] device UUID changed (00000000-0000-0000-0000-000000000000 -> 11111111-2222-3333-4444-555555555555)
[ERROR] can't decode token from provided data; property list error 0: unreadable data; too short
[ERROR] can't create change token from anchor data, resetting
[ERROR] can't get volume UUID for "/home/me/Documents"
)");
  const auto begun = changes.made.front().lock();
  ASSERT_TRUE(begun);
  begun->observer->finishEnumeratingWithError(Error::syncAnchorExpired());
}

}  // namespace
}  // namespace mirabel::testing
