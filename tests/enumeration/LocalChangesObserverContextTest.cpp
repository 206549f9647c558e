#include <cerrno>

#include "enumeration/EnumerationFixture.h"
#include "enumeration/LocalChangesObserverContext.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;

class EnumeratingChanges : public EnumerationTest {
 protected:
  /// Starts an enumeration and answers it; null where none was made.
  std::shared_ptr<FakeChangesEnumeration> start(const std::shared_ptr<LocalFileEnumerator>& of,
                                                const Data& anchor) {
    changes.made.clear();
    of->enumerateChanges(observer, anchor);
    return changes.made.empty() ? nullptr : changes.made.front().lock();
  }
  static std::optional<Data> anchorOf(LocalFileEnumerator& enumerator) {
    std::optional<Data> anchor;
    enumerator.currentSyncAnchor([&](std::optional<Data> current) { anchor = std::move(current); });
    return anchor;
  }
  VesselItems items(std::string_view name) {
    addFile(name);
    return {LocalItem::create(services.items, fake.url(name))};
  }

  std::shared_ptr<ChangeLog> observer = std::make_shared<ChangeLog>();
};

TEST_F(EnumeratingChanges, UnusableAnchorEndsInAnError) {
  const auto of = enumerator();
  const Data usable = FSChangeToken{0, fake.historyUUID, 0, 0, 0}.encode();
  fake.faults.fail(Op::historyUUID, Error::posix(EIO), 2, 2);
  for (const Data& anchor : {dataFromString("junk"), FSChangeToken{}.encode(), usable}) {
    EXPECT_EQ(start(of, anchor), nullptr);
    EXPECT_EQ(of->runningEnumerations(), 0U);
  }
  EXPECT_THAT(observer->calls, ElementsAre("error -1002", "error -1002", "error 3"));
  EXPECT_FALSE(anchorOf(*of));
}

TEST_F(EnumeratingChanges, BatchesArePassedOnAndTheFirstFinishReleasesTheEnumeration) {
  auto of = enumerator();
  const FSChangeToken token{0, fake.historyUUID, 0, 0, 0};
  auto enumeration = start(of, token.encode());
  EXPECT_TRUE(enumeration->hasStarted);
  // The enumeration alone keeps its enumerator while it runs.
  const std::weak_ptr<LocalFileEnumerator> kept = of;
  of.reset();
  const std::weak_ptr<VesselChangeObserver> observed = enumeration->observer;
  enumeration->observer->didUpdateItems(items("a"));
  enumeration->observer->didDeleteItemsWithIdentifiers({"fid=4", "did=5"});
  EXPECT_EQ(fake.faults.calls(Op::permanentStorageForItemAtURL), 0U);
  enumeration->observer->finishEnumeratingChangesUpToSyncAnchor(token.encode(), true);
  ASSERT_FALSE(kept.expired());
  EXPECT_EQ(kept.lock()->runningEnumerations(), 0U);
  enumeration->observer->finishEnumeratingChangesUpToSyncAnchor(token.encode(), false);
  enumeration->observer->finishEnumeratingWithError(Error::posix(EIO));
  EXPECT_THAT(observer->calls, ElementsAre("update a", "delete fid=4 did=5", "finish, more"));
  EXPECT_EQ(observer->anchor, token.encode());
  enumeration.reset();
  EXPECT_TRUE(kept.expired());
  EXPECT_TRUE(observed.expired());
}

TEST_F(EnumeratingChanges, WorkingSetRefreshesFileIDsBeforeTheBatchIsPassedOn) {
  const auto enumeration =
      start(enumerator(workingSet), FSChangeToken{0, fake.historyUUID, 0, 0, 0}.encode());
  fake.faults.fail(Op::permanentStorageForItemAtURL, Error::posix(EIO));
  enumeration->observer->didUpdateItems(items("a"));
  EXPECT_EQ(fake.faults.calls(Op::permanentStorageForItemAtURL), 1U);
  enumeration->observer->finishEnumeratingWithError(Error::syncAnchorExpired());
  EXPECT_THAT(observer->calls, ElementsAre("update a", "error -1002"));
}

TEST_F(EnumeratingChanges, InvalidatedEnumeratorEndsItsEnumerationsInSilence) {
  const auto of = enumerator();
  const auto enumeration = start(of, FSChangeToken{0, fake.historyUUID, 0, 0, 0}.encode());
  of->invalidate();
  EXPECT_TRUE(enumeration->hasStopped);
  EXPECT_EQ(of->runningEnumerations(), 0U);
  EXPECT_EQ(enumeration.use_count(), 1);
}

}  // namespace
}  // namespace mirabel::testing
