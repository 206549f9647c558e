#include "linux/files/LinuxExtendedAttributes.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "foundation/URL.h"
#include "linux/kernel/AttributeCalls.h"
#include "linux/kernel/EntryPlace.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

constexpr std::string_view keptNames[] = {"com.norvane.trash.time#PS",
                                          "com.norvane.trash.putback#PS"};

std::string kernelName(std::string_view name) {
  return std::string(userAttributePrefix).append(name);
}

bool mayBeKept(std::string_view name) {
  return std::ranges::find(keptNames, name) != std::end(keptNames);
}

bool holdsUserAttributes(FileKind kind) {
  return kind == FileKind::regular || kind == FileKind::folder;
}

/// The object can't take it, and will not when asked again.
bool isRefusal(const Error& error) {
  constexpr int codes[] = {EPERM, EACCES, EROFS, ENOTSUP, ENOSPC, EDQUOT, E2BIG, ELOOP};
  return std::ranges::any_of(codes, [&](int code) { return error.isPosix(code); });
}

class OpenFile final : public AttributeTarget {
 public:
  /// What can't be opened answers `refusal`, and still has what may be kept for it.
  OpenFile(const LookContext& context, URL url, Result<UniqueFd> file)
      : context_(context), url_(std::move(url)), file_(std::move(file)) {}

  Result<void> set(std::string_view name, const Data& value) override {
    auto done = setOnFile(name, value);
    if (!mayBeKept(name) || (!done && !isRefusal(done.error()))) return done;
    if (done && context_.index.keptAttributes().isEmpty()) return done;
    const auto fileID = identify();
    if (!fileID) return done ? done : fail(fileID.error());
    if (done) return context_.index.keptAttributes().forget(*fileID, name);
    return context_.index.keptAttributes().set(*fileID, name, value);
  }

  Result<void> remove(std::string_view name) override {
    auto done = removeFromFile(name);
    if (!mayBeKept(name)) return done;
    if (done && context_.index.keptAttributes().isEmpty()) return done;
    const bool isAbsent = !done && done.error().isPosix(ENODATA);
    if (!done && !isAbsent && !isRefusal(done.error())) return done;
    return removeKept(name, std::move(done), isAbsent);
  }

 private:
  Result<void> setOnFile(std::string_view name, const Data& value) {
    if (!file_) return fail(file_.error());
    const std::string key = kernelName(name);
    if (::fsetxattr(file_->get(), key.c_str(), value.data(), value.size(), 0) != 0)
      return fail(Error::posix(errno));
    return synchronise();
  }

  Result<void> removeFromFile(std::string_view name) {
    if (!file_) return fail(file_.error());
    if (::fremovexattr(file_->get(), kernelName(name).c_str()) != 0)
      return fail(Error::posix(errno == ENOTSUP ? ENODATA : errno));
    return synchronise();
  }

  [[nodiscard]] Result<void> synchronise() const {
    if (::fsync(file_->get()) != 0) return fail(Error::posix(errno));
    return {};
  }

  Result<void> removeKept(std::string_view name, Result<void> done, bool isAbsent) {
    KeptAttributes& kept = context_.index.keptAttributes();
    if (isAbsent && kept.isEmpty()) return done;
    const auto fileID = identify();
    if (!fileID) return fail(fileID.error());
    const auto attributes = kept.of(*fileID);
    const auto found = attributes.find(name);
    const bool isKept = found != attributes.end() && found->second;
    if (done || isAbsent) {
      if (auto forgotten = kept.forget(*fileID, name); !forgotten) return forgotten;
      return isKept ? Result<void>() : done;
    }
    // It stays on the file, which is not asked any more.
    if (hasItself(name)) return kept.set(*fileID, name, std::nullopt);
    if (!isKept) return fail(Error::posix(ENODATA));
    return kept.forget(*fileID, name);
  }

  bool hasItself(std::string_view name) const {
    const auto place = placeOf(context_.roots, url_);
    return place && attributeSize(place->folder.get(), place->name, kernelName(name));
  }

  Result<std::uint64_t> identify() const {
    const auto values = lookAtObject(context_, url_);
    if (!values) return fail(values.error());
    return values->fileID;
  }

  LookContext context_;
  URL url_;
  Result<UniqueFd> file_;
};

Result<UniqueFd> openForAttributes(const EntryPlace& place) {
  // Looked at first: merely opening a device can set it off.
  const auto status = statusAt(place.folder.get(), place.name);
  if (!status) return fail(status.error());
  if (!holdsUserAttributes(status->kind)) return fail(Error::posix(EPERM));
  auto file = openPlace(place, O_RDONLY);
  // Attributes ask for permission on the file, not on the descriptor: one that its owner may
  // write but not read takes them as well.
  if (!file && file.error().isPosix(EACCES) && status->kind == FileKind::regular) {
    file = openPlace(place, O_WRONLY);
  }
  if (!file) return fail(file.error());
  // The name may have been given to something else since.
  const auto opened = statusAt(file->get(), "");
  if (!opened) return fail(opened.error());
  if (!holdsUserAttributes(opened->kind)) return fail(Error::posix(EPERM));
  return file;
}

}  // namespace

void mergeNames(std::vector<std::string>& names, const KeptAttributes::Attributes& kept) {
  for (const auto& [name, value] : kept) {
    if (!mayBeKept(name)) continue;
    std::erase(names, name);
    if (value) names.push_back(name);
  }
}

KeptAttributes::Attributes LinuxExtendedAttributes::keptFor(const URL& url) const {
  if (context_.index.keptAttributes().isEmpty()) return {};
  const auto values = lookAtObject(context_, url);
  if (!values) return {};
  return context_.index.keptAttributes().of(values->fileID);
}

Result<std::vector<std::string>> LinuxExtendedAttributes::names(const URL& url) {
  const auto place = placeOf(context_.roots, url);
  if (!place) return fail(place.error());
  std::vector<char> buffer;
  const auto list = listAttributes(place->folder.get(), place->name, buffer);
  const auto kept = keptFor(url);
  if (!list && kept.empty()) return fail(list.error());
  auto names = list ? userAttributeNames(*list) : std::vector<std::string>();
  mergeNames(names, kept);
  return names;
}

Result<std::size_t> LinuxExtendedAttributes::size(std::string_view name, const URL& url) {
  if (mayBeKept(name)) {
    const auto kept = keptFor(url);
    if (const auto found = kept.find(name); found != kept.end()) {
      if (!found->second) return fail(Error::posix(ENODATA));
      return found->second->size();
    }
  }
  const auto place = placeOf(context_.roots, url);
  if (!place) return fail(place.error());
  return attributeSize(place->folder.get(), place->name, kernelName(name));
}

Result<Data> LinuxExtendedAttributes::read(std::string_view name, const URL& url,
                                           std::size_t size) {
  if (mayBeKept(name)) {
    const auto kept = keptFor(url);
    if (const auto found = kept.find(name); found != kept.end()) {
      if (!found->second) return fail(Error::posix(ENODATA));
      if (found->second->size() > size) return fail(Error::posix(ERANGE));
      return *found->second;
    }
  }
  const auto place = placeOf(context_.roots, url);
  if (!place) return fail(place.error());
  return readAttribute(place->folder.get(), place->name, kernelName(name), size);
}

Result<std::unique_ptr<AttributeTarget>> LinuxExtendedAttributes::open(const URL& url) {
  const auto place = placeOf(context_.roots, url);
  if (!place) return fail(place.error());
  auto file = openForAttributes(*place);
  if (!file && !isRefusal(file.error())) return fail(file.error());
  return std::make_unique<OpenFile>(context_, URL::fileURL(url.path()), std::move(file));
}

}  // namespace mirabel
