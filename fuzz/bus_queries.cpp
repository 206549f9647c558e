// A caller's arguments that are made of the bytes: a search, the name of an item and a rank are
// refused or understood, and what was understood is the same when it is asked for again.

#include "BusMessages.h"
#include "Require.h"
#include "host/bus/BusQueries.h"

using namespace mirabel;

namespace {

constexpr std::array keys{"tags",  "type", "modifiedSince", "modifiedBefore", "includesTrashed",
                          "limit", "name", "nameBytes",     "parent"};

/// As the service takes its arguments.
template <class Value>
Value received(sdbus::Message& message) {
  Value value{};
  message >> value;
  return value;
}

bool areEqual(const SearchQuery& a, const SearchQuery& b) {
  return a.words == b.words && a.tags == b.tags && a.type == b.type &&
         a.modifiedSince == b.modifiedSince && a.modifiedBefore == b.modifiedBefore &&
         a.includesTrashed == b.includesTrashed && a.domain == b.domain && a.limit == b.limit;
}

void checkSearch(const bus::Options& options, std::vector<std::string> words) {
  const auto query = bus::queryFrom(std::move(words), options);
  if (!query) return require(!query.error().empty());
  require(query->limit <= bus::mostFound && !query->domain);
  const auto again = bus::queryFrom(bus::wordsFor(*query), bus::optionsFor(*query));
  require(again && areEqual(*again, *query));
}

void checkName(const bus::Options& options) {
  const bool isMistyped =
      bus::mistypedOption(options, {{"name", "s"}, {"nameBytes", "ay"}}).has_value();
  const auto name = bus::nameOption(options, "name");
  if (isMistyped) return;
  require(name.has_value() == (options.contains("name") || options.contains("nameBytes")));
  if (!name) return;
  bus::Options again;
  bus::setNameOption(again, "name", *name);
  require(!bus::mistypedOption(again, {{"name", "s"}, {"nameBytes", "ay"}}));
  require(bus::nameOption(again, "name") == name);
}

void checkRank(const sdbus::Variant& variant) {
  const auto rank = bus::numberFrom(variant);
  if (!rank) return;
  const auto sent = std::visit([](auto value) { return sdbus::Variant(value); }, rank->value);
  require(bus::numberFrom(sent) == rank);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  ByteSource source(data, size);
  BusMessages messages(source);
  std::vector<std::string> words;
  for (std::size_t count = source.below(4); count > 0; --count)
    words.push_back(messages.text());
  auto message = BusMessages::sent([&](sdbus::Message& to) {
    messages.dictionary(to, keys);
    messages.variant(to);
  });
  const auto options = received<bus::Options>(message);
  checkSearch(options, std::move(words));
  checkName(options);
  checkRank(received<sdbus::Variant>(message));
  return 0;
}
