#include <gtest/gtest.h>
#include <limits>
#include <rapidcheck/gtest.h>

#include "foundation/KeyedArchive.h"

namespace mirabel::keyedarchive {
namespace {

using Dictionary = PropertyList::Dictionary;

constexpr auto largestUnsigned = std::numeric_limits<std::uint64_t>::max();

/// An archive of a string, with one entry of the root replaced; no value leaves the entry out.
Data altered(std::string_view key, std::optional<PropertyList> value) {
  const auto list = PropertyList::decode(archiveString("text").value());
  Dictionary root = *list->as<Dictionary>();
  std::erase_if(root, [&](const auto& entry) { return entry.first == key; });
  if (value) root.emplace_back(key, *value);
  return PropertyList(root).encode().value();
}

/// Which of the readers take the bytes: date, number, string, strings, dictionary.
std::string readersOf(const Data& bytes) {
  std::string readers;
  if (unarchiveDate(bytes)) readers += "date ";
  if (unarchiveNumber(bytes)) readers += "number ";
  if (unarchiveString(bytes)) readers += "string ";
  if (unarchiveStrings(bytes)) readers += "strings ";
  if (unarchiveDictionary(bytes)) readers += "dictionary ";
  return readers;
}

RC_GTEST_PROP(KeyedArchiveProperties, StringsComeBackByteForByte,
              (const std::vector<std::string>& strings)) {
  RC_ASSERT(unarchiveStrings(archiveStrings(strings).value()).value() == strings);
  for (const std::string& string : strings) {
    RC_ASSERT(unarchiveString(archiveString(string).value()).value() == string);
  }
}

TEST(KeyedArchive, NumbersAndDatesComeBack) {
  for (const Number number :
       {Number::of(largestUnsigned), Number::of(std::numeric_limits<std::int64_t>::min()),
        Number::of(0.1), Number::of(std::int64_t{3}),
        Number::of(std::numeric_limits<double>::quiet_NaN())}) {
    EXPECT_EQ(unarchiveNumber(archiveNumber(number).value()), number) << number.description();
  }
  for (const Date date : {Date{0, 0}, Date{-1, 500'000'000}, Date::earliest}) {
    EXPECT_EQ(unarchiveDate(archiveDate(date).value()), date) << date.rfc3339();
  }
  EXPECT_FALSE(archiveDate({Date::latest.seconds + 1, 0}).has_value());
}

TEST(KeyedArchive, IsReadAsItsOwnClassOnly) {
  const Dictionary dictionary{{"versionToken", PropertyList(Number::of(largestUnsigned))},
                              {"records", PropertyList(PropertyList::Array{})}};
  EXPECT_EQ(unarchiveDictionary(archiveDictionary(dictionary).value()), dictionary);
  EXPECT_EQ(readersOf(archiveDictionary(dictionary).value()), "dictionary ");
  EXPECT_EQ(readersOf(archiveDate({1, 0}).value()), "date ");
  EXPECT_EQ(readersOf(archiveNumber(Number::of(1.0)).value()), "number ");
  EXPECT_EQ(readersOf(archiveString("1").value()), "string ");
  EXPECT_EQ(readersOf(archiveStrings({}).value()), "strings ");
}

TEST(KeyedArchive, RefusesOtherLists) {
  const PropertyList text(std::string("x"));
  EXPECT_EQ(readersOf(altered("more", text)), "string ");
  const std::vector<std::pair<const char*, Data>> cases{
      {"no bytes", {}},
      {"a bare value", text.encode().value()},
      {"another name", altered("archive", text)},
      {"no name", altered("archive", std::nullopt)},
      {"another version", altered("version", PropertyList(Number::of(std::int64_t{2})))},
      {"a version that is text", altered("version", text)},
      {"no version", altered("version", std::nullopt)},
      {"an unknown class", altered("class", text)},
      {"a class that its value is not of", altered("class", PropertyList(std::string("date")))},
      {"no class", altered("class", std::nullopt)},
      {"a value of another type", altered("value", PropertyList(true))},
      {"no value", altered("value", std::nullopt)},
  };
  for (const auto& [name, bytes] : cases) {
    EXPECT_EQ(readersOf(bytes), "") << name;
  }
}

TEST(KeyedArchive, FitsAnExtendedAttribute) {
  EXPECT_LT(archiveDate(Date::now()).value().size(), 160u);
  EXPECT_LT(archiveString(std::string(1024, 'p')).value().size(), 1200u);
  EXPECT_FALSE(archiveString(std::string(70'000, 'p')).has_value());
  EXPECT_EQ(readersOf(altered("value", PropertyList(std::string(70'000, 'p')))), "");
}

}  // namespace
}  // namespace mirabel::keyedarchive
