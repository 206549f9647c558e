#include <future>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/Commands.h"
#include "cli/ContainerArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {
namespace {

/// One batch of changes, as it comes from the enumeration's queue.
class Batch final : public VesselChangeObserver {
 public:
  void didUpdateItems(const VesselItems& items) override {
    updated.insert(updated.end(), items.begin(), items.end());
  }
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override {
    deleted.insert(deleted.end(), identifiers.begin(), identifiers.end());
  }
  void finishEnumeratingChangesUpToSyncAnchor(const Data& reached, bool more) override {
    anchor = base64(stringView(reached));
    moreComing = more;
    finished.set_value({});
  }
  void finishEnumeratingWithError(const Error& error) override { finished.set_value(fail(error)); }

  VesselItems updated;
  std::vector<std::string> deleted;
  std::string anchor;
  bool moreComing = false;
  std::promise<Result<void>> finished;
};

void print(Program& program, const Batch& batch) {
  if (program.options().json) {
    nlohmann::json line;
    line["updated"] = nlohmann::json::array();
    for (const auto& item : batch.updated)
      line["updated"].push_back(itemJSON(*item));
    line["deleted"] = batch.deleted;
    line["anchor"] = batch.anchor;
    line["moreComing"] = batch.moreComing;
    program.out() << line.dump() << '\n';
    return;
  }
  for (const auto& item : batch.updated) {
    program.out() << "updated  " << printable(item->itemIdentifier()) << "  "
                  << printable(item->url().path()) << '\n';
  }
  for (const std::string& identifier : batch.deleted) {
    program.out() << "deleted  " << printable(identifier) << '\n';
  }
}

}  // namespace

ExitCode runAnchor(Program& program, const std::string& item) {
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  auto enumerator = ContainerArgument(item).enumerator(*session);
  if (!enumerator) return program.report(enumerator.error(), "can't find " + item);
  std::optional<Data> anchor;
  (*enumerator)->currentSyncAnchor([&](std::optional<Data> answer) { anchor = std::move(answer); });
  (*enumerator)->invalidate();
  if (!anchor) {
    return program.report(Error::local(LocalVesselError::unableToGetDeviceUUID),
                          "can't take an anchor of " + item);
  }
  const std::string text = base64(stringView(*anchor));
  if (program.options().json) {
    program.out() << nlohmann::json{{"anchor", text}}.dump() << '\n';
  } else {
    program.out() << text << '\n';
  }
  return ExitCode::done;
}

ExitCode runChanges(Program& program, const ChangesOptions& options) {
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  const std::string failure = "can't tell the changes of " + options.item;
  auto enumerator = ContainerArgument(options.item).enumerator(*session);
  if (!enumerator) return program.report(enumerator.error(), failure);
  auto anchor = fromBase64(options.since);
  if (!anchor) return program.report(Error::syncAnchorExpired(), failure);
  for (bool more = true; more;) {
    const auto batch = std::make_shared<Batch>();
    (*enumerator)->enumerateChanges(batch, dataFromString(*anchor));
    if (auto finished = batch->finished.get_future().get(); !finished) {
      return program.report(finished.error(), failure);
    }
    print(program, *batch);
    more = batch->moreComing;
    anchor = fromBase64(batch->anchor);
    // People need the last one only, to ask again from there.
    if (!more && !program.options().json) program.note("the anchor is now " + batch->anchor);
  }
  (*enumerator)->invalidate();
  return ExitCode::done;
}

}  // namespace mirabel
