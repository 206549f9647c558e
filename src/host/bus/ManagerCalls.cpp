#include <utility>

#include "host/bus/BusCall.h"
#include "host/bus/BusNames.h"
#include "host/bus/BusStatus.h"

namespace mirabel::bus {
namespace {

using CallPointer = std::shared_ptr<BusCall>;

void getStatus(const CallPointer& call) {
  Documents* documents = call->allDocuments();
  if (documents == nullptr) return;
  const auto status = documents->status();
  if (!status) return call->fail(status.error());
  call->reply([&](sdbus::Message& reply) { write(reply, *status); });
}

void getHome(const CallPointer& call) {
  Documents* documents = call->allDocuments();
  if (documents == nullptr) return;
  const HomePlaces places = documents->places();
  call->reply([&](sdbus::Message& reply) {
    write(reply, dataFromString(places.home));
    write(reply, dataFromString(places.stateFolder));
  });
}

void describeErrors(const CallPointer& call) {
  if (call->allDocuments() == nullptr) return;
  call->caller().describeErrors();
  call->reply();
}

/// In its turn among all calls, so that errors of those which follow it are described.
bool describeErrorsAtOnce(BusCall& call) {
  if (!call.caller().isKnownToSeeAll()) return false;
  call.caller().describeErrors();
  call.reply();
  return true;
}

void getProgress(const CallPointer& call) {
  Documents* documents = call->allDocuments();
  if (documents == nullptr) return;
  const Progress progress = documents->progress();
  call->reply([&](sdbus::Message& reply) {
    reply << progress.entriesCopied << progress.bytesCopied << progress.entriesRemoved;
  });
}

/// The moment that the first argument names; nothing, and the call is answered, for what is none.
std::optional<Date> momentOf(const CallPointer& call) {
  const auto date = Date::fromRFC3339(call->argument<std::string>());
  if (!date) call->failInvalid("this is no date in RFC 3339 form");
  return date;
}

void findTrashedItems(const CallPointer& call) {
  Documents* documents = call->allDocuments();
  if (documents == nullptr) return;
  const auto before = momentOf(call);
  if (!before) return;
  const auto found = documents->itemsTrashedBefore(*before);
  if (!found) return call->fail(found.error());
  call->reply([&](sdbus::Message& reply) {
    write(reply, found->old);
    reply << found->undated;
  });
}

void removeTrashedItems(const CallPointer& call) {
  Documents* documents = call->allDocuments();
  if (documents == nullptr) return;
  const auto before = momentOf(call);
  if (!before) return;
  documents->removeItemsTrashedBefore(*before, [call](const std::optional<Error>& error) {
    if (error) return call->fail(*error);
    call->reply();
  });
}

}  // namespace

std::vector<BusMethod> managerMethods() {
  constexpr const char* of = managerInterface;
  return {
      {of, "GetStatus", "", {}, "a{sv}", {"status"}, Lane::enumerations, getStatus},
      {of, "GetHome", "", {}, "ayay", {"home", "stateFolder"}, Lane::lookups, getHome},
      {of, "DescribeErrors", "", {}, "", {}, Lane::lookups, describeErrors, describeErrorsAtOnce},
      {of,
       "GetProgress",
       "",
       {},
       "ttt",
       {"entriesCopied", "bytesCopied", "entriesRemoved"},
       Lane::lookups,
       getProgress},
      {of,
       "FindTrashedItems",
       "s",
       {"before"},
       "a(say(xu))t",
       {"items", "undated"},
       Lane::enumerations,
       findTrashedItems},
      {of, "RemoveTrashedItems", "s", {"before"}, "", {}, Lane::enumerations, removeTrashedItems},
  };
}

}  // namespace mirabel::bus
