#include "fs/HiddenTest.h"

#include <algorithm>
#include <cstddef>
#include <optional>
#include <string>

namespace mirabel {
namespace {

constexpr std::string_view trashPrefix = ".Trash/";
constexpr std::string_view inboxName = "Inbox";

/// What follows `folder` in `path`, without a slash in front; empty for the folder itself.
std::optional<std::string_view> relativePath(std::string_view path, std::string_view folder) {
  if (folder == "/") return path.substr(1);
  if (!path.starts_with(folder)) return {};
  path.remove_prefix(folder.size());
  if (path.empty()) return path;
  if (path.front() != '/') return {};
  return path.substr(1);
}

std::string_view consumeComponent(std::string_view& path) {
  const std::string_view component = path.substr(0, path.find('/'));
  path.remove_prefix(std::min(path.size(), component.size() + 1));
  return component;
}

bool isHiddenName(std::string_view name) {
  return name.starts_with('.') || name == inboxName;
}

}  // namespace

HiddenTest::HiddenTest(const std::vector<URL>& folders, ResourceValueSource& resources)
    : reader_(resources) {
  for (const URL& folder : folders)
    folders_.push_back(folder.properURL());
}

bool HiddenTest::isMonitored(const URL& url) const {
  const URL canonical = url.properURL();
  return std::ranges::any_of(folders_, [&](const URL& folder) {
    return relativePath(canonical.path(), folder.path()).has_value();
  });
}

bool HiddenTest::isHidden(const URL& url) const {
  const URL canonical = url.properURL();
  // In sight of one folder is in sight, though another, further up, should not show it.
  return std::ranges::none_of(folders_, [&](const URL& folder) {
    const auto relative = relativePath(canonical.path(), folder.path());
    return relative && !isHiddenBelow(*relative, url);
  });
}

bool HiddenTest::isHiddenBelow(std::string_view relative, const URL& url) const {
  std::string_view rest = relative;
  if (relative.starts_with(trashPrefix)) {
    rest.remove_prefix(trashPrefix.size());
    return rest.contains('/') || isHiddenName(rest);
  }
  std::size_t depth = 0;
  for (; !rest.empty(); ++depth) {
    if (isHiddenName(consumeComponent(rest))) return true;
  }
  URL folder = url;
  for (; depth > 1; --depth) {
    folder = folder.deletingLastPathComponent();
    if (isPackage(folder)) return true;
  }
  return false;
}

bool HiddenTest::isPackage(const URL& folder) const {
  // Nearly every folder: its name alone tells, whatever has become of it.
  if (!reader_.mayBePackage(folder.lastPathComponent())) return false;
  const auto holds = [&](ResourceKey key) {
    const auto value = reader_.value(key, folder);
    return value && *value == ResourceValue(true);
  };
  return holds(ResourceKey::isDirectory) && holds(ResourceKey::isPackage);
}

}  // namespace mirabel
