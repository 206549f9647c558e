#include "host/bus/BusService.h"

#include <atomic>
#include <cerrno>
#include <chrono>
#include <exception>
#include <mutex>
#include <sdbus-c++/sdbus-c++.h>
#include <stop_token>
#include <string_view>
#include <utility>

#include "foundation/Log.h"
#include "host/bus/AfterUse.h"
#include "host/bus/BusCall.h"
#include "host/bus/BusErrors.h"
#include "host/bus/BusLoop.h"
#include "host/bus/BusNames.h"
#include "host/bus/CallLane.h"
#include "host/bus/Callers.h"
#include "host/bus/StagedImport.h"
#include "linux/volume/StateFolder.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel::bus {
namespace {

// Answers are made from the disk and the index, which more threads do not make quicker. Listings
// wait for the disk the longest.
constexpr std::size_t lookupThreads = 3;
constexpr std::size_t enumerationThreads = 6;
constexpr std::size_t operationThreads = 4;
// Fewer than run at a time, so that nobody's wait for all that somebody else has asked for.
constexpr std::size_t operationsOfACaller = 2;
constexpr std::size_t mostWaiting = 4096;
// Each holds a descriptor, of which the whole service has a limited number.
constexpr std::size_t mostFilesWaiting = 128;
// Arguments are names, paths, words and what the service has handed out; there is no method that
// takes so much of any.
constexpr std::size_t mostBytesWaiting = 4u << 20;

constexpr CallLane::Limits limits(std::size_t threads, std::size_t mostRunning) {
  return {threads, mostRunning, mostWaiting, mostFilesWaiting, mostBytesWaiting};
}

// A burst of calls leaves freed memory in the allocator and pages of the databases in their caches.
// Short, so that it is a burst and not the day that memory is kept for; what was given back costs a
// few milliseconds to have again.
constexpr AfterUse::Times givingBack{std::chrono::seconds(2), std::chrono::seconds(60)};

}  // namespace

class BusService::Impl {
 public:
  Impl(LocalDocuments& documents, std::function<void()> lost)
      : documents_(documents),
        callers_(documents),
        memory_(givingBack, [&documents] { documents.releaseMemory(); }),
        stagingFolder_(documents.provider().linuxPlatform().index().stateFolder().path() +
                       "/imports"),
        connection_(sdbus::createSessionBusConnection()) {
    StagedImport::clear(stagingFolder_);
    object_ = sdbus::createObject(*connection_, objectPath);
    addMethods();
    const std::string leaving = std::string(ownerChanges) + ",arg2=''";
    leaving_ = connection_->addMatch(leaving, [this](sdbus::Message& message) {
      try {
        std::string name;
        message >> name;
        if (name.starts_with(':')) callerLeft(name);
      } catch (const std::exception& exception) {
        logError(std::string("can't let go of a client; ") + exception.what());
      }
    });
    connection_->requestName(serviceName);
    loop_ = std::make_unique<BusLoop>(*connection_, std::move(lost));
  }

  void stop() {
    if (hasStopped_.exchange(true)) return;
    // Waits for what is being answered, which needs the documents.
    { const std::lock_guard lock(answeringAtOnce_); }
    stopping_.request_stop();
    documents_.stopSearching();
    try {
      connection_->releaseName(serviceName);
    } catch (const sdbus::Error& error) {
      logDebug("can't release the name on the bus; " + error.getMessage());
    }
    for (CallLane* lane : {&lookups_, &enumerations_, &operations_})
      lane->end();
    callers_.leaveAll();
    memory_.end();
  }

  ~Impl() { stop(); }

 private:
  void addMethods() {
    const auto signaller = [this](const std::string& caller, const std::string& container) {
      signal(caller, container);
    };
    const auto recall = [this](std::string_view identifier) {
      return documents_.itemAtOnce(identifier);
    };
    for (auto methods :
         {providerMethods(signaller, recall),
          operationsMethods(stagingFolder_, stopping_.get_token()), managerMethods()}) {
      for (BusMethod& method : methods)
        add(std::move(method));
    }
    object_->registerSignal(providerInterface, "EnumeratorSignaled", "s", {"container"});
    sdbus::Flags constant;
    constant.set(sdbus::Flags::CONST_PROPERTY_VALUE);
    const auto tellVersion = [](sdbus::PropertyGetReply& reply) {
      reply << std::string(MIRABEL_VERSION);
    };
    object_->registerProperty(managerInterface, "Version", "s", tellVersion, constant);
    object_->finishRegistration();
  }

  void add(BusMethod method) {
    // Descriptors within a variant, or that no argument names, can't be told before it is read.
    const bool isWithFile =
        std::string_view(method.inputSignature).find('h') != std::string_view::npos;
    const auto answer = [this, isWithFile, lane = method.lane, answer = std::move(method.answer),
                         atOnce = std::move(method.answerAtOnce)](sdbus::MethodCall message) {
      memory_.used();
      const std::string name = message.getSender();
      const auto call = std::make_shared<BusCall>(std::move(message), callers_.of(name));
      const CallLane::Holds holds{call->size(mostBytesWaiting), isWithFile};
      if (holds.bytes > mostBytesWaiting)
        return call->fail(Error::posix(E2BIG, "a call may have arguments of 4 MiB at most"));
      if (atOnce && answersAtOnce(atOnce, *call)) return;
      const auto run = [call, answer](std::shared_ptr<void> turn) {
        call->keepTurn(std::move(turn));
        answer(call);
      };
      if (laneOf(lane).submit(name, run, holds)) return;
      if (hasStopped_) return call->fail(Error::posix(ECANCELED, "the service is about to end"));
      call->fail(sdbus::Error("org.freedesktop.DBus.Error.LimitsExceeded",
                              "too many calls of this client wait for their answers"));
    };
    object_->registerMethod(method.interface, method.name, method.inputSignature, method.inputNames,
                            method.outputSignature, method.outputNames, guarded(answer));
  }

  bool answersAtOnce(const std::function<bool(BusCall&)>& atOnce, BusCall& call) {
    const std::lock_guard lock(answeringAtOnce_);
    return !hasStopped_ && atOnce(call);
  }

  CallLane& laneOf(Lane lane) {
    switch (lane) {
      case Lane::lookups:
        return lookups_;
      case Lane::enumerations:
        return enumerations_;
      case Lane::operations:
        return operations_;
    }
    return lookups_;
  }

  // On the thread that drives the bus; what has to wait goes to a lane.
  void callerLeft(const std::string& name) {
    const auto caller = callers_.take(name);
    if (!caller) return;
    memory_.used();
    for (CallLane* lane : {&lookups_, &enumerations_, &operations_})
      lane->forget(name);
    // Not here, where the bus is driven: a signal that is being sent would wait for this. Where the
    // lane has ended, so does the service, and all callers leave.
    static_cast<void>(
        enumerations_.submit(name, [this, caller](const auto&) { callers_.leave(caller); }, {}));
  }

  void signal(const std::string& caller, const std::string& container) {
    try {
      auto message = object_->createSignal(providerInterface, "EnumeratorSignaled");
      message.setDestination(caller);
      message << container;
      message.send();
    } catch (const sdbus::Error& error) {
      logDebug("can't signal \"" + container + "\"; " + error.getMessage());
    }
  }

  LocalDocuments& documents_;
  Callers callers_;
  AfterUse memory_;
  std::string stagingFolder_;
  std::unique_ptr<sdbus::IConnection> connection_;
  std::unique_ptr<sdbus::IObject> object_;
  sdbus::Slot leaving_;
  std::stop_source stopping_;
  CallLane lookups_{limits(lookupThreads, 1)};
  CallLane enumerations_{limits(enumerationThreads, 1)};
  CallLane operations_{limits(operationThreads, operationsOfACaller)};
  std::atomic<bool> hasStopped_ = false;
  std::mutex answeringAtOnce_;
  std::unique_ptr<BusLoop> loop_;
};

BusService::BusService(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {}
BusService::~BusService() = default;

Result<std::unique_ptr<BusService>> BusService::start(LocalDocuments& documents,
                                                      std::function<void()> lost) {
  try {
    return std::unique_ptr<BusService>(
        new BusService(std::make_unique<Impl>(documents, std::move(lost))));
  } catch (const sdbus::Error& error) {
    if (error.getName() == "org.freedesktop.DBus.Error.FileExists" ||
        error.getName() == "System.Error.EEXIST" || error.getName() == "System.Error.EALREADY") {
      return fail(Error::posix(EADDRINUSE, "another service is on this bus"));
    }
    return fail(Error::posix(ENOTCONN, "no session bus can be reached: " + error.getMessage()));
  }
}

void BusService::stop() {
  impl_->stop();
}

}  // namespace mirabel::bus
