#include "linux/volume/ChangeRecorder.h"

#include <map>
#include <utility>
#include <vector>

namespace mirabel {
namespace {

bool holdsThings(const ObjectRow& row) {
  return row.kind == ObjectKind::folder || row.kind == ObjectKind::package;
}

}  // namespace

ChangeRecorder::ChangeRecorder(IdentityStore& store, EventJournal& journal,
                               const IndexedPaths& paths, const MonitoredRoots& roots,
                               std::function<bool(std::string_view)> isPackageName)
    : store_(store),
      journal_(journal),
      paths_(paths),
      roots_(roots),
      isPackageName_(std::move(isPackageName)) {}

Result<void> ChangeRecorder::changed(const ObjectRow& row, const Location& location,
                                     bool changedKind) {
  if (!isActive()) return {};
  auto path = paths_.pathOf(location);
  if (!path) return fail(path.error());
  // A folder above that is nowhere has told of its contents itself.
  if (!*path) return {};
  return append(row, location, std::move(**path), changedKind);
}

Result<void> ChangeRecorder::append(const ObjectRow& row, const Location& location,
                                    std::string path, bool changedKind) {
  JournalRecord record;
  record.folder = location.folder;
  record.path = std::move(path);
  record.fileID = row.fileID;
  record.documentID = isDocumentKind(row.kind) || changedKind ? row.documentID : 0;
  record.changedKind = changedKind;
  return journal_.append(record);
}

Result<void> ChangeRecorder::moved(const ObjectRow& row, const std::optional<Location>& from,
                                   const Location& to, bool changedKind) {
  if (!isActive()) return {};
  bool sightChanges = true;
  if (from) {
    if (auto told = changed(row, *from, changedKind); !told) return told;
    auto before = paths_.pathOf(*from);
    auto after = paths_.pathOf(to);
    if (!before) return fail(before.error());
    if (!after) return fail(after.error());
    sightChanges = !*before || !*after || !(sightOf(**before) == sightOf(**after));
  }
  if (auto told = changed(row, to, changedKind); !told) return told;
  if (!holdsThings(row)) return {};
  return contents(row.fileID, sightChanges ? Which::everything : Which::hardLinked);
}

Result<void> ChangeRecorder::handedOn(std::uint32_t documentID, std::uint64_t source,
                                      std::uint64_t destination) {
  JournalRecord record;
  record.isDocument = true;
  record.documentID = documentID;
  record.source = source;
  record.destination = destination;
  return journal_.append(record);
}

Result<void> ChangeRecorder::gone(const ObjectRow& row, const Location& from) {
  if (!isActive()) return {};
  auto path = paths_.pathOf(from);
  if (!path) return fail(path.error());
  // Where the folder above is nowhere either, it has told of all that was in it.
  if (!*path) return {};
  // Of a document that goes on in another object, nothing but that is told.
  const bool goesOn = isDocumentKind(row.kind) && row.documentID == 0;
  if (!goesOn) {
    if (auto told = append(row, from, **path, false); !told) return told;
  }
  if (row.documentID != 0) {
    if (auto ended = handedOn(row.documentID, row.fileID, 0); !ended) return ended;
  }
  return holdsThings(row) ? goneContents(row.fileID, std::move(**path)) : Result<void>();
}

Result<void> ChangeRecorder::goneContents(std::uint64_t folder, std::string path) {
  // The folders first, so that it is known which further links went with them.
  std::map<std::uint64_t, std::string> folders{{folder, std::move(path)}};
  std::vector<ObjectRow> things;
  std::vector<std::uint64_t> pending{folder};
  while (!pending.empty()) {
    const std::uint64_t id = pending.back();
    pending.pop_back();
    auto children = store_.childrenOf(id);
    if (!children) return fail(children.error());
    for (ObjectRow& child : *children) {
      if (holdsThings(child)) {
        folders[child.fileID] = folders[id] + "/" + child.location->name;
        pending.push_back(child.fileID);
      }
      things.push_back(std::move(child));
    }
  }
  for (ObjectRow& thing : things) {
    const std::string& folderPath = folders[thing.location->folder];
    auto told = append(thing, *thing.location, folderPath + "/" + thing.location->name, false);
    if (told) told = goneThing(std::move(thing), folders);
    if (!told) return told;
  }
  for (const auto& [id, folderPath] : folders) {
    if (auto told = goneLinks(id, folderPath); !told) return told;
  }
  return {};
}

Result<void> ChangeRecorder::goneLinks(std::uint64_t folder, const std::string& path) {
  auto links = store_.linksIn(folder);
  if (!links) return fail(links.error());
  for (const auto& [name, slot] : *links) {
    if (auto removed = store_.removeLink(folder, name); !removed) return removed;
    auto row = store_.objectInSlot(slot);
    if (!row) return fail(row.error());
    if (!*row) continue;
    if ((*row)->location) noteSurvivor((*row)->fileID);
    std::string place = path;
    place.append("/").append(name);
    if (auto told = append(**row, {folder, name}, std::move(place), false); !told) return told;
  }
  return {};
}

Result<void> ChangeRecorder::goneThing(ObjectRow thing,
                                       const std::map<std::uint64_t, std::string>& folders) {
  thing.location.reset();
  auto links = store_.links(thing.slot);
  if (!links) return fail(links.error());
  for (Location& link : *links) {
    if (auto removed = store_.removeLink(link.folder, link.name); !removed) return removed;
    if (folders.contains(link.folder)) continue;
    // It lives on under this name.
    thing.location = std::move(link);
    noteSurvivor(thing.fileID);
    if (auto kept = store_.put(thing); !kept) return kept;
    return changed(thing, *thing.location);
  }
  if (auto detached = store_.put(thing); !detached) return detached;
  return thing.documentID == 0 ? Result<void>() : handedOn(thing.documentID, thing.fileID, 0);
}

Result<void> ChangeRecorder::contents(std::uint64_t folder, Which which) {
  const bool isEverything = which == Which::everything;
  if (!isEverything && !store_.mayHaveLinks()) return {};
  std::vector<std::uint64_t> pending{folder};
  while (!pending.empty()) {
    const std::uint64_t id = pending.back();
    pending.pop_back();
    auto children = store_.childrenOf(id);
    if (!children) return fail(children.error());
    for (const ObjectRow& child : *children) {
      if (holdsThings(child)) pending.push_back(child.fileID);
      if (!isEverything) {
        auto names = store_.links(child.slot);
        if (!names) return fail(names.error());
        if (names->empty()) continue;
      }
      if (auto told = changed(child, *child.location); !told) return told;
    }
    auto links = store_.linksIn(id);
    if (!links) return fail(links.error());
    for (const auto& [name, slot] : *links) {
      auto row = store_.objectInSlot(slot);
      if (!row) return fail(row.error());
      if (!*row) continue;
      if (auto told = changed(**row, {id, name}); !told) return told;
    }
  }
  return {};
}

ChangeRecorder::Sight ChangeRecorder::sightOf(const std::string& path) const {
  Sight sight;
  const auto place = roots_.locate(path);
  if (!place) return sight;
  sight.isBelowRoot = true;
  sight.root = place->root;
  std::string_view rest = place->relative;
  for (bool isFirst = true; !rest.empty(); isFirst = false) {
    const std::size_t slash = rest.find('/');
    const std::string_view name = rest.substr(0, slash);
    const bool isLast = slash == std::string_view::npos;
    if (isFirst && name == ".Trash") {
      sight.isTrashed = true;
    } else if (name.starts_with('.') || name == "Inbox") {
      sight.isHidden = true;
    } else if (!isLast && isPackageName_(name)) {
      sight.isInPackage = true;
    }
    rest = isLast ? std::string_view() : rest.substr(slash + 1);
  }
  return sight;
}

}  // namespace mirabel
