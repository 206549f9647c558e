#include <cerrno>
#include <utility>

#include "host/bus/BusCall.h"
#include "host/bus/BusNames.h"
#include "host/bus/BusOptions.h"
#include "host/bus/BusQueries.h"
#include "host/bus/StagedImport.h"
#include "mirabel/TagData.h"

namespace mirabel::bus {
namespace {

using CallPointer = std::shared_ptr<BusCall>;

Documents::ItemHandler answering(const CallPointer& call) {
  return [call](const Documents::ItemResult& result) { call->reply(result); };
}

Documents::ErrorHandler answeringError(const CallPointer& call) {
  return [call](const std::optional<Error>& error) {
    if (error) return call->fail(*error);
    call->reply();
  };
}

/// Runs `operation` with what the caller may change.
template <class Operation>
auto onDocuments(const Operation& operation) {
  return [operation](const CallPointer& call) {
    if (Documents* documents = call->documents()) operation(*documents, call);
  };
}

/// The last argument; nothing, and the call is answered, where an option has another type than it
/// must have: what it asks for would silently not be done.
std::optional<Options> optionsOf(const CallPointer& call,
                                 std::initializer_list<KnownOption> known) {
  auto options = call->argument<Options>();
  const auto mistyped = mistypedOption(options, known);
  if (!mistyped) return options;
  call->failInvalid(*mistyped);
  return {};
}

/// A name that stands as text before the options, where its bytes may be; nothing as there.
std::optional<std::string> nameOf(const CallPointer& call, std::string text) {
  const auto options = optionsOf(call, {{"name", "s"}, {"nameBytes", "ay"}});
  if (!options) return {};
  return nameOption(*options, "name").value_or(std::move(text));
}

constexpr KnownOption pathOption = {"path", "ay"};

/// The item, and which of its names is meant where the options say so.
ItemTarget targetOf(std::string identifier, const Options& options) {
  ItemTarget target(std::move(identifier));
  if (const auto path = options.find("path"); path != options.end())
    target.path = stringView(path->second.get<Data>());
  return target;
}

void createDirectory(Documents& documents, const CallPointer& call) {
  auto text = call->argument<std::string>();
  const auto parent = call->argument<std::string>();
  const auto name = nameOf(call, std::move(text));
  if (name) documents.createDirectory(*name, parent, answering(call));
}

void renameItem(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  auto text = call->argument<std::string>();
  const auto options = optionsOf(call, {{"name", "s"}, {"nameBytes", "ay"}, pathOption});
  if (!options) return;
  const auto name = nameOption(*options, "name").value_or(std::move(text));
  documents.rename(targetOf(item, *options), name, answering(call));
}

void reparent(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  const auto parent = call->argument<std::string>();
  const auto options = optionsOf(call, {{"name", "s"}, {"nameBytes", "ay"}, pathOption});
  if (!options) return;
  documents.reparent(targetOf(item, *options), parent, nameOption(*options, "name"),
                     answering(call));
}

void importDocument(Documents& documents, const CallPointer& call, const std::string& stagingFolder,
                    const std::stop_token& stopping) {
  const auto file = call->argument<sdbus::UnixFd>();
  auto text = call->argument<std::string>();
  const auto parent = call->argument<std::string>();
  const auto name = nameOf(call, std::move(text));
  if (!name) return;
  // Before anything is copied for somebody who has no place to put it.
  if (auto place = documents.item(parent); !place) return call->fail(place.error());
  const FileCalls calls(
      [&](std::string_view) { return stopping.stop_requested() ? ECANCELED : 0; });
  auto staged = StagedImport::of(file.get(), *name, stagingFolder, calls);
  if (!staged) return call->fail(staged.error());
  const auto kept = std::make_shared<StagedImport>(*std::move(staged));
  documents.importDocument(kept->path(), parent, [call, kept](const Documents::ItemResult& result) {
    call->reply(result);
  });
}

void importPath(const CallPointer& call) {
  Documents* documents = call->allDocuments();
  if (documents == nullptr) return;
  const std::string path(stringView(call->argument<Data>()));
  const auto parent = call->argument<std::string>();
  documents->importDocument(path, parent, answering(call));
}

void deleteItem(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  const auto options = optionsOf(call, {pathOption});
  if (options) documents.remove(targetOf(item, *options), answeringError(call));
}

void trash(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  const auto options = optionsOf(call, {pathOption});
  if (options) documents.trash(targetOf(item, *options), answering(call));
}

void restore(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  const auto options = optionsOf(call, {{"parent", "s"}, pathOption});
  if (!options) return;
  documents.restore(targetOf(item, *options), textOption(*options, "parent"), answering(call));
}

void setLastUsedDate(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  const auto text = call->argument<std::string>();
  const auto date = Date::fromRFC3339(text);
  if (!date && !text.empty()) return call->failInvalid("this is no date in RFC 3339 form");
  documents.setLastUsedDate(item, date, answering(call));
}

void setTags(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  std::vector<Tag> tags;
  for (std::string& label : call->argument<std::vector<std::string>>())
    tags.push_back({std::move(label)});
  if (tags.empty()) return documents.setTagData(item, std::nullopt, answering(call));
  auto encoded = encodeTagData(tags);
  if (!encoded) return call->fail(encoded.error());
  documents.setTagData(item, *std::move(encoded), answering(call));
}

void setTagData(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  auto bytes = call->argument<Data>();
  documents.setTagData(item, bytes.empty() ? std::nullopt : std::optional(std::move(bytes)),
                       answering(call));
}

void setFavoriteRank(Documents& documents, const CallPointer& call) {
  const auto item = call->argument<std::string>();
  const auto rank = numberFrom(call->argument<sdbus::Variant>());
  if (!rank) return call->failInvalid("a rank is a number");
  documents.setFavoriteRank(item, rank, answering(call));
}

void clearFavoriteRank(Documents& documents, const CallPointer& call) {
  documents.setFavoriteRank(call->argument<std::string>(), std::nullopt, answering(call));
}

}  // namespace

std::vector<BusMethod> operationsMethods(const std::string& stagingFolder,
                                         const std::stop_token& stopping) {
  constexpr const char* of = operationsInterface;
  constexpr const char* item = "a{sv}";
  constexpr Lane lane = Lane::operations;
  return {
      {of,
       "ImportDocument",
       "hssa{sv}",
       {"file", "name", "parent", "options"},
       item,
       {"item"},
       lane,
       onDocuments([stagingFolder, stopping](Documents& documents, const CallPointer& call) {
         importDocument(documents, call, stagingFolder, stopping);
       })},
      {of, "ImportPath", "ays", {"path", "parent"}, item, {"item"}, lane, importPath},
      {of,
       "CreateDirectory",
       "ssa{sv}",
       {"name", "parent", "options"},
       item,
       {"item"},
       lane,
       onDocuments(createDirectory)},
      {of,
       "Rename",
       "ssa{sv}",
       {"itemIdentifier", "name", "options"},
       item,
       {"item"},
       lane,
       onDocuments(renameItem)},
      {of,
       "Reparent",
       "ssa{sv}",
       {"itemIdentifier", "parent", "options"},
       item,
       {"item"},
       lane,
       onDocuments(reparent)},
      {of,
       "Delete",
       "sa{sv}",
       {"itemIdentifier", "options"},
       "",
       {},
       lane,
       onDocuments(deleteItem)},
      {of,
       "Trash",
       "sa{sv}",
       {"itemIdentifier", "options"},
       item,
       {"item"},
       lane,
       onDocuments(trash)},
      {of,
       "Restore",
       "sa{sv}",
       {"itemIdentifier", "options"},
       item,
       {"item"},
       lane,
       onDocuments(restore)},
      {of,
       "SetLastUsedDate",
       "ss",
       {"itemIdentifier", "date"},
       item,
       {"item"},
       lane,
       onDocuments(setLastUsedDate)},
      {of,
       "SetTags",
       "sas",
       {"itemIdentifier", "labels"},
       item,
       {"item"},
       lane,
       onDocuments(setTags)},
      {of,
       "SetTagData",
       "say",
       {"itemIdentifier", "tagData"},
       item,
       {"item"},
       lane,
       onDocuments(setTagData)},
      {of,
       "SetFavoriteRank",
       "sv",
       {"itemIdentifier", "rank"},
       item,
       {"item"},
       lane,
       onDocuments(setFavoriteRank)},
      {of,
       "ClearFavoriteRank",
       "s",
       {"itemIdentifier"},
       item,
       {"item"},
       lane,
       onDocuments(clearFavoriteRank)},
  };
}

}  // namespace mirabel::bus
