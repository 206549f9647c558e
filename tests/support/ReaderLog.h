#pragma once

#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "fs/FSEventReader.h"

namespace mirabel::testing {

/// A delegate that writes down what it is told, one short text per call. Thread-safe.
class ReaderLog : public FSEventReaderDelegate {
 public:
  void didUpdateItem(FSEventReader& reader, const std::shared_ptr<LocalItem>& item,
                     const URL& url) override {
    const bool hasMoved = item->url() != url;
    add(reader, "update " + item->itemIdentifier() + " at " + url.path() +
                    (hasMoved ? " now " + item->url().path() : ""));
  }
  void didDeleteItem(FSEventReader& reader, const std::string& identifier,
                     const std::optional<URL>& url) override {
    add(reader, "delete " + identifier + (url ? " at " + url->path() : ""));
  }
  void didFinishHistory(FSEventReader& reader) override { add(reader, "history done"); }
  void mustRestart(FSEventReader& reader) override { add(reader, "restart"); }
  void didProcessEvents(FSEventReader& reader) override { add(reader, "batch"); }
  void didDropEvent(FSEventReader& reader, const FileSystemEvent&, const std::optional<URL>& url,
                    DropReason reason) override {
    constexpr const char* names[] = {"noPath",   "unparsable", "hidden",
                                     "noObject", "noPlace",    "notMonitored",
                                     "noItem",   "mismatch",   "lookFailed"};
    const auto& error = reader.lookError();
    add(reader, std::string("drop ") + names[static_cast<int>(reason)] +
                    (url ? " at " + url->path() : "") +
                    (error ? " (" + std::to_string(error->code) + ")" : ""));
  }

  /// What was told since the last call.
  [[nodiscard]] std::vector<std::string> take() {
    const std::lock_guard lock(mutex_);
    return std::exchange(calls_, {});
  }

 private:
  void add(const FSEventReader& reader, std::string call) {
    reader.streamQueue().assertOnQueue();
    const std::lock_guard lock(mutex_);
    calls_.push_back(std::move(call));
  }

  std::mutex mutex_;
  std::vector<std::string> calls_;
};

}  // namespace mirabel::testing
