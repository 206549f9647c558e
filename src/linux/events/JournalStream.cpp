#include "linux/events/JournalStream.h"

#include <algorithm>
#include <atomic>
#include <utility>

#include "foundation/Log.h"

namespace mirabel {
namespace {

constexpr std::size_t batchSize = 1000;

bool isAtOrBelow(std::string_view path, std::string_view folder) {
  return path.starts_with(folder) &&
         (path.size() == folder.size() || folder == "/" || path[folder.size()] == '/');
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

struct JournalStream::Run {
  VolumeIndex& index;
  std::shared_ptr<StreamGate> gate;
  JournalSelection selection;
  std::uint64_t since;
  EventStreams::Callback callback;
  std::atomic<bool> isStopped = false;
  std::vector<std::uint64_t> folders;  // the watched paths' own IDs: they may have had other names

  // Batches run in turn with whatever else its owner submits, a stop for one.
  void deliver() {
    const std::shared_lock open(gate->mutex);
    if (gate->isClosed || isStopped) return;
    auto last = index.currentEventID();
    if (!last) return lose(last.error());
    for (const std::string& path : selection.paths) {
      const auto status = statusOf(path);
      if (!status) continue;
      auto seen = index.learnPath(path, *status, false);
      if (seen) folders.push_back(seen->fileID);
    }
    while (!isStopped) {
      auto records = index.events(since, batchSize);
      if (!records) return lose(records.error());
      if (records->empty()) break;
      since = records->back().id;
      std::vector<FileSystemEvent> batch;
      for (JournalRecord& record : *records) {
        if (isSelected(record)) batch.push_back(eventOf(std::move(record)));
      }
      if (!batch.empty() && !isStopped) callback(batch);
    }
    tellOfStream(eventflag::historyDone);
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
  }

  void tellOfStream(std::uint32_t flag) {
    if (isStopped) return;
    FileSystemEvent event;
    event.id = since;
    event.flags = flag;
    callback({&event, 1});
  }
};

JournalStream::JournalStream(VolumeIndex& index, std::shared_ptr<StreamGate> gate,
                             JournalSelection selection, std::uint64_t since,
                             EventStreams::Callback callback)
    : run_(new Run{
          index, std::move(gate), std::move(selection), since, std::move(callback), false, {}}) {}

JournalStream::~JournalStream() {
  run_->isStopped = true;
}

void JournalStream::setDispatchQueue(SerialQueue queue) {
  queue_ = std::move(queue);
}

void JournalStream::start() {
  if (!queue_) return;
  queue_->async([run = run_] { run->deliver(); });
}

void JournalStream::stop() {
  run_->isStopped = true;
}

void JournalStream::invalidate() {
  run_->isStopped = true;
}

}  // namespace mirabel
