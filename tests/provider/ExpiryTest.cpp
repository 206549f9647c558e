#include <cerrno>
#include <future>
#include <thread>

#include "foundation/KeyedArchive.h"
#include "items/AttributeNames.h"
#include "provider/ProviderFixture.h"

namespace mirabel::testing {
namespace {

// Fractions that archives hold as they are.
constexpr std::uint32_t quarter = 250'000'000;
constexpr Date reference{1'760'000'000, 2 * quarter};
constexpr Date longAgo{1'000'000'000, 0};

class ExpiryTest : public ProviderFixture {
 protected:
  ExpiryTest() {
    fake.volume.makeFolder(trash);
    fake.volume.makeFolder(libraryTrash);
  }

  void setDate(const std::string& path, const Data& payload) {
    fake.volume.at(path).attributes[std::string(attributename::trashDate)] = payload;
  }
  std::string trashed(const std::string& path, const Date& date = longAgo) {
    fake.volume.writeFile(path, "x");
    setDate(path, keyedarchive::archiveDate(date).value());
    return path;
  }
  std::optional<Date> dateAt(const std::string& path) {
    const auto& attributes = fake.volume.at(path).attributes;
    const auto found = attributes.find(attributename::trashDate);
    if (found == attributes.end()) return {};
    const auto date = keyedarchive::unarchiveDate(found->second);
    return date ? std::optional(*date) : std::nullopt;
  }

  using Answer = std::future<std::optional<Error>>;
  Answer begin(const Date& date = reference) {
    const auto answer = std::make_shared<std::promise<std::optional<Error>>>();
    // A second call would throw.
    vessel->_removeTrashedItemsOlderThanDate(
        date, [answer](std::optional<Error> error) { answer->set_value(std::move(error)); });
    return answer->get_future();
  }
  void expire(const Date& date = reference) { EXPECT_EQ(begin(date).get(), std::nullopt); }
  static bool isReady(const Answer& answer) {
    return answer.wait_for(std::chrono::seconds(0)) == std::future_status::ready;
  }

  const std::string trash = "/home/me/Documents/.Trash";
  const std::string libraryTrash = "/apps/draw/Documents/.Trash";
};

TEST_F(ExpiryTest, OnlyWhatWasTrashedStrictlyBeforeGoes) {
  const struct {
    const char* name;
    Date date;
    bool goes;
  } cases[] = {
      {"just before", {reference.seconds, quarter}, true},
      {"at it", reference, false},
      {"just after", {reference.seconds, 3 * quarter}, false},
      {"in the first year", {Date::earliest.seconds + 1, 0}, true},
      {"in the last year", {Date::latest.seconds - 1, 0}, false},
      {".hidden", longAgo, true},
      {".mirabel-0123456789ABCDEF-1", longAgo, false},  // a removal that is under way
  };
  for (const auto& c : cases)
    trashed(trash + "/" + c.name, c.date);
  expire();
  for (const auto& c : cases) {
    EXPECT_EQ(existsAt(trash + "/" + c.name), !c.goes) << c.name;
    EXPECT_TRUE(c.goes || dateAt(trash + "/" + c.name) == c.date) << c.name;
  }
}

// Below "/var" a folder's name to compare with is another than the one to open.
TEST_F(ExpiryTest, LibrariesAreWalkedUnderTheNamesThatTheyHave) {
  fake.install("org.example.var", "/var/home/me/.var/app/org.example.var", "Var");
  fake.volume.makeFolder("/var/home/me/.var/app/org.example.var/Documents/.Trash");
  const std::string entry = "/var/home/me/.var/app/org.example.var/Documents/.Trash/old";
  trashed(entry, longAgo);
  expire();
  EXPECT_FALSE(existsAt(entry));
}

TEST_F(ExpiryTest, WithoutAReadableDateAnEntryIsStampedAndGoesOnePeriodLater) {
  const struct {
    std::string name;
    std::optional<Data> payload;
  } cases[] = {
      {"none", {}},
      {".hidden", {}},
      {"empty", Data()},
      {"text", dataFromString("2020-01-01")},
      {"a number", keyedarchive::archiveNumber(Number::of(1.0)).value()},
      {"a string", keyedarchive::archiveString("2020-01-01").value()},
  };
  for (const auto& c : cases) {
    fake.volume.writeFile(trash + "/" + c.name);
    if (c.payload) setDate(trash + "/" + c.name, *c.payload);
  }
  expire();
  const Date now = fake.clock.now();
  for (const auto& c : cases)
    EXPECT_EQ(dateAt(trash + "/" + c.name), now) << c.name;
  expire(now);
  EXPECT_TRUE(existsAt(trash + "/none"));
  expire({now.seconds + 1, 0});
  for (const auto& c : cases)
    EXPECT_FALSE(existsAt(trash + "/" + c.name)) << c.name;
}

TEST_F(ExpiryTest, WhatATrashedFolderHoldsIsNeitherStampedNorJudged) {
  fake.volume.makeFolder(trash + "/kept");
  setDate(trash + "/kept", keyedarchive::archiveDate(reference).value());
  trashed(trash + "/kept/old");
  fake.volume.writeFile(trash + "/kept/new");
  fake.volume.makeFolder(trash + "/gone");
  setDate(trash + "/gone", keyedarchive::archiveDate(longAgo).value());
  fake.volume.writeFile(trash + "/gone/inside");
  trashed(fake.path("a.txt"));  // not in the trash at all
  expire();
  EXPECT_TRUE(existsAt(trash + "/kept/old"));
  EXPECT_EQ(dateAt(trash + "/kept/new"), std::nullopt);
  EXPECT_FALSE(existsAt(trash + "/gone"));
  EXPECT_TRUE(exists("a.txt"));
}

TEST_F(ExpiryTest, TheHostHearsOnceAllDeletionsHaveReported) {
  const std::string a = trashed(trash + "/a");
  const std::string b = trashed(trash + "/b");
  fake.reports.hold();
  Answer answer = begin();
  EXPECT_EQ(fake.reports.held(), 2U);
  EXPECT_FALSE(isReady(answer));
  fake.reports.release();
  EXPECT_EQ(answer.get(), std::nullopt);
  // Nor does the provider go before.
  trashed(trash + "/c");
  fake.reports.hold();
  answer = begin();
  std::thread releasing([&] { fake.reports.release(); });
  vessel.reset();
  EXPECT_TRUE(isReady(answer));
  releasing.join();
}

TEST_F(ExpiryTest, AFullTrashIsRemovedWithAFewDeletionsAtATime) {
  constexpr int count = 1000;
  for (int i = 0; i < count; ++i)
    trashed(trash + "/" + std::to_string(i));
  fake.reports.hold();
  auto whole = std::async(std::launch::async, [&] { expire(); });
  while (fake.faults.calls(Op::deleteItem) < 64)
    std::this_thread::yield();
  EXPECT_LE(fake.reports.held(), 64U);
  fake.reports.release();
  whole.get();
  EXPECT_TRUE(fake.volume.at(trash).entries.empty());
}

TEST_F(ExpiryTest, WhicheverCallFailsTheHostIsToldAndNothingYoungGoes) {
  const std::string library = trashed(libraryTrash + "/old");
  const std::string young = trashed(trash + "/young", reference);
  for (std::size_t n = 1, calls = n; calls >= n; ++n) {
    ASSERT_LT(n, 500U);
    trashed(library);
    trashed(trash + "/old");
    fake.faults.reset();
    fake.faults.failCall(n, Error::posix(EIO));
    expire();
    calls = fake.faults.calls();
    EXPECT_TRUE(existsAt(young)) << n;
    EXPECT_TRUE(exists("a.txt")) << n;
    // What was not recognised for old was stamped at most.
    EXPECT_TRUE(!existsAt(trash + "/old") || !existsAt(library)) << n;
  }
}

}  // namespace
}  // namespace mirabel::testing
