#include "host/bus/BusCall.h"

#include <cerrno>
#include <exception>
#include <utility>

#include "foundation/Log.h"
#include "host/bus/BusErrors.h"

namespace mirabel::bus {

BusCall::~BusCall() {
  if (!isAnswered_) fail(Error::posix(ECANCELED));
}

void BusCall::reply(const std::function<void(sdbus::Message&)>& write) {
  try {
    auto answer = message_.createReply();
    if (write) write(answer);
    answer.send();
    isAnswered_ = true;
  } catch (const std::exception& error) {
    // The caller may have left, the answer be larger than a message can be, or memory be short.
    logError("can't answer \"" + message_.getMemberName() + "\"; " + error.what());
    fail(sdbus::Error("org.freedesktop.DBus.Error.LimitsExceeded", error.what()));
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
  const BusError told = errorForBus(error);
  sendError(told, caller_->wantsErrorsDescribed() ? &told.info() : nullptr);
}

void BusCall::fail(const sdbus::Error& error) {
  sendError(error, nullptr);
}

void BusCall::failInvalid(const std::string& why) {
  fail(sdbus::Error("org.freedesktop.DBus.Error.InvalidArgs", why));
}

void BusCall::sendError(const sdbus::Error& error, const BusError::Info* info) {
  isAnswered_ = true;
  try {
    auto answer = message_.createErrorReply(error);
    if (info != nullptr) answer << *info;
    answer.send();
  } catch (const std::exception& failure) {
    logDebug("can't answer \"" + message_.getMemberName() + "\"; " + failure.what());
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
