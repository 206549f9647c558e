#include "fs/FSChangeToken.h"

#include "foundation/FatalError.h"
#include "foundation/Log.h"

namespace mirabel {
namespace {

constexpr std::string_view versionKey = "version";
constexpr std::string_view deviceUUIDKey = "deviceUUID";
constexpr std::string_view streamEventIDKey = "streamEventID";
constexpr std::string_view offsetKey = "offset";
constexpr std::string_view appLibraryVersionTokenKey = "appLibraryVersionToken";

Error unusable(std::string_view key) {
  return Error::propertyList("no usable value for the key \"" + std::string(key) + "\"");
}

Result<std::uint64_t> integerFor(std::string_view key, const PropertyList& list) {
  const auto value = list.unsignedFor(key);
  if (!value) return fail(unusable(key));
  return *value;
}

Result<UUID> uuidFor(std::string_view key, const PropertyList& list) {
  const PropertyList* entry = list.find(key);
  const std::string* text = entry == nullptr ? nullptr : entry->as<std::string>();
  const auto uuid = text == nullptr ? std::nullopt : UUID::fromString(*text);
  if (!uuid) return fail(unusable(key));
  return *uuid;
}

Result<FSChangeToken> tokenFrom(std::span<const std::uint8_t> bytes) {
  const auto list = PropertyList::decode(bytes);
  if (!list) return fail(list.error());
  const auto version = integerFor(versionKey, *list);
  if (!version) return fail(version.error());
  const auto deviceUUID = uuidFor(deviceUUIDKey, *list);
  if (!deviceUUID) return fail(deviceUUID.error());
  const auto streamEventID = integerFor(streamEventIDKey, *list);
  if (!streamEventID) return fail(streamEventID.error());
  const auto offset = integerFor(offsetKey, *list);
  if (!offset) return fail(offset.error());
  const auto appLibraryVersionToken = integerFor(appLibraryVersionTokenKey, *list);
  if (!appLibraryVersionToken) return fail(appLibraryVersionToken.error());
  return FSChangeToken{*version, *deviceUUID, *streamEventID, *offset, *appLibraryVersionToken};
}

}  // namespace

Data FSChangeToken::encode() const {
  PropertyList::Dictionary dictionary;
  const auto add = [&](std::string_view key, PropertyList::Value value) {
    dictionary.emplace_back(key, PropertyList(std::move(value)));
  };
  add(versionKey, Number::of(version));
  add(deviceUUIDKey, deviceUUID.description());
  add(streamEventIDKey, Number::of(streamEventID));
  add(offsetKey, Number::of(offset));
  add(appLibraryVersionTokenKey, Number::of(appLibraryVersionToken));
  Result<Data> bytes = PropertyList(std::move(dictionary)).encode();
  if (bytes) return *std::move(bytes);
  logError("can't encode token; " + bytes.error().description());
  fatalError("encoding token should never failed");
}

std::optional<FSChangeToken> FSChangeToken::decode(
    const std::optional<std::span<const std::uint8_t>>& bytes) {
  if (!bytes) return {};
  const auto token = tokenFrom(*bytes);
  if (token) return *token;
  logError("can't decode token from provided data; " + token.error().description());
  return {};
}

std::string FSChangeToken::description() const {
  return "<FSChangeToken version:" + std::to_string(version) +
         " deviceUUID:" + deviceUUID.description() +
         " streamEventID:" + std::to_string(streamEventID) + " offset:" + std::to_string(offset) +
         " appLibraryVersionToken:" + std::to_string(appLibraryVersionToken) + ">";
}

}  // namespace mirabel
