#include <cerrno>
#include <functional>
#include <future>
#include <mutex>
#include <new>
#include <optional>
#include <stdexcept>
#include <vector>

#include "host/LocalDocuments.h"
#include "host/bus/BusCall.h"
#include "host/bus/BusClient.h"
#include "host/bus/BusErrors.h"
#include "host/bus/Callers.h"
#include "host/bus/RemoteDocuments.h"
#include "host/bus/ServiceFixture.h"
#include "mirabel/Containers.h"

namespace mirabel::testing {
namespace {

/// Somebody who has the service's name, and is not the service.
class BusHandlers : public ServiceFixture {
 protected:
  void SetUp() override {
    ServiceFixture::SetUp();
    if (IsSkipped()) return;
    connection = sdbus::createSessionBusConnection();
    object = sdbus::createObject(*connection, bus::objectPath);
  }
  void answerGetItem(const std::function<void(sdbus::MethodCall)>& handler) {
    object->registerMethod(bus::providerInterface, "GetItem", "s", "a{sv}", handler);
    begin();
    connection->enterEventLoopAsync();
  }
  /// What `RemoteDocuments::connect` asks for.
  void answerGetHome() {
    object->registerMethod(bus::managerInterface, "GetHome", "", "ayay",
                           [this](const sdbus::MethodCall& call) {
                             auto reply = call.createReply();
                             bus::write(reply, dataFromString(places.home));
                             bus::write(reply, dataFromString(places.stateFolder));
                             reply.send();
                           });
  }
  /// As other types than the service does.
  void answerWithText(const char* interface, const char* method, const char* arguments) {
    object->registerMethod(interface, method, arguments, "s", [](const sdbus::MethodCall& call) {
      auto reply = call.createReply();
      reply << "nothing that was asked for";
      reply.send();
    });
  }
  void begin() {
    object->finishRegistration();
    connection->requestName(bus::serviceName);
  }

  const HomePlaces places{"/home/me", "/home/me/.local/state/mirabel"};
  std::unique_ptr<sdbus::IConnection> connection;
  std::unique_ptr<sdbus::IObject> object;
};

TEST_F(BusHandlers, AnswerWhateverExceptionTheyEndWith) {
  answerGetItem(bus::guarded([](const sdbus::MethodCall&) { throw std::bad_alloc(); }));
  BusClient client;
  for (int i = 0; i < 2; ++i) {
    const auto answer = client.provider("GetItem", std::string("did=1"));
    EXPECT_EQ(answer.error, "org.freedesktop.DBus.Error.Failed");
    EXPECT_EQ(answer.message, std::bad_alloc().what());
  }
}

TEST_F(BusHandlers, AnswerAlsoWhereTheReplyCantBeWritten) {
  const auto documents = LocalDocuments::open({.home = home.path()}).value();
  bus::CallerIdentities identities;
  const auto nobody = std::make_shared<bus::Caller>("nobody", *documents, identities);
  answerGetItem([&](sdbus::MethodCall message) {
    bus::BusCall call(std::move(message), nobody);
    call.reply([](sdbus::Message&) { throw std::length_error("too long"); });
  });
  const auto answer = BusClient().provider("GetItem", std::string("did=1"));
  EXPECT_EQ(answer.error, "org.freedesktop.DBus.Error.LimitsExceeded");
  EXPECT_EQ(answer.message, "too long");
}

// When the service ends, nobody else may come to have the one leave that the bus said has left.
TEST_F(BusHandlers, KeepNothingOfACallerWhoLeavesWhileTheServiceEnds) {
  auto documents = LocalDocuments::open({.home = home.path()}).value();
  bus::Callers callers(*documents);
  const std::string name = connection->getUniqueName();
  auto signalled = std::make_shared<int>();
  const std::weak_ptr<int> watch = signalled;
  ASSERT_TRUE(callers.of(name)->watch(std::string(VesselRootContainerItemIdentifier),
                                      [signalled = std::move(signalled)] { ++*signalled; }));
  const auto leaving = callers.take(name);
  callers.leaveAll();
  EXPECT_TRUE(watch.expired());
  documents.reset();
}

TEST_F(BusHandlers, OfSomebodyWhoNeverAnswersAreNotWaitedFor) {
  begin();
  EXPECT_EQ(bus::RemoteDocuments::connect({}, std::chrono::milliseconds(50)), nullptr);
}

TEST_F(BusHandlers, WhoseAnswersAreOfOtherTypesGiveErrors) {
  answerGetHome();
  answerWithText(bus::managerInterface, "GetStatus", "");
  answerWithText(bus::providerInterface, "GetItem", "s");
  answerWithText(bus::operationsInterface, "Trash", "sa{sv}");
  begin();
  connection->enterEventLoopAsync();
  const auto documents = bus::RemoteDocuments::connect(places);
  ASSERT_NE(documents, nullptr);
  EXPECT_TRUE(documents->item("did=1").error().isPosix(EIO));
  EXPECT_TRUE(documents->status().error().isPosix(EIO));
  // What waits for an operation is told, or else that nobody will tell it.
  auto promise = std::make_shared<std::promise<Documents::ItemResult>>();
  auto told = promise->get_future();
  documents->trash("did=1", [promise = std::move(promise)](const Documents::ItemResult& result) {
    promise->set_value(result);
  });
  Documents::ItemResult result;
  ASSERT_NO_THROW(result = told.get());
  EXPECT_TRUE(result.error().isPosix(EIO));
}

TEST_F(BusHandlers, WhoseAnswersNeverComeLeaveNobodyWaiting) {
  constexpr std::size_t number = 5;
  answerGetHome();
  std::mutex mutex;
  std::vector<sdbus::MethodCall> kept;
  object->registerMethod(bus::operationsInterface, "Delete", "sa{sv}", "",
                         [&](const sdbus::MethodCall& call) {
                           const std::lock_guard lock(mutex);
                           kept.push_back(call);
                         });
  begin();
  connection->enterEventLoopAsync();
  std::unique_ptr<Documents> documents = bus::RemoteDocuments::connect(places);
  ASSERT_NE(documents, nullptr);
  std::vector<std::optional<Error>> told;
  const auto tell = [&](const std::optional<Error>& error) { told.push_back(error); };
  for (std::size_t i = 1; i < number; ++i)
    documents->remove("did=1", tell);
  documents->remove("did=1", [&, all = documents.get()](const std::optional<Error>& error) {
    tell(error);
    all->remove("did=2", tell);
  });
  documents.reset();
  ASSERT_EQ(told.size(), number + 1);
  for (const auto& error : told)
    EXPECT_TRUE(error && error->isPosix(ENOTCONN));
  connection->leaveEventLoop();
}

}  // namespace
}  // namespace mirabel::testing
