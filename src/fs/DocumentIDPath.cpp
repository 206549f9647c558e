#include "fs/DocumentIDPath.h"

#include <charconv>
#include <system_error>

namespace mirabel {
namespace {

bool consume(std::string_view& text, std::string_view expected) {
  if (!text.starts_with(expected)) return false;
  text.remove_prefix(expected.size());
  return true;
}

bool consumeNumber(std::string_view& text, std::int64_t& number) {
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  if (error != std::errc{}) return false;
  text.remove_prefix(static_cast<std::size_t>(end - text.data()));
  return true;
}

bool consumeDevice(std::string_view& text) {
  if (text.empty() || text.front() < '0' || text.front() > '9') return true;
  std::int64_t device = 0;
  return consumeNumber(text, device) && consume(text, "/");
}

}  // namespace

std::optional<DocumentIDPath> DocumentIDPath::parse(std::string_view path) {
  while (consume(path, "/")) {
  }
  DocumentIDPath parsed;
  const bool isComplete = consume(path, ".docid/") && consumeDevice(path) &&
                          consume(path, "changed/") && consumeNumber(path, parsed.documentID) &&
                          consume(path, "/src=") && consumeNumber(path, parsed.sourceFileID) &&
                          consume(path, ",dst=") && consumeNumber(path, parsed.destinationFileID) &&
                          path.empty();
  if (!isComplete) return {};
  return parsed;
}

}  // namespace mirabel
