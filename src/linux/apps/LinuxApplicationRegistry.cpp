#include "linux/apps/LinuxApplicationRegistry.h"

#include <algorithm>
#include <unordered_set>
#include <utility>

#include "foundation/Log.h"
#include "linux/apps/ApplicationIdentifier.h"

namespace mirabel {
namespace {

constexpr std::string_view documentBrowserKey = "UISupportsDocumentBrowser";

std::vector<std::string> allOf(const ApplicationDirectories& directories) {
  std::vector<std::string> all = directories.user;
  all.insert(all.end(), directories.system.begin(), directories.system.end());
  return all;
}

BundleProxy makeProxy(const std::string& identifier, const DesktopEntry& entry,
                      std::optional<URL> container) {
  BundleProxy proxy;
  proxy.bundleIdentifier = identifier;
  proxy.localizedName = entry.localizedName;
  // An entry that has any of the keys means what it says, and what it leaves out is false.
  const bool guesses = !entry.hasKeys();
  proxy.supportsOpenInPlace = entry.supportsOpenInPlace.value_or(guesses && entry.opensFiles);
  proxy.fileSharingEnabled = entry.fileSharingEnabled.value_or(guesses && container.has_value());
  proxy.dataContainerURL = std::move(container);
  return proxy;
}

PropertyList infoDictionary(const DesktopEntry& entry, std::span<const std::string_view> keys) {
  PropertyList::Dictionary values;
  if (entry.supportsDocumentBrowser && std::ranges::find(keys, documentBrowserKey) != keys.end()) {
    values.emplace_back(std::string(documentBrowserKey), *entry.supportsDocumentBrowser);
  }
  return PropertyList(std::move(values));
}

}  // namespace

/// One look at the entries of a type.
struct LinuxApplicationRegistry::Scan {
  Scan(ApplicationType which, ContainerFolders::Opened opened)
      : type(which), containers(std::move(opened)) {}

  ApplicationType type;
  ContainerFolders::Opened containers;
  std::vector<std::optional<BundleProxy>> applications{};  // nothing for what can't be read
  std::unordered_set<std::string> taken{};                 // identifiers
  std::size_t looks = 0;
  Inodes documentsBefore{};  // of applications that come before
  Inodes documents{};
  Entries entries{};
  LeftOutList leftOut{};
};

LinuxApplicationRegistry::LinuxApplicationRegistry(Options options)
    : options_(std::move(options)),
      containers_(options_.home, options_.device),
      reader_(languagesOf(options_.locales), options_.mostEntryBytes),
      finder_(allOf(options_.directories), reader_, options_.mostDirectoryEntries) {}

// --- enumerating ---------------------------------------------------------------------------------

Result<void> LinuxApplicationRegistry::enumerateApplicationsOfType(ApplicationType type,
                                                                   const EnumerationBlock& block) {
  auto done = scan(type);
  if (!done) return fail(done.error());
  const auto applications = std::move(done->applications);
  remember(*done);
  for (const std::optional<BundleProxy>& application : applications)
    block(application);
  return {};
}

Result<LinuxApplicationRegistry::Scan> LinuxApplicationRegistry::scan(ApplicationType type) {
  auto containers = containers_.open();
  if (!containers) return fail(containers.error());
  Scan result(type, std::move(*containers));
  const std::size_t users = options_.directories.user.size();
  const bool isSystem = type == ApplicationType::system;
  const std::string_view reason = result.containers.reason();
  if (!isSystem && !reason.empty()) result.leftOut.add(ContainerFolders::pathInHome, reason);
  if (isSystem) {
    const std::lock_guard lock(mutex_);
    result.documentsBefore = users_.documents;
  }
  // Those of the user hide those of the system.
  for (std::size_t i = 0; isSystem && i < users; ++i)
    if (auto done = skipDirectory(i, result); !done) return fail(done.error());
  const std::size_t end = isSystem ? finder_.directories().size() : users;
  for (std::size_t i = isSystem ? users : 0; i < end; ++i)
    if (auto done = scanDirectory(i, result); !done) return fail(done.error());
  reader_.endPass();
  return result;
}

// Takes the identifiers of the directory, and as many of the looks as its own enumeration would.
Result<void> LinuxApplicationRegistry::skipDirectory(std::size_t number, Scan& scan) {
  LeftOutList ignored;
  const auto entries = finder_.list(number, ignored);
  if (!entries) return fail(entries.error());
  for (const ListedEntry& entry : *entries) {
    if (scan.taken.contains(entry.identifier)) continue;
    if (scan.looks == options_.mostApplications) break;
    ++scan.looks;
    if (!entry.isThere) {
      const auto reading = reader_.read(finder_.directories()[number] + "/" + entry.relativePath);
      if (!reading) return fail(reading.error());
      if (reading->isAbsent()) continue;
    }
    scan.taken.insert(entry.identifier);
  }
  return {};
}

Result<void> LinuxApplicationRegistry::scanDirectory(std::size_t number, Scan& scan) {
  const auto entries = finder_.list(number, scan.leftOut);
  if (!entries) return fail(entries.error());
  for (const ListedEntry& entry : *entries) {
    if (scan.taken.contains(entry.identifier)) continue;
    if (scan.looks == options_.mostApplications) {
      scan.leftOut.add(entry.identifier, "there are more applications than are looked at");
      continue;
    }
    ++scan.looks;
    const std::string path = finder_.directories()[number] + "/" + entry.relativePath;
    if (auto done = scanEntry(entry.identifier, path, scan); !done) return done;
  }
  return {};
}

Result<void> LinuxApplicationRegistry::scanEntry(const std::string& identifier,
                                                 const std::string& path, Scan& scan) {
  const auto reading = reader_.read(path);
  if (!reading) return fail(reading.error());
  if (reading->isAbsent()) return {};
  scan.taken.insert(identifier);
  if (!reading->entry) {
    scan.leftOut.add(identifier, reading->reason);
    scan.applications.emplace_back(std::nullopt);
    return {};
  }
  if (!reading->entry->isApplication) return {};
  const auto look = scan.containers.look(identifier);
  if (!look) return fail(look.error());
  auto container = documentsOf(identifier, *look, scan);
  scan.applications.emplace_back(makeProxy(identifier, *reading->entry, std::move(container)));
  scan.entries.emplace(identifier, reading->entry);
  return {};
}

std::optional<URL> LinuxApplicationRegistry::documentsOf(const std::string& identifier,
                                                         const ContainerFolders::Look& look,
                                                         Scan& scan) {
  std::string_view reason = look.reason;
  // Two names may lead to one folder, where case does not count or something is mounted twice.
  const bool isTaken = look.hasDocuments && (scan.documentsBefore.contains(look.inode) ||
                                             !scan.documents.insert(look.inode).second);
  if (isTaken) reason = "its documents are those of another application";
  if (!reason.empty()) scan.leftOut.add(identifier, reason);
  if (!look.hasDocuments || isTaken) return {};
  return containers_.containerOf(identifier);
}

void LinuxApplicationRegistry::remember(Scan& scan) {
  Seen seen{std::move(scan.entries), std::move(scan.documents), scan.leftOut.items()};
  const std::lock_guard lock(mutex_);
  (scan.type == ApplicationType::system ? systems_ : users_) = std::move(seen);
  looked_.clear();
}

std::vector<LeftOut> LinuxApplicationRegistry::leftOut() const {
  const std::lock_guard lock(mutex_);
  std::vector<LeftOut> all = users_.leftOut;
  all.insert(all.end(), systems_.leftOut.begin(), systems_.leftOut.end());
  return all;
}

// --- looking up one ------------------------------------------------------------------------------

std::optional<BundleProxy> LinuxApplicationRegistry::proxyForBundleIdentifier(
    std::string_view identifier) {
  if (!isApplicationIdentifier(identifier)) return {};
  auto proxy = proxyOf(std::string(identifier));
  if (proxy) return std::move(*proxy);
  logError("can't read application " + quoted(identifier) + "; " + proxy.error().description());
  return {};
}

std::optional<BundleProxy> LinuxApplicationRegistry::proxyAt(const URL& url) {
  auto proxy = proxyForBundleIdentifier(containers_.identifierAt(url));
  if (!proxy || !proxy->dataContainerURL) return {};
  return proxy;
}

Result<std::optional<BundleProxy>> LinuxApplicationRegistry::proxyOf(
    const std::string& identifier) {
  const auto reading = finder_.find(identifier);
  if (!reading) return fail(reading.error());
  const bool isApplication = reading->entry != nullptr && reading->entry->isApplication;
  learn(identifier, isApplication ? reading->entry : nullptr);
  if (!isApplication) return std::nullopt;
  const auto containers = containers_.open();
  if (!containers) return fail(containers.error());
  const auto look = containers->look(identifier);
  if (!look) return fail(look.error());
  std::optional<URL> container;
  if (look->hasDocuments) container = containers_.containerOf(identifier);
  return makeProxy(identifier, *reading->entry, std::move(container));
}

void LinuxApplicationRegistry::learn(const std::string& identifier,
                                     std::shared_ptr<const DesktopEntry> entry) {
  const std::lock_guard lock(mutex_);
  if (entry == nullptr) {
    looked_.erase(identifier);
  } else {
    looked_.insert_or_assign(identifier, std::move(entry));
  }
}

std::shared_ptr<const DesktopEntry> LinuxApplicationRegistry::known(
    const std::string& identifier) const {
  const std::lock_guard lock(mutex_);
  for (const Entries* entries : {&looked_, &users_.entries, &systems_.entries})
    if (const auto found = entries->find(identifier); found != entries->end()) return found->second;
  return nullptr;
}

std::optional<PropertyList> LinuxApplicationRegistry::infoDictionaryValues(
    const BundleProxy& application, std::span<const std::string_view> keys) {
  if (!application.bundleIdentifier) return {};
  const std::string& identifier = *application.bundleIdentifier;
  // Mostly it is asked of an application that was just reported.
  auto entry = known(identifier);
  if (entry == nullptr && proxyForBundleIdentifier(identifier)) entry = known(identifier);
  if (entry == nullptr) return {};
  return infoDictionary(*entry, keys);
}

}  // namespace mirabel
