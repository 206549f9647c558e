#include "cli/ChangeBatch.h"

#include <nlohmann/json.hpp>
#include <optional>
#include <ostream>

#include "cli/ItemJSON.h"
#include "cli/Printing.h"
#include "items/LocalItem.h"

namespace mirabel {

Result<std::string> currentAnchor(VesselEnumerator& enumerator) {
  std::optional<Data> anchor;
  enumerator.currentSyncAnchor([&](std::optional<Data> answer) { anchor = std::move(answer); });
  if (!anchor) return fail(Error::local(LocalVesselError::unableToGetDeviceUUID));
  return base64(stringView(*anchor));
}

Result<std::shared_ptr<const ChangeBatch>> ChangeBatch::ask(VesselEnumerator& enumerator,
                                                            const std::string& anchor) {
  const auto bytes = fromBase64(anchor);
  if (!bytes) return fail(Error::syncAnchorExpired());
  auto batch = std::make_shared<ChangeBatch>();
  auto finished = batch->finished_.get_future();
  enumerator.enumerateChanges(batch, dataFromString(*bytes));
  if (auto outcome = finished.get(); !outcome) return fail(outcome.error());
  return batch;
}

void ChangeBatch::print(const Program& program) const {
  if (program.options().json) {
    nlohmann::json line;
    line["updated"] = nlohmann::json::array();
    for (const auto& item : updated_)
      line["updated"].push_back(itemJSON(*item));
    line["deleted"] = deleted_;
    line["anchor"] = anchor_;
    line["moreComing"] = moreComing_;
    program.out() << line.dump() << '\n';
    return;
  }
  for (const auto& item : updated_) {
    program.out() << "updated  " << printable(item->itemIdentifier()) << "  "
                  << printable(item->url().path()) << '\n';
  }
  for (const std::string& identifier : deleted_) {
    program.out() << "deleted  " << printable(identifier) << '\n';
  }
}

void ChangeBatch::didUpdateItems(const VesselItems& items) {
  updated_.insert(updated_.end(), items.begin(), items.end());
}

void ChangeBatch::didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) {
  deleted_.insert(deleted_.end(), identifiers.begin(), identifiers.end());
}

void ChangeBatch::finishEnumeratingChangesUpToSyncAnchor(const Data& anchor, bool moreComing) {
  anchor_ = base64(stringView(anchor));
  moreComing_ = moreComing;
  finished_.set_value({});
}

void ChangeBatch::finishEnumeratingWithError(const Error& error) {
  finished_.set_value(fail(error));
}

}  // namespace mirabel
