#include <filesystem>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <semaphore>

#include "cli/InstalledApps.h"
#include "host/LocalDocuments.h"
#include "host/bus/RestrictedDocuments.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using ::testing::ElementsAre;

const std::string one = "org.example.One";

// What the bus adds nothing to; the rest is tested through it.
class Restricted : public ::testing::Test {
 protected:
  Restricted() {
    apps.install(one, "One");
    fs::create_directory(at("folder"));
    all = LocalDocuments::open({.home = home.path()}).value();
    restricted = std::make_unique<bus::RestrictedDocuments>(*all, one);
  }
  std::string at(const std::string& name) const { return apps.documents(one) + "/" + name; }

  const TempHome home;
  const InstalledApps apps{home};
  std::unique_ptr<LocalDocuments> all;
  std::unique_ptr<bus::RestrictedDocuments> restricted;
};

TEST_F(Restricted, AFolderThatLeftIsToldOfOnceAndIsNotThereAnyMore) {
  const std::string folder = all->itemAtPath(at("folder")).value().itemIdentifier;
  const auto container = restricted->container(folder).value();
  const Data anchor = container->currentSyncAnchor().value();
  int woken = 0;
  std::counting_semaphore<> otherWoken{0};
  const auto watch = restricted->watch(folder, [&] { ++woken; }).value();
  // Woken behind the first one, for the same.
  const auto other = all->watch(folder, [&] { otherWoken.release(); }).value();
  apps.write(one, "folder/doc", "text");
  ASSERT_TRUE(otherWoken.try_acquire_for(30s));
  fs::rename(at("folder"), home.at("folder"));
  for (int i = 0; i < 5; ++i) {
    home.writeFile("folder/" + std::to_string(i));
    ASSERT_TRUE(otherWoken.try_acquire_for(30s));
  }
  const Error gone = Error::nonExistentItem(folder);
  EXPECT_EQ(container->items(Data()).error(), gone);
  EXPECT_EQ(container->changes(anchor).error(), gone);
  EXPECT_EQ(container->currentSyncAnchor().error(), gone);
  EXPECT_LE(woken, 3);  // twice at most for the document, made and written
}

TEST_F(Restricted, ItsOwnAreTheFirstOfThoseThatAreAskedFor) {
  const auto past = fs::file_time_type::clock::now() - 1h;
  for (int i = 0; i < 3; ++i) {
    const std::string name = "doc" + std::to_string(i);
    apps.write(one, name, "text");
    fs::last_write_time(at(name), past - std::chrono::minutes(i));
  }
  for (int i = 0; i < 20; ++i)
    home.writeFile("doc of others" + std::to_string(i));
  const auto names = [](const std::vector<ItemRecord>& items) {
    std::vector<std::string> found;
    for (const ItemRecord& item : items)
      found.push_back(item.filename);
    return found;
  };
  EXPECT_THAT(names(restricted->recent(2).value()), ElementsAre("doc0", "doc1"));
  SearchQuery query;
  query.words = {"doc"};
  query.limit = 2;
  EXPECT_THAT(names(restricted->search(query).value()), ElementsAre("doc0", "doc1"));
}

}  // namespace
}  // namespace mirabel::testing
