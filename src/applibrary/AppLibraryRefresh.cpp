#include "applibrary/AppLibraryRefresh.h"

#include <algorithm>
#include <array>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/Log.h"

namespace mirabel {
namespace {

constexpr std::string_view documentBrowserKey = "UISupportsDocumentBrowser";
constexpr std::array<std::string_view, 1> infoKeys = {documentBrowserKey};

/// A URL that names no place could not be kept in the cache, and would look like a change each
/// time.
bool hasContainer(const BundleProxy& application) {
  return application.dataContainerURL && !application.dataContainerURL->path().empty();
}

bool qualifies(ApplicationRegistry& registry, const BundleProxy& application) {
  if (!hasContainer(application)) return false;
  const auto info = registry.infoDictionaryValues(application, infoKeys);
  if (!info) return false;
  const PropertyList* value = info->find(documentBrowserKey);
  const bool* browses = value == nullptr ? nullptr : value->as<bool>();
  if (browses != nullptr && *browses) return true;
  return application.supportsOpenInPlace && application.fileSharingEnabled;
}

bool areIdentical(const std::vector<BundleProxy>& records, const std::vector<BundleProxy>& others) {
  return std::ranges::equal(records, others, {}, &BundleProxy::dataContainerURL,
                            &BundleProxy::dataContainerURL);
}

/// Whether the file holds what the cache's token stands for. It does not where it was lost, or
/// where a slower process has put an older content over it: then equal lists prove nothing of what
/// managers hold.
bool isCurrent(const std::optional<LocalAppLibraryCache::Content>& content,
               const LocalAppLibraryCache& cache) {
  return (content ? content->versionToken : 0) == cache.versionToken();
}

}  // namespace

Result<std::vector<BundleProxy>> retrieveAppLibraries(ApplicationRegistry& registry) {
  const LogSection section("retrieving app libraries from kestrel");
  std::vector<BundleProxy> records;
  const auto add = [&](const std::optional<BundleProxy>& application) {
    if (!application) return logError("enumerate Application provided nil proxy");
    if (!qualifies(registry, *application)) return;
    logDebug([&] { return "add " + application->bundleIdentifier.value_or("<unknown>"); });
    records.push_back(*application);
  };
  for (const ApplicationType type : {ApplicationType::user, ApplicationType::system}) {
    // Half a list would have the other half deleted.
    if (auto done = registry.enumerateApplicationsOfType(type, add); !done) {
      return fail(done.error());
    }
  }
  return records;
}

Result<bool> refreshMainCache(ApplicationRegistry& registry, LocalAppLibraryCache& mainCache,
                              std::optional<std::vector<BundleProxy>>* latest) {
  const auto cannotRefresh = [](const Error& error) {
    logError("can't refresh app libraries; " + error.description());
    return fail(error);
  };
  const auto records = retrieveAppLibraries(registry);
  if (!records) return cannotRefresh(records.error());
  if (latest != nullptr) *latest = *records;
  const auto previous = mainCache.load();
  const bool isUnchanged =
      areIdentical(*records, previous ? previous->records : std::vector<BundleProxy>());
  if (isUnchanged && isCurrent(previous, mainCache)) {
    logDebug("bundle proxies are identical to previous version");
    return false;
  }
  const auto token = mainCache.save(*records, 0, LocalAppLibraryCache::Increment::yes);
  if (!token) return cannotRefresh(token.error());
  logDebug("main cache version token is now " + std::to_string(*token));
  return true;
}

}  // namespace mirabel
