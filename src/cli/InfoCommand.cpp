#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/Commands.h"
#include "cli/ItemArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "items/LocalItem.h"
#include "mirabel/TagData.h"

namespace mirabel {
namespace {

std::string capabilityNames(std::uint64_t capabilities) {
  static constexpr struct {
    std::uint64_t bit;
    const char* name;
  } names[] = {{capabilityReading, "read"},     {capabilityWriting, "write"},
               {capabilityReparenting, "move"}, {capabilityRenaming, "rename"},
               {capabilityTrashing, "trash"},   {capabilityDeleting, "delete"}};
  std::string text;
  for (const auto& [bit, name] : names) {
    if ((capabilities & bit) == 0) continue;
    if (!text.empty()) text += ", ";
    text += name;
  }
  return text;
}

std::string tagLabels(const Data& tagData) {
  std::string text;
  for (const Tag& tag : decodeTagData(tagData).value_or(std::vector<Tag>())) {
    if (!text.empty()) text += ", ";
    text += printable(tag.label);
  }
  return text;
}

void printItem(std::ostream& out, const ItemRecord& item) {
  const auto row = [&](std::string_view label, const std::string& value) {
    out << label << std::string(label.size() < 14 ? 14 - label.size() : 1, ' ') << value << '\n';
  };
  row("name", printable(item.filename));
  row("identifier", printable(item.itemIdentifier));
  row("parent", printable(item.parentItemIdentifier));
  row("type", item.typeIdentifier);
  if (const auto& size = item.documentSize) {
    const auto bytes = size->asUnsigned();
    row("size", bytes ? humanSize(*bytes) : size->description());
  }
  if (item.childItemCount) row("entries", std::to_string(*item.childItemCount));
  if (item.creationDate) row("created", humanDate(*item.creationDate));
  if (item.contentModificationDate) row("modified", humanDate(*item.contentModificationDate));
  if (item.lastUsedDate) row("last used", humanDate(*item.lastUsedDate));
  if (item.tagData) row("tags", tagLabels(*item.tagData));
  if (item.favoriteRank) row("favourite", item.favoriteRank->description());
  row("may", capabilityNames(item.capabilities));
  if (item.isTrashed) row("trashed", "yes");
  if (item.fileID) row("file ID", std::to_string(*item.fileID));
  if (item.docID) row("document ID", std::to_string(*item.docID));
  if (const auto& bundle = item.appContainerBundleIdentifier) {
    row("application", printable(*bundle));
  }
  if (const auto& domain = item.beaconDomainIdentifier) row("domain", printable(*domain));
  if (const auto& place = item.putBackPath) row("came from", printable(*place));
  row("path", printable(item.path));
}

}  // namespace

ExitCode runInfo(Program& program, const std::string& item) {
  Documents* documents = program.documents();
  if (documents == nullptr) return program.exitCode();
  auto found = ItemArgument(item).item(*documents);
  if (!found) return program.report(found.error(), "can't find " + named(item));
  if (program.options().json) {
    program.out() << itemJSON(*found).dump() << '\n';
  } else {
    printItem(program.out(), *found);
  }
  return ExitCode::done;
}

}  // namespace mirabel
