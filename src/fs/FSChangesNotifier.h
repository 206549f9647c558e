#pragma once

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "fs/FSEventReader.h"
#include "platform/DiagnosticReporter.h"

namespace mirabel {

/// Tells the host to ask for changes whenever something in the folders of one container changed;
/// it delivers no items itself. Its owner makes it the delegate of its `reader`, starts that
/// through its queue, and stops it the same way. Everything happens on the reader's queue.
class FSChangesNotifier : public FSEventReaderDelegate {
 public:
  struct Options {
    /// How long a batch of events waits for the host to take notice of the one before.
    std::chrono::milliseconds patience = std::chrono::seconds(3);
  };

  /// Null, with an error line, when the folders' volume has no history. No URLs are a programming
  /// error. What is passed by reference outlives the notifier.
  [[nodiscard]] static std::shared_ptr<FSChangesNotifier> create(
      const ItemContext& context, EventStreams& events, DiagnosticReporter& diagnostics,
      std::string container, std::vector<URL> urls, Options options);

  [[nodiscard]] const std::shared_ptr<FSEventReader>& reader() const { return reader_; }
  [[nodiscard]] const std::string& container() const { return container_; }
  [[nodiscard]] const UUID& deviceUUID() const { return deviceUUID_; }
  /// For log lines.
  [[nodiscard]] std::string description() const;

  void didUpdateItem(FSEventReader& reader, const std::shared_ptr<LocalItem>& item,
                     const URL& url) override;
  void didDeleteItem(FSEventReader& reader, const std::string& identifier,
                     const std::optional<URL>& url) override;
  void didFinishHistory(FSEventReader& reader) override;
  void mustRestart(FSEventReader& reader) override;
  void didProcessEvents(FSEventReader& reader) override;
  void didDropEvent(FSEventReader& reader, const FileSystemEvent& event,
                    const std::optional<URL>& url, DropReason reason) override;

 private:
  FSChangesNotifier(const Platform& platform, DiagnosticReporter& diagnostics,
                    std::string container, std::shared_ptr<FSEventReader> reader,
                    const UUID& deviceUUID, Options options);
  void notify(const std::vector<std::string>& containers, const FSEventReader& reader);

  VesselManager& manager_;
  DiagnosticReporter& diagnostics_;
  Options options_;
  std::string container_;
  std::shared_ptr<FSEventReader> reader_;
  UUID deviceUUID_;
  bool shouldSignalChange_ = false;
};

}  // namespace mirabel
