#include "host/bus/BusCall.h"

#include <cerrno>
#include <utility>

#include "foundation/Log.h"
#include "host/bus/BusErrors.h"

namespace mirabel::bus {

BusCall::~BusCall() {
  if (!isAnswered_) fail(Error::posix(ECANCELED));
}

void BusCall::reply(const std::function<void(sdbus::Message&)>& write) {
  isAnswered_ = true;
  try {
    auto answer = message_.createReply();
    if (write) write(answer);
    answer.send();
  } catch (const sdbus::Error& error) {
    // The caller may have left, or the answer be larger than a message can be.
    logError("can't answer \"" + message_.getMemberName() + "\"; " + error.getMessage());
    fail(sdbus::Error("org.freedesktop.DBus.Error.LimitsExceeded", error.getMessage()));
  }
}

void BusCall::reply(const ItemRecord& item) {
  reply([&](sdbus::Message& answer) { write(answer, item); });
}

void BusCall::reply(const Result<ItemRecord>& item) {
  if (!item) return fail(item.error());
  reply(*item);
}

void BusCall::reply(const Result<std::vector<ItemRecord>>& items) {
  if (!items) return fail(items.error());
  reply([&](sdbus::Message& answer) { write(answer, *items); });
}

void BusCall::fail(const Error& error) {
  fail(errorForBus(error));
}

void BusCall::fail(const sdbus::Error& error) {
  isAnswered_ = true;
  try {
    message_.createErrorReply(error).send();
  } catch (const sdbus::Error& failure) {
    logDebug("can't answer \"" + message_.getMemberName() + "\"; " + failure.getMessage());
  }
}

Documents* BusCall::documents() {
  const auto documents = caller_->documents();
  if (documents) return *documents;
  if (documents.error().isPosix(EACCES)) {
    fail(sdbus::Error("org.freedesktop.DBus.Error.AccessDenied",
                      "the documents are another user's"));
  } else {
    fail(documents.error());
  }
  return nullptr;
}

Documents* BusCall::allDocuments() {
  Documents* all = documents();
  if (all == nullptr || !caller_->isSandboxed()) return all;
  fail(sdbus::Error("org.freedesktop.DBus.Error.AccessDenied",
                    "a sandboxed application may not do this"));
  return nullptr;
}

}  // namespace mirabel::bus
