#include "foundation/URL.h"

#include <utility>

#include "foundation/AsciiCase.h"

namespace mirabel {
namespace {

/// Nodes release their parents one inside the other; a longer chain could exhaust the stack of
/// the thread that drops the last URL of a very deep tree.
constexpr unsigned longestChain = 1000;

bool isUnreserved(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '.' || c == '_' || c == '~';
}

int hexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

/// What is no escape ("100%") stands for itself.
std::string percentDecoded(std::string_view text) {
  std::string bytes;
  bytes.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    const bool isEscape = text[i] == '%' && i + 2 < text.size() && hexValue(text[i + 1]) >= 0 &&
                          hexValue(text[i + 2]) >= 0;
    if (!isEscape) {
      bytes.push_back(text[i]);
      continue;
    }
    bytes.push_back(static_cast<char>(hexValue(text[i + 1]) * 16 + hexValue(text[i + 2])));
    i += 2;
  }
  return bytes;
}

/// Appends the components of `path` to `out`, each after one slash.
void appendComponents(std::string& out, std::string_view path) {
  while (!path.empty()) {
    const std::size_t slash = path.find('/');
    const std::string_view component = path.substr(0, slash);
    if (!component.empty()) out.append(1, '/').append(component);
    if (slash == std::string_view::npos) return;
    path.remove_prefix(slash + 1);
  }
}

std::string normalizedPath(std::string_view path) {
  if (!path.starts_with('/') || path.contains('\0')) return {};
  std::string normalized;
  normalized.reserve(path.size());
  appendComponents(normalized, path);
  if (normalized.empty()) normalized = "/";
  return normalized;
}

/// Takes `prefix` off the front of `text` when it is there, in any case of letters.
bool consumePrefix(std::string_view& text, std::string_view prefix) {
  if (text.size() < prefix.size()) return false;
  for (std::size_t i = 0; i < prefix.size(); ++i) {
    const char c = text[i];
    const char lower = asciiLower(c);
    if (lower != prefix[i]) return false;
  }
  text.remove_prefix(prefix.size());
  return true;
}

/// The escaped path of a file URL of this machine; nothing for other texts.
std::optional<std::string_view> filePathOf(std::string_view text) {
  if (!consumePrefix(text, "file:")) return std::nullopt;
  if (text.starts_with("//")) {
    text.remove_prefix(2);
    consumePrefix(text, "localhost");
  }
  if (!text.starts_with('/')) return std::nullopt;
  return text.substr(0, text.find_first_of("?#"));
}

}  // namespace

URL URL::ofNormalizedPath(std::string path) {
  auto node = std::make_shared<Node>();
  node->path = std::move(path);
  return URL(std::move(node));
}

URL URL::fileURL(std::string_view path) {
  return ofNormalizedPath(normalizedPath(path));
}

URL URL::fromString(std::string_view text) {
  if (const auto path = filePathOf(text)) return fileURL(percentDecoded(*path));
  auto node = std::make_shared<Node>();
  node->isFile = false;
  node->text = text;
  return URL(std::move(node));
}

std::string_view URL::lastPathComponent() const {
  const std::string_view path = node_->path;
  if (path.size() <= 1) return path;
  return path.substr(path.rfind('/') + 1);
}

std::vector<std::string_view> URL::pathComponents() const {
  std::vector<std::string_view> components;
  std::string_view rest = node_->path;
  if (rest.empty()) return components;
  components.push_back(rest.substr(0, 1));
  rest.remove_prefix(1);
  while (!rest.empty()) {
    const std::size_t slash = rest.find('/');
    components.push_back(rest.substr(0, slash));
    if (slash == std::string_view::npos) break;
    rest.remove_prefix(slash + 1);
  }
  return components;
}

URL URL::appendingPathComponent(std::string_view component) const {
  if (component.empty()) return *this;
  if (!node_->isFile) return fromString(node_->text + "/" + std::string(component));
  const std::string& parentPath = node_->path;
  if (parentPath.empty() || component.contains('\0')) return ofNormalizedPath({});
  if (component.contains('/')) return fileURL(parentPath + "/" + std::string(component));

  auto node = std::make_shared<Node>();
  std::string& path = node->path;
  path.reserve(parentPath.size() + 1 + component.size());
  path = parentPath;
  if (parentPath.size() > 1) path.push_back('/');
  path.append(component);
  if (node_->chainLength < longestChain) {
    node->chainLength = node_->chainLength + 1;
    node->parent = node_;
  }
  return URL(std::move(node));
}

URL URL::deletingLastPathComponent() const {
  if (node_->parent != nullptr) return URL(node_->parent);
  const std::string& path = node_->path;
  if (path.size() <= 1) return *this;
  const std::size_t slash = path.rfind('/');
  return ofNormalizedPath(path.substr(0, slash == 0 ? 1 : slash));
}

URL URL::properURL() const {
  // No look at what follows: "/variety" is rewritten too, on both sides of every comparison.
  if (!node_->path.starts_with("/var")) return *this;
  return ofNormalizedPath("/private" + node_->path);
}

std::string URL::description() const {
  if (!node_->isFile) return node_->text;
  constexpr std::string_view digits = "0123456789ABCDEF";
  std::string text = "file://";
  text.reserve(text.size() + node_->path.size());
  for (const char c : node_->path) {
    if (c == '/' || isUnreserved(c)) {
      text.push_back(c);
      continue;
    }
    const auto byte = static_cast<unsigned char>(c);
    text.append({'%', digits[byte >> 4], digits[byte & 15]});
  }
  return text;
}

bool isInTrash(const URL& url) {
  constexpr std::string_view trash = "/Documents/.Trash";
  const std::string_view path = url.path();
  for (std::size_t at = path.find(trash); at != path.npos; at = path.find(trash, at + 1)) {
    const std::size_t end = at + trash.size();
    if (end == path.size() || path[end] == '/') return true;
  }
  return false;
}

}  // namespace mirabel
