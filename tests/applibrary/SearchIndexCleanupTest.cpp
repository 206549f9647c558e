#include <cerrno>
#include <future>

#include "applibrary/AppLibraryFixture.h"
#include "applibrary/SearchIndexCleanup.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;

using SearchIndexCleanupTest = AppLibraryFixture;

TEST_F(SearchIndexCleanupTest, DomainsAreTheBundleIdentifiersAndARefusalIsNotTriedAgain) {
  const auto clean = [&] {
    deleteIndexOfDeletedAppLibraries(fake.platform().manager, {"#org.a", "##b"});
  };
  clean();
  EXPECT_THAT(fake.signals.deletedDomains, ElementsAre(ElementsAre("org.a", "#b")));
  EXPECT_THAT(messages(),
              ElementsAre("[DEBUG] asking provider manager to delete index from deleted domains",
                          R"([DEBUG] items from domains ["org.a", "#b"] removed from index)"));
  fake.signals.deletionRefusal = Error::posix(EIO);
  clean();
  EXPECT_EQ(fake.signals.deletedDomains.size(), 2U);
  EXPECT_EQ(messages().back(), R"([ERROR] can't delete searchable items from ["org.a", "#b"]; )" +
                                   Error::posix(EIO).description());
}

/// Answers when it is told to, on the thread that tells it.
class SlowManager final : public VesselManager {
 public:
  const URL& documentStorageURL() const override { return storage_; }
  void signalEnumeratorForContainerItemIdentifier(std::string_view, SignalHandler) override {}
  void deleteSearchableItemsWithDomainIdentifiers(const std::vector<std::string>&,
                                                  DeletionHandler completionHandler) override {
    asked.set_value(std::move(completionHandler));
  }

  std::promise<DeletionHandler> asked;

 private:
  URL storage_ = URL::fileURL("/home/me/Documents");
};

TEST_F(SearchIndexCleanupTest, WaitsUntilTheHostHasAnswered) {
  SlowManager slow;
  auto cleanup =
      std::async(std::launch::async, [&] { deleteIndexOfDeletedAppLibraries(slow, {"#org.a"}); });
  const auto answer = slow.asked.get_future().get();
  EXPECT_EQ(cleanup.wait_for(std::chrono::seconds(0)), std::future_status::timeout);
  answer(std::nullopt);
  cleanup.get();
  EXPECT_EQ(messages().back(), R"([DEBUG] items from domains ["org.a"] removed from index)");
}

}  // namespace
}  // namespace mirabel::testing
