#include "linux/volume/ChangeRecorder.h"

#include <utility>
#include <vector>

namespace mirabel {
namespace {

bool holdsThings(const ObjectRow& row) {
  return row.kind == ObjectKind::folder || row.kind == ObjectKind::package;
}

}  // namespace

ChangeRecorder::ChangeRecorder(IdentityStore& store, EventJournal& journal,
                               const MonitoredRoots& roots,
                               std::function<bool(std::string_view)> isPackageName)
    : store_(store), journal_(journal), roots_(roots), isPackageName_(std::move(isPackageName)) {}

Result<void> ChangeRecorder::changed(const ObjectRow& row, const Location& location,
                                     bool changedKind) {
  if (!isActive()) return {};
  auto path = store_.pathOf(location);
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
                                   const Location& to) {
  if (!isActive()) return {};
  bool sightChanges = true;
  if (from) {
    if (auto told = changed(row, *from); !told) return told;
    auto before = store_.pathOf(*from);
    auto after = store_.pathOf(to);
    if (!before) return fail(before.error());
    if (!after) return fail(after.error());
    sightChanges = !*before || !*after || !(sightOf(**before) == sightOf(**after));
  }
  if (auto told = changed(row, to); !told) return told;
  return sightChanges && holdsThings(row) ? contents(row.fileID) : Result<void>();
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
  auto path = store_.pathOf(from);
  if (!path) return fail(path.error());
  // Where the folder above is nowhere either, it has told of all that was in it.
  if (!*path) return {};
  if (auto told = append(row, from, **path, false); !told) return told;
  if (row.documentID != 0) {
    if (auto ended = handedOn(row.documentID, row.fileID, 0); !ended) return ended;
  }
  return holdsThings(row) ? goneContents(row.fileID, std::move(**path)) : Result<void>();
}

Result<void> ChangeRecorder::goneContents(std::uint64_t folder, std::string path) {
  std::vector<std::pair<std::uint64_t, std::string>> pending{{folder, std::move(path)}};
  while (!pending.empty()) {
    const auto [id, folderPath] = std::move(pending.back());
    pending.pop_back();
    auto children = store_.childrenOf(id);
    if (!children) return fail(children.error());
    for (ObjectRow& child : *children) {
      std::string childPath = folderPath + "/" + child.location->name;
      if (auto told = append(child, *child.location, childPath, false); !told) return told;
      if (child.documentID != 0) {
        auto ended = handedOn(child.documentID, child.fileID, 0);
        if (!ended) return ended;
      }
      if (holdsThings(child)) pending.emplace_back(child.fileID, std::move(childPath));
      child.location.reset();
      if (auto detached = store_.put(child); !detached) return detached;
    }
  }
  return {};
}

Result<void> ChangeRecorder::contents(std::uint64_t folder) {
  std::vector<std::uint64_t> pending{folder};
  while (!pending.empty()) {
    const std::uint64_t id = pending.back();
    pending.pop_back();
    auto children = store_.childrenOf(id);
    if (!children) return fail(children.error());
    for (const ObjectRow& child : *children) {
      if (auto told = changed(child, *child.location); !told) return told;
      if (holdsThings(child)) pending.push_back(child.fileID);
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
