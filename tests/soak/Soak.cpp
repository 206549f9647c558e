#include "soak/Soak.h"

#include <memory>
#include <thread>
#include <vector>

namespace mirabel::testing {
namespace {

constexpr std::size_t threads = 8;
constexpr std::size_t callsWithoutReading = 500;

}  // namespace

void Soak::run() {
  std::vector<std::jthread> running;
  for (std::size_t i = 0; i < threads; ++i)
    running.emplace_back([this, i] { drive(i); });
  running.emplace_back([this] { write(); });
  running.emplace_back(
      [this] { calls_ += SoakClient::askWithoutReading(truth_, callsWithoutReading); });
}

std::string Soak::failure() {
  const std::lock_guard lock(mutex_);
  return failure_;
}

bool Soak::goesOn() const {
  return !hasFailed_ && calls_ < limits_.calls && std::chrono::steady_clock::now() < limits_.end;
}

void Soak::drive(std::size_t number) {
  try {
    std::vector<std::unique_ptr<SoakClient>> mine;
    for (std::size_t i = number; i < limits_.clients; i += threads)
      mine.push_back(std::make_unique<SoakClient>(truth_, static_cast<unsigned>(i)));
    for (std::size_t turn = 0; !mine.empty() && goesOn(); ++turn)
      calls_ += mine[turn % mine.size()]->step();
  } catch (const SoakFailure& failure) {
    fail(failure.what);
  } catch (const sdbus::Error& error) {
    fail(error.getName() + ": " + error.getMessage());
  }
}

void Soak::write() {
  // As fast as the clients ask, so that neither side is all that is measured.
  for (std::size_t i = 0; goesOn(); ++i) {
    while (calls_ < i * 10 && goesOn())
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    home_.writeFile("busy/" + std::to_string(i % 50), std::to_string(i));
    if (i % 7 == 0) home_.remove("busy/" + std::to_string(i % 50));
  }
}

void Soak::fail(const std::string& what) {
  const std::lock_guard lock(mutex_);
  if (!hasFailed_.exchange(true)) failure_ = what;
}

}  // namespace mirabel::testing
