#pragma once

#include <algorithm>
#include <gtest/gtest.h>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/KeyedArchive.h"
#include "host/search/SearchIndex.h"
#include "items/AttributeNames.h"
#include "items/LocalItem.h"
#include "mirabel/TagData.h"
#include "support/FakeAppLibraries.h"
#include "support/FakePlatform.h"
#include "support/TempHome.h"

namespace mirabel::testing {

/// Items of a volume in memory, for an index on disk.
class SearchItems {
 public:
  /// Of a file or of a folder that is there, or of a file that is made.
  std::shared_ptr<LocalItem> item(std::string_view name, ItemOverrides overrides = {}) {
    if (!fake_.volume.find(fake_.path(name))) fake_.volume.writeFile(fake_.path(name));
    auto made = LocalItem::create(context_, fake_.url(name), std::move(overrides));
    EXPECT_TRUE(made) << name;
    if (made) names_[made->itemIdentifier()] = made->filename();
    return made;
  }
  VesselItems items(const std::vector<std::string>& names) {
    VesselItems made;
    for (const std::string& name : names)
      made.push_back(item(name));
    return made;
  }
  VesselItems namedItems(const std::vector<std::string>& identifiers) {
    VesselItems made;
    for (const std::string& identifier : identifiers) {
      ItemOverrides overrides;
      overrides.customItemID = identifier;
      made.push_back(item(identifier, overrides));
    }
    return made;
  }
  /// One that lies in the documents of an application.
  std::shared_ptr<LocalItem> itemOf(const std::string& bundle, const std::string& name) {
    if (!libraries_.contains(bundle)) fake_.install(bundle, "/apps/" + bundle);
    libraries_.insert({bundle, true});
    const std::string path = "/apps/" + bundle + "/Documents/" + name;
    fake_.volume.writeFile(path);
    auto made = LocalItem::create(context_, URL::fileURL(path));
    EXPECT_TRUE(made && made->vs_beaconDomainIdentifier() == bundle) << path;
    if (made) names_[made->itemIdentifier()] = made->filename();
    return made;
  }
  FakeNode& node(std::string_view name) { return fake_.volume.at(fake_.path(name)); }
  FakePlatform& fake() { return fake_; }

  void tag(std::string_view name, const std::vector<std::string>& labels) {
    set(name, attributename::tags, keyedarchive::archiveStrings(labels));
  }
  void rank(std::string_view name, const Number& number) {
    set(name, attributename::favoriteRank, keyedarchive::archiveNumber(number));
  }
  void used(std::string_view name, const Date& date) {
    set(name, attributename::lastUsedDate, keyedarchive::archiveDate(date));
  }

  /// The names of what was found, in its order.
  [[nodiscard]] std::vector<std::string> names(
      const Result<std::vector<std::string>>& identifiers) const {
    if (!identifiers) return {identifiers.error().description()};
    std::vector<std::string> found;
    for (const std::string& identifier : *identifiers)
      found.push_back(names_.at(identifier));
    return found;
  }

 private:
  void set(std::string_view name, std::string_view attribute, Result<Data> value) {
    node(name).attributes[std::string(attribute)] = value.value();
  }

  FakePlatform fake_;
  FakeAppLibraries owners_{fake_.applications};
  FileObjectURLs identity_{fake_.platform(), owners_};
  ItemContext context_{fake_.platform(), identity_, owners_};
  std::map<std::string, bool> libraries_;
  std::map<std::string, std::string> names_;
};

/// All names of one generation. Each is its item's identifier too, so that it is
/// the same in each process.
inline std::vector<std::string> namesOfGeneration(int generation, int count) {
  std::vector<std::string> names;
  for (int i = 0; i < count; ++i)
    names.push_back("gen" + std::to_string(generation) + " no" + std::to_string(i));
  return names;
}

inline Data anchorOf(std::string_view text) {
  return dataFromString(text);
}

}  // namespace mirabel::testing
