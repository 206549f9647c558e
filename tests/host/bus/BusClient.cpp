#include "host/bus/BusClient.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <utility>

namespace mirabel::testing {
namespace {

constexpr int longestWait = 30'000;  // milliseconds

}  // namespace

BusClient::BusClient(std::uint64_t longestAnswer)
    : longestAnswer_(longestAnswer), connection_(sdbus::createSessionBusConnection()) {
  service_ = sdbus::createProxy(*connection_, bus::serviceName, bus::objectPath);
  service_->registerSignalHandler(bus::providerInterface, "EnumeratorSignaled",
                                  [this](sdbus::Signal& signal) {
                                    std::string container;
                                    signal >> container;
                                    signals_.push_back(std::move(container));
                                  });
  service_->finishRegistration();
}

BusClient::Answer BusClient::send(const sdbus::MethodCall& message) {
  try {
    return {"", "", service_->callMethod(message, longestAnswer_)};
  } catch (const sdbus::Error& error) {
    for (const char* silence : {"NoReply", "Timeout", "Disconnected"})
      EXPECT_NE(error.getName(), std::string("org.freedesktop.DBus.Error.") + silence);
    return {error.getName(), error.getMessage(), {}};
  }
}

bool BusClient::isAnswer(const Answer& answer) {
  EXPECT_EQ(answer.error, "") << answer.message;
  return answer.error.empty();
}

ItemRecord BusClient::item(Answer answer) {
  return isAnswer(answer) ? bus::readItem(answer.reply) : ItemRecord();
}

std::vector<ItemRecord> BusClient::items(Answer answer) {
  return isAnswer(answer) ? bus::readItems(answer.reply) : std::vector<ItemRecord>();
}

Data BusClient::bytes(Answer answer) {
  return isAnswer(answer) ? bus::readBytes(answer.reply) : Data();
}

BusClient::Changes BusClient::changes(Answer answer) {
  Changes changes;
  if (!isAnswer(answer)) return changes;
  changes.updated = bus::readItems(answer.reply);
  answer.reply >> changes.deleted;
  return changes;
}

std::string BusClient::idOf(const std::string& path) {
  return item(provider("GetItemAtPath", dataFromString(path))).itemIdentifier;
}

void BusClient::takeIn() {
  while (connection_->processPendingRequest()) {
  }
}

std::string BusClient::signal() {
  for (takeIn(); signals_.empty(); takeIn()) {
    const auto wanted = connection_->getEventLoopPollData();
    pollfd wait{wanted.fd, wanted.events, 0};
    if (::poll(&wait, 1, longestWait) <= 0) return "";
  }
  std::string first = std::move(signals_.front());
  signals_.pop_front();
  return first;
}

std::vector<std::string> BusClient::takeSignals() {
  takeIn();
  const auto taken = std::exchange(signals_, {});
  return {taken.begin(), taken.end()};
}

}  // namespace mirabel::testing
