#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "linux/apps/ApplicationDirectories.h"
#include "linux/apps/ContainerFolders.h"
#include "linux/apps/EntryFinder.h"
#include "linux/apps/EntryReader.h"
#include "linux/apps/LeftOut.h"
#include "platform/ApplicationRegistry.h"

namespace mirabel {

/// The applications that desktop entries tell of; see docs/applications.md. An application has a
/// data container as long as it has a folder for documents in it. Entries are read when they are
/// asked for, and again when they have changed; making one of these reads nothing. Any thread may
/// call it; the blocks of an enumeration are called on the caller's, and may call it in turn.
class LinuxApplicationRegistry final : public ApplicationRegistry {
 public:
  struct Options {
    std::string home;  ///< absolute and resolved
    ApplicationDirectories directories;
    /// The file system of the document storage; containers on another are left out.
    std::uint64_t device = 0;
    /// The languages of names; empty for those of the environment. See `languagesOf`.
    std::vector<std::string> locales{};
    std::size_t mostApplications = 20'000;       ///< of both types together
    std::size_t mostDirectoryEntries = 100'000;  ///< names in one directory
    std::size_t mostEntryBytes = 256u << 10;
  };
  explicit LinuxApplicationRegistry(Options options);

  std::optional<BundleProxy> proxyForBundleIdentifier(std::string_view identifier) override;
  std::optional<BundleProxy> proxyAt(const URL& url) override;
  /// In the order of the directories, and of the identifiers in each.
  Result<void> enumerateApplicationsOfType(ApplicationType type,
                                           const EnumerationBlock& block) override;
  std::optional<PropertyList> infoDictionaryValues(const BundleProxy& application,
                                                   std::span<const std::string_view> keys) override;

  /// What the last enumerations, one of each type, did not tell of. In an order that depends on
  /// nothing but what is on the disk.
  [[nodiscard]] std::vector<LeftOut> leftOut() const;

 private:
  using Entries = std::unordered_map<std::string, std::shared_ptr<const DesktopEntry>>;
  using Inodes = std::unordered_set<std::uint64_t>;
  struct Scan;

  [[nodiscard]] Result<Scan> scan(ApplicationType type);
  [[nodiscard]] Result<void> skipDirectory(std::size_t number, Scan& scan);
  [[nodiscard]] Result<void> scanDirectory(std::size_t number, Scan& scan);
  [[nodiscard]] Result<void> scanEntry(const std::string& identifier, const std::string& path,
                                       Scan& scan);
  [[nodiscard]] std::optional<URL> documentsOf(const std::string& identifier,
                                               const ContainerFolders::Look& look, Scan& scan);
  void remember(Scan& scan);

  [[nodiscard]] Result<std::optional<BundleProxy>> proxyOf(const std::string& identifier);
  [[nodiscard]] std::shared_ptr<const DesktopEntry> known(const std::string& identifier) const;
  void learn(const std::string& identifier, std::shared_ptr<const DesktopEntry> entry);

  /// What was seen when the applications of one type were enumerated last.
  struct Seen {
    Entries entries;
    Inodes documents;
    std::vector<LeftOut> leftOut;
  };

  const Options options_;
  const ContainerFolders containers_;
  EntryReader reader_;
  EntryFinder finder_;
  mutable std::mutex mutex_;
  Seen users_;
  Seen systems_;
  Entries looked_;  // those that were looked up since
};

}  // namespace mirabel
