#include "foundation/KeyedArchive.h"

namespace mirabel::keyedarchive {
namespace {

constexpr std::string_view archiveName = "com.norvane.keyed-archive";
constexpr std::int64_t currentVersion = 1;

// Linux keeps no attribute longer than this.
constexpr std::size_t attributeSize = 64u << 10;
constexpr PropertyList::Limits attributeLimits{
    .depth = 3, .objects = attributeSize, .bytes = attributeSize};
constexpr std::size_t dictionarySize = 16u << 20;
constexpr PropertyList::Limits dictionaryLimits{
    .depth = 16, .objects = 500'000, .bytes = dictionarySize};

/// What an archive of one class may hold.
struct Class {
  std::string_view name;
  std::size_t size;
  PropertyList::Limits limits;
};

constexpr Class dateClass{"date", attributeSize, attributeLimits};
constexpr Class numberClass{"number", attributeSize, attributeLimits};
constexpr Class stringClass{"string", attributeSize, attributeLimits};
constexpr Class stringsClass{"strings", attributeSize, attributeLimits};
constexpr Class dictionaryClass{"dictionary", dictionarySize, dictionaryLimits};

std::unexpected<Error> refused(std::string_view detail) {
  return fail(Error::propertyList(std::string(detail)));
}

std::unexpected<Error> noArchive() {
  return refused("no archive");
}

std::unexpected<Error> otherClass(const Class& wanted) {
  return refused("no archive of the class " + std::string(wanted.name));
}

bool isText(const PropertyList* value, std::string_view text) {
  const auto* string = value == nullptr ? nullptr : value->as<std::string>();
  return string != nullptr && *string == text;
}

Result<Data> archive(const Class& wanted, PropertyList value) {
  PropertyList::Dictionary root;
  root.emplace_back("archive", PropertyList(std::string(archiveName)));
  root.emplace_back("version", PropertyList(Number::of(currentVersion)));
  root.emplace_back("class", PropertyList(std::string(wanted.name)));
  root.emplace_back("value", std::move(value));
  auto bytes = PropertyList(std::move(root)).encode(wanted.limits);
  if (bytes && bytes->size() > wanted.size) return refused("an archive that is too large");
  return bytes;
}

Result<PropertyList> unarchive(const Class& wanted, std::span<const std::uint8_t> bytes) {
  if (bytes.size() > wanted.size) return refused("an archive that is too large");
  const auto root = PropertyList::decode(bytes, wanted.limits);
  if (!root) return root;
  if (!isText(root->find("archive"), archiveName)) return noArchive();
  const PropertyList* version = root->find("version");
  const auto* number = version == nullptr ? nullptr : version->as<Number>();
  if (number == nullptr) return noArchive();
  if (*number != Number::of(currentVersion)) return refused("an archive of another version");
  if (!isText(root->find("class"), wanted.name)) return otherClass(wanted);
  const PropertyList* value = root->find("value");
  if (value == nullptr) return noArchive();
  return *value;
}

/// The archive's value when it is of the type that its class stands for.
template <class T>
Result<T> unarchiveAs(const Class& wanted, std::span<const std::uint8_t> bytes) {
  const auto value = unarchive(wanted, bytes);
  if (!value) return fail(value.error());
  const T* typed = value->as<T>();
  if (typed == nullptr) return otherClass(wanted);
  return *typed;
}

}  // namespace

Result<Data> archiveDate(const Date& date) {
  return archive(dateClass, PropertyList(date));
}

Result<Data> archiveNumber(const Number& number) {
  return archive(numberClass, PropertyList(number));
}

Result<Data> archiveString(std::string_view string) {
  return archive(stringClass, PropertyList::ofBytes(string));
}

Result<Data> archiveStrings(const std::vector<std::string>& strings) {
  PropertyList::Array array;
  array.reserve(strings.size());
  for (const std::string& string : strings) {
    array.push_back(PropertyList::ofBytes(string));
  }
  return archive(stringsClass, PropertyList(std::move(array)));
}

Result<Data> archiveDictionary(const PropertyList::Dictionary& dictionary) {
  return archive(dictionaryClass, PropertyList(dictionary));
}

Result<Date> unarchiveDate(std::span<const std::uint8_t> bytes) {
  return unarchiveAs<Date>(dateClass, bytes);
}

Result<Number> unarchiveNumber(std::span<const std::uint8_t> bytes) {
  return unarchiveAs<Number>(numberClass, bytes);
}

Result<std::string> unarchiveString(std::span<const std::uint8_t> bytes) {
  const auto value = unarchive(stringClass, bytes);
  if (!value) return fail(value.error());
  auto string = value->bytes();
  if (!string) return otherClass(stringClass);
  return *std::move(string);
}

Result<std::vector<std::string>> unarchiveStrings(std::span<const std::uint8_t> bytes) {
  const auto array = unarchiveAs<PropertyList::Array>(stringsClass, bytes);
  if (!array) return fail(array.error());
  std::vector<std::string> strings;
  strings.reserve(array->size());
  for (const PropertyList& element : *array) {
    auto string = element.bytes();
    if (!string) return otherClass(stringsClass);
    strings.push_back(*std::move(string));
  }
  return strings;
}

Result<PropertyList::Dictionary> unarchiveDictionary(std::span<const std::uint8_t> bytes) {
  return unarchiveAs<PropertyList::Dictionary>(dictionaryClass, bytes);
}

}  // namespace mirabel::keyedarchive
