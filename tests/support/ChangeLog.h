#pragma once

#include <string>
#include <vector>

#include "items/LocalItem.h"
#include "platform/EnumerationObservers.h"

namespace mirabel::testing {

/// Writes down what it is told, one text per call: names or identifiers.
class ChangeLog : public VesselChangeObserver {
 public:
  void didUpdateItems(const VesselItems& items) override {
    std::string call = "update";
    for (const auto& item : items)
      call += " " + item->filename();
    calls.push_back(call);
  }
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override {
    std::string call = "delete";
    for (const std::string& identifier : identifiers)
      call += " " + identifier;
    calls.push_back(call);
  }
  void finishEnumeratingChangesUpToSyncAnchor(const Data& reached, bool moreComing) override {
    anchor = reached;
    calls.emplace_back(moreComing ? "finish, more" : "finish");
  }
  void finishEnumeratingWithError(const Error& error) override {
    calls.push_back("error " + std::to_string(error.code));
  }

  std::vector<std::string> calls;
  Data anchor;  ///< of the last finish
};

}  // namespace mirabel::testing
