// A program that has the service's name and answers with other types than the service does: each
// question ends, with an error.
#include <cerrno>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <sdbus-c++/sdbus-c++.h>
#include <utility>

#include "host/bus/BusItems.h"
#include "host/bus/BusNames.h"
#include "host/bus/PrivateBus.h"
#include "host/bus/RemoteDocuments.h"

namespace mirabel::testing {
namespace {

const HomePlaces places{"/home/me", "/home/me/.local/state/mirabel"};

/// Answers every operation with a text.
class HostileService {
 public:
  HostileService() : connection_(sdbus::createSessionBusConnection(bus::serviceName)) {
    object_ = sdbus::createObject(*connection_, bus::objectPath);
    object_->registerMethod(bus::managerInterface, "GetHome", "", "ayay",
                            [](sdbus::MethodCall call) {
                              auto reply = call.createReply();
                              bus::write(reply, dataFromString(places.home));
                              bus::write(reply, dataFromString(places.stateFolder));
                              reply.send();
                            });
    answerWithText(bus::managerInterface, "GetStatus", "");
    answerWithText(bus::providerInterface, "GetItem", "s");
    answerWithText(bus::operationsInterface, "Trash", "sa{sv}");
    object_->finishRegistration();
    connection_->enterEventLoopAsync();
  }

 private:
  void answerWithText(const char* interface, const char* method, const char* arguments) {
    object_->registerMethod(interface, method, arguments, "s", [](sdbus::MethodCall call) {
      auto reply = call.createReply();
      reply << "nothing that was asked for";
      reply.send();
    });
  }

  std::unique_ptr<sdbus::IConnection> connection_;
  std::unique_ptr<sdbus::IObject> object_;
};

class HostileServiceTest : public ::testing::Test {
 protected:
  void SetUp() override {
    if (!PrivateBus::isPossible()) GTEST_SKIP() << "there is no dbus-daemon";
    bus = std::make_unique<PrivateBus>();
    service = std::make_unique<HostileService>();
    documents = bus::RemoteDocuments::connect(places);
    ASSERT_NE(documents, nullptr);
  }

  std::unique_ptr<PrivateBus> bus;
  std::unique_ptr<HostileService> service;
  std::unique_ptr<bus::RemoteDocuments> documents;
};

TEST_F(HostileServiceTest, AnswersOfOtherTypesAreErrors) {
  EXPECT_TRUE(documents->item("did=1").error().isPosix(EIO));
  EXPECT_TRUE(documents->status().error().isPosix(EIO));
}

TEST_F(HostileServiceTest, AnOperationEndsWhateverItIsAnsweredWith) {
  // What waits for the operation is told, or else that nobody will tell it.
  auto promise = std::make_shared<std::promise<Documents::ItemResult>>();
  auto told = promise->get_future();
  documents->trash("did=1", [promise = std::move(promise)](const Documents::ItemResult& result) {
    promise->set_value(result);
  });
  Documents::ItemResult result;
  ASSERT_NO_THROW(result = told.get());
  EXPECT_TRUE(result.error().isPosix(EIO));
}

}  // namespace
}  // namespace mirabel::testing
