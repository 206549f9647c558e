#include "linux/events/JournalStream.h"

#include <algorithm>
#include <atomic>
#include <map>
#include <set>
#include <tuple>
#include <utility>

#include "foundation/Log.h"

namespace mirabel {
namespace {

// Whoever replays mostly wants a hundred changes, and each record that is delivered is looked at;
// who goes on after that reads through to the end.
constexpr std::size_t firstBatch = 100;
constexpr std::size_t largestBatch = 1024;

// The path that everything lies below.
constexpr std::string_view everything = "/";

bool isAtOrBelow(std::string_view path, std::string_view folder) {
  return path.starts_with(folder) &&
         (path.size() == folder.size() || folder == everything || path[folder.size()] == '/');
}

FileSystemEvent eventOf(JournalRecord record) {
  FileSystemEvent event;
  event.id = record.id;
  if (record.documentID != 0) event.documentID = static_cast<std::uint32_t>(record.documentID);
  if (record.isDocument) {
    event.path = ".docid/changed/" + std::to_string(record.documentID) +
                 "/src=" + std::to_string(record.source) +
                 ",dst=" + std::to_string(record.destination);
    return event;
  }
  event.path = std::move(record.path);
  event.fileID = record.fileID;
  if (record.changedKind) event.flags = eventflag::changedKind;
  return event;
}

}  // namespace

struct JournalStream::Run final : LiveStream, std::enable_shared_from_this<Run> {
  Run(const StreamServices& shared, JournalSelection selected, std::uint64_t after,
      std::chrono::milliseconds gathering, EventStreams::Callback told)
      : services(shared),
        selection(std::move(selected)),
        since(after),
        patience(gathering),
        callback(std::move(told)) {}

  StreamServices services;
  JournalSelection selection;
  std::uint64_t since;
  std::chrono::milliseconds patience;
  EventStreams::Callback callback;
  std::optional<SerialQueue> queue;
  std::atomic<bool> isStopped = false;
  std::optional<std::pair<std::uint32_t, std::uint64_t>> lastHandover;  // document, file
  std::vector<std::uint64_t> folders;  // the watched paths' own IDs: they may have had other names

  [[nodiscard]] std::chrono::milliseconds latency() const override { return patience; }

  void submit() override {
    queue->async([self = shared_from_this()] {
      const std::shared_lock open(self->services.gate->mutex);
      if (!self->services.gate->isClosed && !self->isStopped) self->deliver();
    });
  }

  // Runs in turn with whatever else its owner submits, a stop for one.
  void begin() {
    const std::shared_lock open(services.gate->mutex);
    if (services.gate->isClosed || isStopped) return;
    auto last = services.index.currentEventID();
    if (!last) lose(last.error());
    for (const std::string& path : selection.paths) {
      const auto status = statusOf(path);
      if (!status || path == everything) continue;
      auto seen = services.index.learnPath(path, *status, false);
      if (seen) folders.push_back(seen->fileID);
    }
    if (deliver()) tellOfStream(eventflag::historyDone);
    if (!isStopped) services.live.add(weak_from_this());
  }

  /// Delivers what there is; false when the history has a gap there.
  bool deliver() {
    for (std::size_t size = firstBatch; !isStopped; size = std::min(2 * size, largestBatch)) {
      auto records = services.index.events(since, size);
      if (!records) lose(records.error());
      if (!records) return false;
      if (records->empty()) return true;
      since = records->back().id;
      const auto batch = batchOf(std::move(*records));
      if (!batch.empty() && !isStopped) callback(batch);
    }
    return true;
  }

  [[nodiscard]] std::vector<FileSystemEvent> batchOf(std::vector<JournalRecord> records) {
    std::vector<FileSystemEvent> batch;
    // The object that a document passed to. Its place is told right after that, in this batch or
    // first in the next one.
    std::map<std::uint32_t, std::uint64_t> holders;
    if (const auto last = std::exchange(lastHandover, {})) holders.insert(*last);
    for (JournalRecord& record : records) {
      if (record.isDocument && record.destination != 0) {
        lastHandover = {record.documentID, record.destination};
        holders.insert_or_assign(record.documentID, record.destination);
      }
      if (!isSelected(record)) continue;
      const auto holder = holders.find(record.documentID);
      const bool changedObject =
          !record.isDocument && holder != holders.end() && holder->second == record.fileID;
      batch.push_back(eventOf(std::move(record)));
      if (changedObject) batch.back().flags |= eventflag::changedObject;
    }
    // Of those that are alike the first one stands: whoever stops reading after it, at an event ID
    // that was the last when he began, must have had it.
    std::set<std::tuple<std::string_view, std::optional<std::uint64_t>,
                        std::optional<std::uint32_t>, std::uint32_t>>
        told;
    std::vector<bool> isRepeated(batch.size());
    for (std::size_t i = 0; i < batch.size(); ++i) {
      const FileSystemEvent& event = batch[i];
      isRepeated[i] =
          !told.emplace(*event.path, event.fileID, event.documentID, event.flags).second;
    }
    std::size_t index = 0;
    std::erase_if(batch, [&](const FileSystemEvent&) { return isRepeated[index++]; });
    return batch;
  }

  [[nodiscard]] bool isSelected(const JournalRecord& record) const {
    if (record.isDocument || selection.documents) return record.isDocument && selection.documents;
    if (std::ranges::find(folders, record.folder) != folders.end()) return true;
    return std::ranges::any_of(
        selection.paths, [&](const std::string& path) { return isAtOrBelow(record.path, path); });
  }

  void lose(const Error& error) {
    logDebug([&] { return "can't replay the history; " + error.description(); });
    tellOfStream(eventflag::kernelDropped);
    // Whoever stays goes on with what comes.
    since = services.index.status().lastEventID;
  }

  void tellOfStream(std::uint32_t flag) {
    if (isStopped) return;
    FileSystemEvent event;
    event.id = since;
    event.flags = flag;
    callback({&event, 1});
  }
};

JournalStream::JournalStream(const StreamServices& services, JournalSelection selection,
                             std::uint64_t since, std::chrono::milliseconds latency,
                             EventStreams::Callback callback)
    : run_(std::make_shared<Run>(services, std::move(selection), since, latency,
                                 std::move(callback))) {}

JournalStream::~JournalStream() {
  run_->isStopped = true;
}

void JournalStream::setDispatchQueue(SerialQueue queue) {
  run_->queue = std::move(queue);
}

void JournalStream::start() {
  if (!run_->queue) return;
  run_->queue->async([run = run_] { run->begin(); });
}

void JournalStream::stop() {
  run_->isStopped = true;
}

void JournalStream::invalidate() {
  run_->isStopped = true;
}

}  // namespace mirabel
