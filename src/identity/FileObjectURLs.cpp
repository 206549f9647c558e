#include "identity/FileObjectURLs.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <limits>
#include <string>

#include "foundation/FatalError.h"
#include "foundation/Log.h"
#include "identity/MRBFileObjectIdentifier.h"

namespace mirabel {
namespace {

constexpr int resolutionRetries = 5;
constexpr std::chrono::milliseconds restBetweenRetries{1};

/// Lines of this file carry no level word, and are built only when somebody reads them: an
/// identifier is computed for every entry of every listing.
template <class Build>
void note(LogLevel level, Build&& build) {
  if (Log::shared().isEnabled(level)) Log::shared().plain(level, build());
}

template <class Build>
std::nullopt_t nothing(LogLevel level, Build&& build) {
  note(level, std::forward<Build>(build));
  return std::nullopt;
}

std::string errnoText(const Error& error) {
  return "; " + std::to_string(error.code);
}

/// Nothing for an absent value. One of another type is a defect of the platform: fatal where
/// assertions are on, and otherwise the disk is asked as if there were none.
std::optional<std::uint64_t> numberIn(const ResourceValue& value) {
  if (const auto* number = std::get_if<Number>(&value)) return number->asUnsigned();
#ifndef NDEBUG
  constexpr const char* classes[] = {"nothing", "String", "Number", "Date", "Boolean", "Data"};
  if (value.index() != 0) {
    fatalError("expected a resource value of class Number, but it is of class " +
               std::string(classes[value.index()]));
  }
#endif
  return {};
}

/// Leading digits with an optional sign; 0 without digits, the nearest bound when out of range.
std::int64_t decimalPrefix(std::string_view text) {
  const bool negative = text.starts_with('-');
  if (negative || text.starts_with('+')) text.remove_prefix(1);
  constexpr std::uint64_t positiveBound = std::numeric_limits<std::int64_t>::max();
  const std::uint64_t bound = positiveBound + (negative ? 1 : 0);
  std::uint64_t magnitude = 0;
  for (const char c : text) {
    if (c < '0' || c > '9') break;
    const auto digit = static_cast<std::uint64_t>(c - '0');
    magnitude = magnitude > (bound - digit) / 10 ? bound : magnitude * 10 + digit;
    if (magnitude == bound) break;
  }
  return static_cast<std::int64_t>(negative ? 0 - magnitude : magnitude);
}

bool isWorthAnotherTry(const Error& error) {
  return error.isPosix(EAGAIN) || error.isPosix(EBUSY) || error.isPosix(ESTALE);
}

struct IdentifierParts {
  std::string_view host;
  std::string_view number;
};

std::optional<IdentifierParts> partsOf(std::string_view identifier) {
  std::size_t count = 1;
  for (const char c : identifier)
    count += c == '=' ? 1 : 0;
  if (count != 2) {
    return nothing(LogLevel::error, [&] {
      return "invalid identifier; identifier should have 2 components, not " +
             std::to_string(count);
    });
  }
  const std::size_t equals = identifier.find('=');
  const IdentifierParts parts{identifier.substr(0, equals), identifier.substr(equals + 1)};
  if (parts.host == "did" || parts.host == "fid") return parts;
  return nothing(LogLevel::error,
                 [&] { return "invalid host for identifier " + quoted(identifier); });
}

}  // namespace

FileObjectURLs::FileObjectURLs(const Platform& platform, const AppLibraryRoots& roots)
    : platform_(platform),
      roots_(roots),
      reader_(platform.resources),
      canonicalStorage_(platform.manager.documentStorageURL().properURL()) {}

Result<DeviceID> FileObjectURLs::deviceIDWithError(const URL& url) const {
  const auto object = platform_.objects.open(url);
  if (!object) return fail(object.error());
  return (*object)->device();
}

DeviceID FileObjectURLs::deviceID(const URL& url) const {
  return deviceIDWithError(url).value_or(0);
}

std::optional<std::string> FileObjectURLs::itemIdentifier(const URL& url) const {
  if (!url.isFileURL()) {
    return nothing(LogLevel::error,
                   [] { return "can't compute file object identifier if not a file URL"; });
  }
  const URL canonical = url.properURL();
  const AppLibraryRoots::List libraries = roots_.rootURLsForAppLibraries();
  const URL* root = rootHolding(canonical, *libraries);
  if (root == nullptr) {
    return nothing(LogLevel::debug, [&] {
      return "can't compute file object identifier because " + quoted(canonical.path()) +
             " is not part of Mirabel";
    });
  }
  if (canonical.path() != root->path()) return identifierOfObject(url);
  if (root == &canonicalStorage_) return std::string(VesselRootContainerItemIdentifier);
  return MRBFileObjectIdentifier::fromAppLibraryDataContainerURL(platform_.applications, *root);
}

/// A plain string prefix, as the identifiers that hosts keep were computed: a sibling whose name
/// begins with the root's name counts as held by it.
const URL* FileObjectURLs::rootHolding(const URL& canonical,
                                       const std::vector<URL>& libraries) const {
  for (const URL& library : libraries) {
    if (canonical.path().starts_with(library.path())) return &library;
  }
  return canonical.path().starts_with(canonicalStorage_.path()) ? &canonicalStorage_ : nullptr;
}

bool FileObjectURLs::isAppLibraryRoot(const URL& url) const {
  const URL canonical = url.properURL();
  return std::ranges::any_of(*roots_.rootURLsForAppLibraries(), [&](const URL& library) {
    return library.path() == canonical.path();
  });
}

/// Whether it is shown as a folder: a package is a document.
bool FileObjectURLs::isFolder(const URL& url) const {
  const auto isTrue = [&](ResourceKey key) {
    const auto value = reader_.value(key, url);
    return value && *value == ResourceValue(true);
  };
  return isTrue(ResourceKey::isDirectory) && !isTrue(ResourceKey::isPackage);
}

std::optional<std::string> FileObjectURLs::identifierOfObject(const URL& url) const {
  const bool folder = isFolder(url);
  const ResourceKey key = folder ? ResourceKey::fileIdentifier : ResourceKey::documentIdentifier;
  const auto value = reader_.value(key, url);
  if (!value) {
    const bool isGone = value.error().is(FileErrorCode::noSuchFile);
    return nothing(isGone ? LogLevel::debug : LogLevel::error, [&] {
      return "can't get resource value for " + std::string(nameOf(key)) + "; " +
             value.error().description();
    });
  }
  if (const auto number = numberIn(*value)) {
    return folder ? MRBFileObjectIdentifier::fromFileID(*number)
                  : MRBFileObjectIdentifier::fromDocumentID(*number);
  }
  const auto package = reader_.value(ResourceKey::isPackage, url);
  if (!package) {
    return nothing(LogLevel::error, [&] {
      return "can't get resource " + std::string(nameOf(ResourceKey::isPackage)) + " for " +
             quoted(url.path()) + "; " + package.error().description();
    });
  }
  return identifierFromDisk(url, *package == ResourceValue(true));
}

std::optional<std::string> FileObjectURLs::identifierFromDisk(const URL& url,
                                                              bool isPackage) const {
  const auto object = platform_.objects.open(url);
  if (!object) {
    return nothing(LogLevel::error, [&] {
      return "can't open file at " + quoted(url.path()) + errnoText(object.error());
    });
  }
  const auto attributes = (*object)->attributes();
  if (!attributes) {
    return nothing(LogLevel::error, [&] {
      return "can't get attribute list for " + quoted(url.path()) + errnoText(attributes.error());
    });
  }
  const bool isDocument =
      attributes->kind == FileKind::regular || (attributes->kind == FileKind::folder && isPackage);
  if (isDocument) return documentIdentifier(url, **object, attributes->documentID);
  url.resources().set(ResourceKey::fileIdentifier, Number::of(attributes->fileID));
  return MRBFileObjectIdentifier::fromFileID(attributes->fileID);
}

std::optional<std::string> FileObjectURLs::documentIdentifier(const URL& url, FileObject& object,
                                                              std::uint32_t assigned) const {
  std::uint64_t documentID = assigned;
  if (documentID == 0) documentID = platform_.documents.permanentStorage(object).value_or(0);
  if (documentID == 0) {
    return nothing(LogLevel::error,
                   [&] { return "can't get permanent storage for " + quoted(url.path()); });
  }
  url.resources().set(ResourceKey::documentIdentifier, Number::of(documentID));
  return MRBFileObjectIdentifier::fromDocumentID(documentID);
}

std::optional<URL> FileObjectURLs::fileURLWithItemIdentifier(std::string_view identifier) const {
  // A new URL: what the storage's own has cached would make an old snapshot of the root.
  if (identifier == VesselRootContainerItemIdentifier) {
    return URL::fileURL(platform_.manager.documentStorageURL().path());
  }
  const auto parts = partsOf(identifier);
  if (!parts) return {};
  const DeviceID device = documentStorageDevice();
  if (device == 0) return {};
  const std::int64_t number = decimalPrefix(parts->number);
  if (parts->host == "fid") {
    return _fileURLWithFileIdentifier(static_cast<std::uint64_t>(number), device);
  }
  const auto fileID = fileIDOfDocument(device, number);
  if (!fileID) return {};
  return _fileURLWithFileIdentifier(*fileID, device);
}

Result<std::optional<URL>> FileObjectURLs::findItem(std::string_view identifier) const {
  if (auto url = fileURLWithItemIdentifier(identifier)) return url;
  auto found = findAgain(identifier);
  if (!found && found.error().isPosix(ENOENT)) return std::nullopt;
  return found;
}

/// The operations above say no more than that they found nothing: asked for the reason.
Result<std::optional<URL>> FileObjectURLs::findAgain(std::string_view identifier) const {
  const bool isDocument = identifier.starts_with("did=");
  if (!isDocument && !identifier.starts_with("fid=")) return std::nullopt;
  // A third component makes it no identifier; said above.
  if (identifier.find('=') != identifier.rfind('=')) return std::nullopt;
  const auto device = deviceIDWithError(platform_.manager.documentStorageURL());
  if (!device) return fail(device.error());
  const std::int64_t number = decimalPrefix(identifier.substr(4));
  const auto fileID = isDocument ? platform_.documents.fileIDOfDocument(*device, number)
                                 : Result<std::uint64_t>(static_cast<std::uint64_t>(number));
  if (!fileID) return fail(fileID.error());
  auto path = platform_.objects.pathOfFileID(*device, *fileID);
  if (!path) return fail(path.error());
  return URL::fileURL(*path);
}

std::optional<URL> FileObjectURLs::fileURLWithFileIdentifier(std::uint64_t fileID) const {
  const DeviceID device = documentStorageDevice();
  if (device == 0) return {};
  return _fileURLWithFileIdentifier(fileID, device);
}

std::optional<URL> FileObjectURLs::_fileURLWithFileIdentifier(std::uint64_t fileID,
                                                              DeviceID device) const {
  const auto path = platform_.objects.pathOfFileID(device, fileID);
  if (path) return URL::fileURL(*path);
  return nothing(LogLevel::debug, [&] {
    return "can't resolve path matching file ID " +
           quoted(std::to_string(static_cast<std::int64_t>(fileID))) + errnoText(path.error());
  });
}

DeviceID FileObjectURLs::documentStorageDevice() const {
  const URL& storage = platform_.manager.documentStorageURL();
  const auto device = deviceIDWithError(storage);
  if (device.value_or(0) != 0) return *device;
  note(LogLevel::error, [&] {
    return "can't get device ID for " + quoted(storage.path()) +
           errnoText(device ? Error::posix(0) : device.error());
  });
  return 0;
}

std::optional<std::uint64_t> FileObjectURLs::fileIDOfDocument(DeviceID device,
                                                              std::int64_t documentID) const {
  for (int retry = 0;; ++retry) {
    const auto fileID = platform_.documents.fileIDOfDocument(device, documentID);
    if (fileID) return *fileID;
    const std::string subject = quoted(std::to_string(documentID));
    if (!isWorthAnotherTry(fileID.error())) {
      return nothing(LogLevel::error,
                     [&] { return "can't resolve doc ID " + subject + errnoText(fileID.error()); });
    }
    if (retry == resolutionRetries) {
      return nothing(LogLevel::debug,
                     [&] { return "can't resolve doc ID " + subject + " after five attempts"; });
    }
    note(LogLevel::debug, [&] {
      return "doc ID resolution failed with errno(" + std::to_string(fileID.error().code) +
             "), let's try again after resting";
    });
    platform_.clock.sleep(restBetweenRetries);
  }
}

}  // namespace mirabel
