#include "cli/ChangeBatch.h"

#include <nlohmann/json.hpp>
#include <ostream>

#include "cli/ItemJSON.h"
#include "cli/Printing.h"

namespace mirabel {

Result<std::string> ChangeBatch::currentAnchor(DocumentContainer& container) {
  const auto anchor = container.currentSyncAnchor();
  if (!anchor) return fail(anchor.error());
  return base64(stringView(*anchor));
}

Result<ChangeBatch> ChangeBatch::ask(DocumentContainer& container, const std::string& anchor) {
  const auto bytes = fromBase64(anchor);
  if (!bytes) return fail(Error::syncAnchorExpired());
  auto changes = container.changes(dataFromString(*bytes));
  if (!changes) return fail(changes.error());
  return ChangeBatch(*std::move(changes));
}

std::string ChangeBatch::anchor() const {
  return base64(stringView(changes_.anchor));
}

void ChangeBatch::print(const Program& program) const {
  if (program.options().json) {
    nlohmann::json line;
    line["updated"] = nlohmann::json::array();
    for (const ItemRecord& item : changes_.updated)
      line["updated"].push_back(itemJSON(item));
    line["deleted"] = changes_.deleted;
    line["anchor"] = anchor();
    line["moreComing"] = moreComing();
    program.out() << line.dump() << '\n';
    return;
  }
  for (const ItemRecord& item : changes_.updated) {
    program.out() << "updated  " << printable(item.itemIdentifier) << "  " << printable(item.path)
                  << '\n';
  }
  for (const std::string& identifier : changes_.deleted) {
    program.out() << "deleted  " << printable(identifier) << '\n';
  }
}

}  // namespace mirabel
