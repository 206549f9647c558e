#include <gtest/gtest.h>
#include <new>
#include <stdexcept>

#include "host/LocalDocuments.h"
#include "host/bus/BusCall.h"
#include "host/bus/BusClient.h"
#include "host/bus/BusErrors.h"
#include "host/bus/PrivateBus.h"
#include "host/bus/RemoteDocuments.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

/// Somebody who has the service's name, and is not the service.
class BusHandlers : public ::testing::Test {
 protected:
  void SetUp() override {
    if (!PrivateBus::isPossible()) GTEST_SKIP() << "there is no dbus-daemon";
    bus = std::make_unique<PrivateBus>();
    connection = sdbus::createSessionBusConnection();
    object = sdbus::createObject(*connection, bus::objectPath);
  }
  void begin() {
    object->finishRegistration();
    connection->requestName(bus::serviceName);
  }

  std::unique_ptr<PrivateBus> bus;
  std::unique_ptr<sdbus::IConnection> connection;
  std::unique_ptr<sdbus::IObject> object;
};

TEST_F(BusHandlers, AnswerWhateverExceptionTheyEndWith) {
  const auto fails = [](const sdbus::MethodCall&) { throw std::bad_alloc(); };
  object->registerMethod(bus::providerInterface, "GetItem", "s", "a{sv}", bus::guarded(fails));
  begin();
  connection->enterEventLoopAsync();
  BusClient client;
  for (int i = 0; i < 2; ++i) {
    const auto answer = client.provider("GetItem", std::string("did=1"));
    EXPECT_EQ(answer.error, "org.freedesktop.DBus.Error.Failed");
    EXPECT_EQ(answer.message, std::bad_alloc().what());
  }
}

TEST_F(BusHandlers, AnswerAlsoWhereTheReplyCantBeWritten) {
  const TempHome home;
  LinuxPlatform::Options options;
  options.home = home.path();
  const auto documents = LocalDocuments::open(std::move(options)).value();
  bus::CallerIdentities identities;
  const auto nobody = std::make_shared<bus::Caller>("nobody", *documents, identities);
  object->registerMethod(bus::providerInterface, "GetItem", "s", "a{sv}",
                         [&](sdbus::MethodCall message) {
                           bus::BusCall call(std::move(message), nobody);
                           call.reply([](sdbus::Message&) { throw std::length_error("too long"); });
                         });
  begin();
  connection->enterEventLoopAsync();
  const auto answer = BusClient().provider("GetItem", std::string("did=1"));
  EXPECT_EQ(answer.error, "org.freedesktop.DBus.Error.LimitsExceeded");
  EXPECT_EQ(answer.message, "too long");
}

TEST_F(BusHandlers, OfSomebodyWhoNeverAnswersAreNotWaitedFor) {
  begin();
  EXPECT_EQ(bus::RemoteDocuments::connect({}, std::chrono::milliseconds(50)), nullptr);
}

}  // namespace
}  // namespace mirabel::testing
