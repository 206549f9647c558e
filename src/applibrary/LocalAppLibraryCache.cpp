#include "applibrary/LocalAppLibraryCache.h"

#include <limits>
#include <utility>
#include <variant>

#include "applibrary/BundleProxyArchive.h"
#include "foundation/FatalError.h"
#include "foundation/KeyedArchive.h"
#include "foundation/Log.h"

namespace mirabel {
namespace {

constexpr std::string_view versionTokenKey = "versionToken";
constexpr std::string_view bundleProxyKey = "bundleProxy";
// No archive is larger.
constexpr std::size_t largestFile = 16u << 20;

std::string_view nameOf(LocalAppLibraryCacheSource source) {
  return source == LocalAppLibraryCacheSource::main ? "main" : "working-set";
}

std::string_view fileNameOf(LocalAppLibraryCacheSource source) {
  return source == LocalAppLibraryCacheSource::main ? "app-libraries.plist"
                                                    : "searchable-app-libraries.plist";
}

const PropertyList* find(const PropertyList::Dictionary& dictionary, std::string_view wanted) {
  for (const auto& [key, value] : dictionary)
    if (key == wanted) return &value;
  return nullptr;
}

std::optional<std::uint64_t> versionTokenFrom(const PropertyList::Dictionary& root) {
  const PropertyList* value = find(root, versionTokenKey);
  const auto* number = value == nullptr ? nullptr : value->as<Number>();
  if (number == nullptr || std::holds_alternative<double>(number->value)) return {};
  return number->asUnsigned();
}

std::optional<std::vector<BundleProxy>> recordsFrom(const PropertyList::Dictionary& root) {
  const PropertyList* value = find(root, bundleProxyKey);
  return value == nullptr ? std::nullopt : unarchivedBundleProxies(*value);
}

}  // namespace

std::string_view rawValue(LocalAppLibraryCacheSource source) {
  return source == LocalAppLibraryCacheSource::main ? "main cache" : "working-set cache";
}

LocalAppLibraryCache::LocalAppLibraryCache(CacheFiles& files, LocalAppLibraryCacheSource source)
    : files_(files),
      source_(source),
      queue_("mirabel.app-library-cache." + std::string(nameOf(source))),
      cacheURL_(
          files.applicationSupportURL().appendingPathComponent("Mirabel").appendingPathComponent(
              fileNameOf(source))) {}

std::uint64_t LocalAppLibraryCache::versionToken() const {
  std::uint64_t token = 0;
  queue_.sync([&] { token = _versionToken; });
  return token;
}

void LocalAppLibraryCache::setVersionToken(std::uint64_t token) {
  queue_.sync([&] { _versionToken = token; });
}

Result<std::uint64_t> LocalAppLibraryCache::save(const std::vector<BundleProxy>& records,
                                                 std::uint64_t versionToken, Increment increment) {
  Result<std::uint64_t> written = 0;
  queue_.sync([&] { written = saveOnQueue(records, versionToken, increment); });
  return written;
}

std::optional<LocalAppLibraryCache::Content> LocalAppLibraryCache::load() {
  std::optional<Content> content;
  queue_.sync([&] { content = loadOnQueue(); });
  return content;
}

Result<std::uint64_t> LocalAppLibraryCache::saveOnQueue(const std::vector<BundleProxy>& records,
                                                        std::uint64_t versionToken,
                                                        Increment increment) {
  const LogSection section("saving bundle proxies to " + description());
  // The number is claimed first: a crash then leaves one unused, and not one that stands for two
  // contents.
  const auto token =
      increment == Increment::yes ? nextVersionToken() : Result<std::uint64_t>(versionToken);
  if (!token) return token;
  if (auto made = files_.createDirectory(cacheURL_.deletingLastPathComponent()); !made) {
    return fail(made.error());
  }
  PropertyList::Dictionary root;
  root.emplace_back(std::string(versionTokenKey), PropertyList(Number::of(*token)));
  root.emplace_back(std::string(bundleProxyKey), archivedBundleProxies(records));
  const auto bytes = keyedarchive::archiveDictionary(root);
  if (!bytes) return fail(bytes.error());
  if (auto written = files_.replace(cacheURL_, *bytes); !written) return fail(written.error());
  logDebug("wrote on disk " + std::to_string(bytes->size()) + " bytes at " + cacheURL_.path());
  _versionToken = *token;
  return token;
}

Result<std::uint64_t> LocalAppLibraryCache::nextVersionToken() {
  if (_versionToken == std::numeric_limits<std::uint64_t>::max()) {
    fatalError("the version token of the " + description() + " can't be incremented any more");
  }
  return files_.claimVersion(nameOf(source_), _versionToken);
}

std::optional<LocalAppLibraryCache::Content> LocalAppLibraryCache::loadOnQueue() {
  const LogSection section("loading bundle proxies from " + description());
  const auto bytes = files_.read(cacheURL_, largestFile);
  if (bytes && !*bytes) {
    logDebug("nothing cached on disk");
    return {};
  }
  const auto root = bytes ? keyedarchive::unarchiveDictionary(**bytes)
                          : Result<PropertyList::Dictionary>(fail(bytes.error()));
  if (!root) {
    logDebug("can't load cache from disk let's reset; " + root.error().description());
    return {};
  }
  logDebug("read from disk " + std::to_string((*bytes)->size()) + " bytes at " + cacheURL_.path());
  const auto token = versionTokenFrom(*root);
  if (!token) {
    logDebug("version token invalid; data on disk is corrupted let's reset");
    return {};
  }
  auto records = recordsFrom(*root);
  if (!records) {
    logDebug("bundle proxies invalid; data on disk is corrupted let's reset");
    return {};
  }
  logDebug("loaded " + std::to_string(records->size()) + " app library items from data");
  if (*token > _versionToken) {
    _versionToken = *token;
    logDebug("version token was set to " + std::to_string(*token) + " after load");
  }
  return Content{*std::move(records), *token};
}

}  // namespace mirabel
