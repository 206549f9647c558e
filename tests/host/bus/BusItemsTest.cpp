#include <functional>
#include <limits>
#include <optional>
#include <rapidcheck.h>
#include <tuple>

#include "host/bus/BusClient.h"
#include "host/bus/BusItems.h"
#include "host/bus/BusStatus.h"
#include "host/bus/ServiceFixture.h"
#include "mirabel/TagData.h"

namespace mirabel::testing {
namespace {

using Variants = std::map<std::string, sdbus::Variant>;

/// Hands out messages that are written and then read.
class BusItems : public ServiceFixture {
 protected:
  void SetUp() override {
    ServiceFixture::SetUp();
    if (!IsSkipped()) client = std::make_unique<BusClient>();
  }
  sdbus::MethodCall sent(const std::function<void(sdbus::Message&)>& write) const {
    auto message = client->methodCall(bus::providerInterface, "Test");
    write(message);
    message.seal();
    message.rewind(true);
    return message;
  }
  std::vector<ItemRecord> roundTrip(const std::vector<ItemRecord>& items) const {
    auto message = sent([&](sdbus::Message& to) { bus::write(to, items); });
    return bus::readItems(message);
  }

  std::unique_ptr<BusClient> client;
};

template <class Value>
rc::Gen<std::optional<Value>> maybe(rc::Gen<Value> value) {
  return rc::gen::oneOf(rc::gen::just(std::optional<Value>()),
                        rc::gen::map(std::move(value), [](Value some) {
                          return std::optional<Value>(std::move(some));
                        }));
}

// Texts, and bytes that are none for the bus: NUL, cut characters, surrogates, noncharacters.
rc::Gen<std::string> anyName() {
  return rc::gen::oneOf(rc::gen::arbitrary<std::string>(),
                        rc::gen::element<std::string>(
                            "", "caf\xe9", "a\nb", "\xed\xa0\x80", "\xef\xb7\xa5", "\xef\xbf\xbf",
                            "\xf0\x9f\xbf\xbe", std::string("a\0b", 3), "Gr\u00fcn"));
}

rc::Gen<Number> anyNumber() {
  return rc::gen::oneOf(
      rc::gen::map(rc::gen::arbitrary<std::int64_t>(), [](auto v) { return Number::of(v); }),
      rc::gen::map(rc::gen::arbitrary<std::uint64_t>(), [](auto v) { return Number::of(v); }),
      rc::gen::map(rc::gen::arbitrary<double>(), [](auto v) { return Number::of(v); }),
      rc::gen::just(Number::of(std::numeric_limits<double>::quiet_NaN())));
}

rc::Gen<Date> anyDate() {
  return rc::gen::build<Date>(
      rc::gen::set(&Date::seconds),
      rc::gen::set(&Date::nanoseconds, rc::gen::inRange<std::uint32_t>(0, 1'000'000'000)));
}

rc::Gen<ItemRecord> anyItem() {
  using rc::gen::set;
  return rc::gen::build<ItemRecord>(
      set(&ItemRecord::itemIdentifier, anyName()),
      set(&ItemRecord::parentItemIdentifier, anyName()), set(&ItemRecord::filename, anyName()),
      set(&ItemRecord::typeIdentifier, rc::gen::element<std::string>("", "text/plain")),
      set(&ItemRecord::documentSize, maybe(anyNumber())),
      set(&ItemRecord::creationDate, maybe(anyDate())),
      set(&ItemRecord::contentModificationDate, maybe(anyDate())),
      set(&ItemRecord::childItemCount, maybe(rc::gen::arbitrary<std::uint16_t>())),
      set(&ItemRecord::capabilities), set(&ItemRecord::isTrashed),
      set(&ItemRecord::lastUsedDate, maybe(anyDate())),
      set(&ItemRecord::tagData, maybe(rc::gen::arbitrary<Data>())),
      set(&ItemRecord::favoriteRank, maybe(anyNumber())),
      set(&ItemRecord::fileID, maybe(rc::gen::arbitrary<std::uint64_t>())),
      set(&ItemRecord::docID, maybe(rc::gen::arbitrary<std::uint64_t>())),
      set(&ItemRecord::beaconDomainIdentifier, maybe(anyName())),
      set(&ItemRecord::appContainerBundleIdentifier, maybe(anyName())),
      set(&ItemRecord::putBackPath, maybe(anyName())), set(&ItemRecord::path, anyName()));
}

TEST_F(BusItems, ComeBackAsTheyWere) {
  EXPECT_TRUE(rc::check("items", [this] {
    const auto items = *rc::gen::container<std::vector<ItemRecord>>(anyItem());
    RC_ASSERT(roundTrip(items) == items);
  }));
}

TEST_F(BusItems, OfNewerServicesAreReadAsFarAsTheyAreKnown) {
  // Types that are not the known ones under known keys, and keys that nobody knows.
  const Variants newer = {
      {"itemIdentifier", sdbus::Variant(std::string("did=1"))},
      {"filename", sdbus::Variant(std::uint32_t{7})},
      {"typeIdentifier", sdbus::Variant(std::vector<std::string>{"text/plain"})},
      {"documentSize", sdbus::Variant(std::string("nine"))},
      {"creationDate", sdbus::Variant(std::int64_t{7})},
      {"childItemCount", sdbus::Variant(std::uint64_t{70'000})},
      {"isTrashed", sdbus::Variant(std::uint32_t{1})},
      {"tagData", sdbus::Variant(std::string("text"))},
      {"path", sdbus::Variant(std::string("/text"))},
      {"lastUsedDate", sdbus::Variant(sdbus::Struct<std::int64_t, std::uint64_t>(1, 2))},
      {"zNewer", sdbus::Variant(Variants{{"in", sdbus::Variant(std::string("it"))}})},
      {"capabilities", sdbus::Variant(std::uint64_t{63})}};
  auto message = sent([&](sdbus::Message& to) {
    to.openContainer("a{sv}");
    to << newer << Variants{};
    to.closeContainer();
  });
  const auto items = bus::readItems(message);
  ASSERT_EQ(items.size(), 2u);
  ItemRecord known;
  known.itemIdentifier = "did=1";
  known.capabilities = 63;
  EXPECT_EQ(items[0], known);
  EXPECT_EQ(items[1], ItemRecord());
}

TEST_F(BusItems, TellTheLabelsOfTheirTagsToThoseWhoDoNotReadTagData) {
  ItemRecord item;
  item.tagData = encodeTagData({{"Red"}, {"Gr\u00fcn"}}).value();
  auto message = sent([&](sdbus::Message& to) { bus::write(to, item); });
  Variants read;
  message >> read;
  EXPECT_EQ(read.at("tags").get<std::vector<std::string>>(),
            (std::vector<std::string>{"Red", "Gr\u00fcn"}));
  item.tagData = Data{1, 2, 3};
  EXPECT_EQ(roundTrip({item}).front(), item);
}

TEST_F(BusItems, StatusAndTrashFindingsComeBackAsTheyWere) {
  const StatusReport status{"inotify",
                            "no: \u00fc",
                            "why",
                            false,
                            1,
                            2,
                            std::numeric_limits<std::uint64_t>::max(),
                            "fs.setting",
                            4,
                            UUID::random(),
                            5,
                            6,
                            7,
                            8,
                            "can't be kept",
                            {{"org.example.One", "reason"}, {"", "there are more"}},
                            "/caf\xe9",
                            "/caf\xe9/state"};
  const std::vector<TrashedItem> items = {{"did=1", "/caf\xe9", {-1, 999'999'999}},
                                          {std::nullopt, "", {0, 0}}};
  auto message = sent([&](sdbus::Message& to) {
    bus::write(to, status);
    bus::write(to, items);
    bus::write(to, StatusReport());
  });
  const auto read = bus::readStatus(message);
  const auto fields = [](const StatusReport& of) {
    return std::tie(of.watcher, of.watching, of.refusal, of.needsMarks, of.foldersWatched,
                    of.marksNeeded, of.marksAllowed, of.marksSetting, of.unreadableFolders,
                    of.historyUUID.bytes, of.firstEventID, of.lastEventID, of.appLibraries,
                    of.appLibraryVersion, of.appLibrariesFailure, of.home, of.stateFolder);
  };
  EXPECT_EQ(fields(read), fields(status));
  ASSERT_EQ(read.leftOut.size(), 2u);
  EXPECT_EQ(read.leftOut[0].reason, "reason");
  EXPECT_EQ(read.leftOut[1].identifier, "");
  const auto found = bus::readTrashedItems(message);
  ASSERT_EQ(found.size(), 2u);
  for (std::size_t i = 0; i < found.size(); ++i) {
    EXPECT_EQ(found[i].itemIdentifier, items[i].itemIdentifier);
    EXPECT_EQ(found[i].path, items[i].path);
    EXPECT_EQ(found[i].trashDate, items[i].trashDate);
  }
  EXPECT_EQ(fields(bus::readStatus(message)), fields(StatusReport()));
}

}  // namespace
}  // namespace mirabel::testing
