#include "support/FakePlatform.h"

#include <algorithm>
#include <cerrno>
#include <limits>
#include <mutex>
#include <utility>

#include "support/FakeCore.h"
#include "support/FakeFileOperations.h"

namespace mirabel::testing {
namespace {

using NodePointer = std::shared_ptr<FakeNode>;

using Core = FakeCore;

std::vector<std::string> attributeNames(const FakeNode& node) {
  std::vector<std::string> names;
  for (const auto& [name, value] : node.attributes)
    names.push_back(name);
  return names;
}

class Resources final : public ResourceValueSource {
 public:
  explicit Resources(Core& core) : core_(core) {}

  Result<ResourceValues> readValues(const URL& url) override {
    const std::lock_guard lock(core_.mutex);
    const auto node = core_.look(Op::readValues, url);
    if (node) return FakeVolume::values(**node, url.lastPathComponent());
    if (node.error().isPosix(ENOENT)) return fail(Error::file(FileErrorCode::noSuchFile));
    return fail(node.error());
  }

  Result<void> prefetch(std::span<const URL> urls) override {
    const std::lock_guard lock(core_.mutex);
    if (auto error = core_.faults.hit(Op::prefetch)) return fail(*std::move(error));
    for (const URL& url : urls) {
      const auto node = core_.volume.find(url.path());
      if (!node) continue;
      url.resources().fill(FakeVolume::values(**node, url.lastPathComponent()));
      url.resources().setAttributeNames(attributeNames(**node));
    }
    return {};
  }

 private:
  Core& core_;
};

class Attributes final : public ExtendedAttributeStore {
 public:
  explicit Attributes(Core& core) : core_(core) {}

  Result<std::vector<std::string>> names(const URL& url) override {
    const std::lock_guard lock(core_.mutex);
    const auto node = core_.look(Op::attributeNames, url);
    if (!node) return fail(node.error());
    return attributeNames(**node);
  }

  Result<std::size_t> size(std::string_view name, const URL& url) override {
    const std::lock_guard lock(core_.mutex);
    const auto data = value(Op::attributeSize, name, url);
    if (!data) return fail(data.error());
    return data->size();
  }

  Result<Data> read(std::string_view name, const URL& url, std::size_t size) override {
    const std::lock_guard lock(core_.mutex);
    auto data = value(Op::attributeRead, name, url);
    if (data && data->size() > size) return fail(Error::posix(ERANGE));
    return data;
  }

  Result<std::unique_ptr<AttributeTarget>> open(const URL& url) override {
    const std::lock_guard lock(core_.mutex);
    const auto node = core_.look(Op::attributeOpen, url);
    if (!node) return fail(node.error());
    return std::make_unique<FakeAttributeTarget>(core_, *node);
  }

 private:
  Result<Data> value(Op op, std::string_view name, const URL& url) {
    const auto node = core_.look(op, url);
    if (!node) return fail(node.error());
    const auto found = (*node)->attributes.find(name);
    if (found == (*node)->attributes.end()) return fail(Error::posix(ENODATA));
    return found->second;
  }

  Core& core_;
};

class OpenObject final : public FileObject {
 public:
  OpenObject(Core& core, NodePointer opened) : node(std::move(opened)), core_(core) {}

  Result<DeviceID> device() override {
    if (auto error = core_.faults.hit(Op::device)) return fail(*std::move(error));
    return FakePlatform::deviceID;
  }

  Result<ObjectAttributes> attributes() override {
    if (auto error = core_.faults.hit(Op::attributes)) return fail(*std::move(error));
    const std::lock_guard lock(core_.mutex);
    return ObjectAttributes{node->kind, node->documentID, node->fileID};
  }

  const NodePointer node;

 private:
  Core& core_;
};

class Objects final : public FileObjects {
 public:
  explicit Objects(Core& core) : core_(core) {}

  Result<std::unique_ptr<FileObject>> open(const URL& url) override {
    const std::lock_guard lock(core_.mutex);
    const auto node = core_.look(Op::openObject, url);
    if (!node) return fail(node.error());
    return std::make_unique<OpenObject>(core_, *node);
  }

  Result<FileStatus> status(const URL& url) override {
    const std::lock_guard lock(core_.mutex);
    const auto node = core_.look(Op::status, url);
    if (!node) return fail(node.error());
    if ((*node)->kind != FileKind::folder) return FileStatus{(*node)->fileID, 1};
    const std::size_t links = std::min<std::size_t>((*node)->entries.size() + 2,
                                                    std::numeric_limits<std::uint16_t>::max());
    return FileStatus{(*node)->fileID,
                      (*node)->linkCount.value_or(static_cast<std::uint16_t>(links))};
  }

  Result<std::string> pathOfFileID(DeviceID device, std::uint64_t fileID) override {
    const std::lock_guard lock(core_.mutex);
    if (auto error = core_.faults.hit(Op::pathOfFileID)) return fail(*std::move(error));
    const auto paths = core_.volume.pathsOfFileID(fileID);
    if (device != FakePlatform::deviceID || paths.empty()) return fail(Error::posix(ENOENT));
    return paths.front();
  }

  Result<std::vector<std::string>> pathsOfFileID(DeviceID device, std::uint64_t fileID) override {
    const std::lock_guard lock(core_.mutex);
    if (auto error = core_.faults.hit(Op::pathsOfFileID)) return fail(*std::move(error));
    if (device != FakePlatform::deviceID) return std::vector<std::string>();
    return core_.volume.pathsOfFileID(fileID);
  }

 private:
  Core& core_;
};

class Documents final : public GenerationalStore {
 public:
  explicit Documents(Core& core) : core_(core) {}

  Result<std::uint32_t> permanentStorage(FileObject& object) override {
    const std::lock_guard lock(core_.mutex);
    if (auto error = core_.faults.hit(Op::permanentStorage)) return fail(*std::move(error));
    return core_.volume.documentIDOf(*static_cast<OpenObject&>(object).node);
  }

  Result<std::uint32_t> permanentStorageForItemAtURL(const URL& url,
                                                     Allocation allocation) override {
    const std::lock_guard lock(core_.mutex);
    const auto node = core_.look(Op::permanentStorageForItemAtURL, url);
    if (!node) return fail(node.error());
    if (allocation == Allocation::never) return (*node)->documentID;
    return core_.volume.documentIDOf(**node);
  }

  Result<std::uint64_t> fileIDOfDocument(DeviceID device, std::int64_t documentID) override {
    const std::lock_guard lock(core_.mutex);
    if (auto error = core_.faults.hit(Op::fileIDOfDocument)) return fail(*std::move(error));
    const std::uint64_t fileID =
        core_.volume.fileIDOfDocument(static_cast<std::uint64_t>(documentID));
    if (device != FakePlatform::deviceID || fileID == 0) return fail(Error::posix(ENOENT));
    return fileID;
  }

 private:
  Core& core_;
};

/// The names as they were when the folder was opened. A position is the place of the entry behind
/// it, or one more than the last.
class OpenDirectory final : public DirectoryStream {
 public:
  OpenDirectory(Core& core, const FakeNode& folder) : core_(core), places_{0, 1} {
    names_ = {{".", FileKind::folder}, {"..", FileKind::folder}};
    for (const auto& [name, node] : folder.entries) {
      names_.emplace_back(name, node->kind);
      places_.push_back(node->place);
    }
  }

  void seek(std::uint64_t position) {
    // As on a disk: where that entry has gone, its place is between the others.
    while (next_ < places_.size() && places_[next_] < position)
      ++next_;
  }

  std::optional<std::uint64_t> position() override {
    if (next_ < places_.size()) return places_[next_];
    return places_.back() + 1;
  }

  std::optional<DirectoryEntry> next() override {
    if (core_.faults.hit(Op::nextEntry)) next_ = names_.size();
    if (next_ == names_.size()) return {};
    const auto& [name, kind] = names_[next_++];
    return DirectoryEntry{name, kind};
  }

  Result<void> close() override {
    if (auto error = core_.faults.hit(Op::closeDirectory)) return fail(*std::move(error));
    return {};
  }

 private:
  Core& core_;
  std::vector<std::pair<std::string, FileKind>> names_;
  std::vector<std::uint64_t> places_;
  std::size_t next_ = 0;
};

class Directories final : public DirectoryStreams {
 public:
  explicit Directories(Core& core) : core_(core) {}

  Result<std::unique_ptr<DirectoryStream>> open(const URL& folder) override {
    return openAt(folder, 0);
  }

  Result<std::unique_ptr<DirectoryStream>> openAt(const URL& folder,
                                                  std::uint64_t position) override {
    const std::lock_guard lock(core_.mutex);
    const auto node = core_.look(Op::openDirectory, folder);
    if (!node) return fail(node.error());
    if ((*node)->kind != FileKind::folder) return fail(Error::posix(ENOTDIR));
    auto stream = std::make_unique<OpenDirectory>(core_, **node);
    stream->seek(position);
    return stream;
  }

 private:
  Core& core_;
};

std::uint64_t totalSize(const FakeNode& node) {
  std::uint64_t size = node.kind == FileKind::regular ? node.contents.size() : 0;
  for (const auto& [name, child] : node.entries)
    size += totalSize(*child);
  return size;
}

class Sizer final : public DirectorySizer {
 public:
  explicit Sizer(Core& core) : core_(core) {}

  Result<std::uint64_t> directorySize(const URL& folder) override {
    const std::lock_guard lock(core_.mutex);
    const auto node = core_.look(Op::directorySize, folder);
    if (!node) return fail(node.error());
    return totalSize(**node);
  }

 private:
  Core& core_;
};

class Manager final : public VesselManager {
 public:
  Manager(URL documentStorage, FakeSignals& signals)
      : documentStorage_(std::move(documentStorage)), signals_(signals) {}
  const URL& documentStorageURL() const override { return documentStorage_; }

  void signalEnumeratorForContainerItemIdentifier(std::string_view container,
                                                  SignalHandler completionHandler) override {
    std::unique_lock lock(mutex_);  // they come from the thread of a refresh, too
    signals_.containers.emplace_back(container);
    if (!signals_.answers) return signals_.waiting.push_back(std::move(completionHandler));
    lock.unlock();
    const auto refusal = signals_.refusals.find(container);
    completionHandler(refusal == signals_.refusals.end() ? std::nullopt
                                                         : std::optional(refusal->second));
  }

  void deleteSearchableItemsWithDomainIdentifiers(const std::vector<std::string>& domains,
                                                  DeletionHandler completionHandler) override {
    signals_.deletedDomains.push_back(domains);
    if (!signals_.answers) return signals_.waiting.push_back(std::move(completionHandler));
    completionHandler(signals_.deletionRefusal);
  }

 private:
  URL documentStorage_;
  FakeSignals& signals_;
  std::mutex mutex_;
};

class History final : public VolumeHistory {
 public:
  History(Core& core, const UUID& uuid) : core_(core), uuid_(uuid) {}

  Result<UUID> historyUUID(const URL&) override {
    if (auto error = core_.faults.hit(Op::historyUUID)) return fail(*std::move(error));
    return uuid_;
  }

 private:
  Core& core_;
  const UUID& uuid_;
};

}  // namespace

Result<void> FakePositions::keep(std::string_view container, const Data& cursor,
                                 const Data& position) {
  if (auto error = faults_.hit(Op::keepPosition)) return fail(*std::move(error));
  kept.insert_or_assign({std::string(container), cursor}, position);
  return {};
}

std::optional<Data> FakePositions::find(std::string_view container, const Data& cursor) {
  const auto found = kept.find({std::string(container), cursor});
  return found == kept.end() ? std::nullopt : std::optional(found->second);
}

struct FakePlatform::Interfaces {
  Interfaces(FakePlatform& owner, URL documentStorage)
      : core{owner.volume, owner.faults, {}},
        reports(owner.reports),
        manager(std::move(documentStorage), owner.signals),
        history(core, owner.historyUUID) {}

  Core core;
  FakeReports& reports;
  Resources resources{core};
  Attributes attributes{core};
  Objects objects{core};
  Documents documents{core};
  Directories directories{core};
  Sizer sizes{core};
  FakeFileOperations operations{core, reports};
  Manager manager;
  History history;
};

FakePlatform::FakePlatform(std::string_view documentStorage)
    : interfaces_(std::make_unique<Interfaces>(*this, URL::fileURL(documentStorage))),
      platform_(std::make_unique<Platform>(
          Platform{interfaces_->resources, interfaces_->attributes, interfaces_->objects,
                   interfaces_->documents, interfaces_->directories, interfaces_->sizes,
                   interfaces_->operations, applications, interfaces_->manager,
                   interfaces_->history, clock, positions, caches})) {
  volume.makeFolder(documentStorage);
}

FakePlatform::~FakePlatform() = default;

URL FakePlatform::url(std::string_view relative) const {
  URL url = interfaces_->manager.documentStorageURL();
  while (!relative.empty()) {
    const std::string_view component = relative.substr(0, relative.find('/'));
    url = url.appendingPathComponent(component);
    relative.remove_prefix(std::min(relative.size(), component.size() + 1));
  }
  return url;
}

std::string FakePlatform::path(std::string_view relative) const {
  return url(relative).path();
}

BundleProxy FakePlatform::install(std::string_view bundleIdentifier, std::string_view container,
                                  std::optional<std::string> localizedName) {
  volume.makeFolder(std::string(container) + "/Documents");
  BundleProxy proxy{std::string(bundleIdentifier), URL::fileURL(container),
                    std::move(localizedName)};
  proxy.supportsOpenInPlace = true;
  proxy.fileSharingEnabled = true;
  applications.installed.push_back(proxy);
  return proxy;
}

void FakePlatform::uninstall(std::string_view bundleIdentifier) {
  std::erase_if(applications.installed, [&](const BundleProxy& proxy) {
    return proxy.bundleIdentifier == bundleIdentifier;
  });
}

}  // namespace mirabel::testing
