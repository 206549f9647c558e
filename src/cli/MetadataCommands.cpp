#include <algorithm>
#include <charconv>
#include <nlohmann/json.hpp>
#include <optional>
#include <ostream>
#include <string>
#include <utility>

#include "cli/ItemArgument.h"
#include "cli/ItemCommands.h"
#include "cli/ItemJSON.h"
#include "cli/OperationRun.h"
#include "cli/Printing.h"
#include "cli/ReferenceDate.h"
#include "foundation/Unicode.h"
#include "mirabel/TagData.h"

namespace mirabel {
namespace {

std::optional<Number> numberFrom(const std::string& text) {
  const char* const end = text.data() + text.size();
  std::int64_t integer = 0;
  if (const auto read = std::from_chars(text.data(), end, integer);
      read.ec == std::errc() && read.ptr == end)
    return Number::of(integer);
  std::uint64_t large = 0;
  if (const auto read = std::from_chars(text.data(), end, large);
      read.ec == std::errc() && read.ptr == end)
    return Number::of(large);
  double real = 0;
  const auto read = std::from_chars(text.data(), end, real, std::chars_format::general);
  if (read.ec == std::errc() && read.ptr == end && real - real == 0) return Number::of(real);
  return {};
}

/// What keeps a text from being a label; nothing else does.
std::optional<std::string> faultOf(const std::string& label) {
  if (label.empty()) return "a tag can't be empty; --clear takes all tags away";
  if (!isUTF8(label)) return "can't use " + label + "; a tag is text in UTF-8";
  return {};
}

ExitCode tellTags(Program& program, const std::string& item) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  const auto found = ItemArgument(item).item(*documents);
  if (!found) return program.report(found.error(), "can't find " + named(item));
  if (program.options().json) {
    program.out() << itemJSON(*found).dump() << '\n';
    return ExitCode::done;
  }
  if (const auto& data = found->tagData) {
    for (const Tag& tag : decodeTagData(*data).value_or(std::vector<Tag>()))
      program.out() << printable(tag.label) << '\n';
  }
  return ExitCode::done;
}

}  // namespace

ExitCode runTag(Program& program, const TagOptions& options) {
  if (options.labels.empty() && !options.clears) return tellTags(program, options.item);
  std::optional<Data> tagData;
  if (!options.clears) {
    std::vector<Tag> tags;
    tags.reserve(options.labels.size());
    for (const std::string& label : options.labels) {
      if (auto fault = faultOf(label)) return program.reportUsage(*fault);
      const Tag tag{label};
      if (std::ranges::find(tags, tag) == tags.end()) tags.push_back(tag);
    }
    auto encoded = encodeTagData(tags);
    if (!encoded) return program.reportUsage("the labels have more than 64 KiB");
    tagData = *std::move(encoded);
  }
  return runOnItem(program, options.item, "can't tag " + named(options.item),
                   [&](const ItemRecord& found, const auto& done) {
                     program.documents()->setTagData(found.itemIdentifier, tagData, done);
                   });
}

ExitCode runFavorite(Program& program, const FavoriteOptions& options) {
  std::optional<Number> rank;
  if (!options.clears) {
    rank = options.rank ? numberFrom(*options.rank) : Number::of(std::int64_t{1});
    if (!rank)
      return program.reportUsage("can't use " + named(*options.rank) + "; a rank is a number");
  }
  return runOnItem(program, options.item, "can't rank " + named(options.item),
                   [&](const ItemRecord& found, const auto& done) {
                     program.documents()->setFavoriteRank(found.itemIdentifier, rank, done);
                   });
}

ExitCode runUsed(Program& program, const UsedOptions& options) {
  std::optional<Date> date;
  if (!options.clears) {
    date = options.date ? dateFrom(*options.date) : Date::now();
    if (!date) {
      return program.reportUsage("can't use " + named(*options.date) +
                                 "; a date is written like 2026-11-21 or 2026-11-21T09:30:00Z");
    }
  }
  return runOnItem(program, options.item, "can't note when " + named(options.item) + " was used",
                   [&](const ItemRecord& found, const auto& done) {
                     program.documents()->setLastUsedDate(found.itemIdentifier, date, done);
                   });
}

}  // namespace mirabel
