#include "mirabel/Session.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <memory>
#include <string>
#include <utility>

#include "host/LocalDocuments.h"
#include "host/bus/RemoteDocuments.h"
#include "linux/files/HomeLayout.h"

namespace mirabel {
namespace {

using namespace std::chrono_literals;

constexpr auto betweenQuestions = 250ms;

std::unique_ptr<Documents> servedDocuments(const SessionOptions& options) {
  HomeLayout::Choices choices;
  choices.home = options.home;
  const auto layout = HomeLayout::resolve(choices);
  if (!layout) return nullptr;
  return bus::RemoteDocuments::connect({layout->home, layout->stateFolder});
}

Result<std::unique_ptr<Documents>> localDocuments(const SessionOptions& options,
                                                  std::chrono::milliseconds timeout) {
  LinuxPlatform::Options platformOptions;
  platformOptions.home = options.home;
  platformOptions.timeout = timeout;
  platformOptions.notice = options.notice;
  return LocalDocuments::open(std::move(platformOptions));
}

/// The same text in a row is told once, also by copies.
std::function<void(std::string_view)> withoutRepetition(
    std::function<void(std::string_view)> notice) {
  if (!notice) return {};
  return
      [notice = std::move(notice), last = std::make_shared<std::string>()](std::string_view text) {
        if (std::exchange(*last, text) != text) notice(text);
      };
}

}  // namespace

Result<std::unique_ptr<Documents>> openDocuments(SessionOptions options) {
  using Steady = std::chrono::steady_clock;
  if (options.embedded) return localDocuments(options, options.timeout);
  options.notice = withoutRepetition(std::move(options.notice));
  const auto deadline = Steady::now() + options.timeout;
  while (true) {
    if (auto served = servedDocuments(options)) return served;
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Steady::now());
    // Who holds the volume may be the service, which takes its name later.
    auto opened = localDocuments(options, std::clamp(left, 0ms, betweenQuestions));
    if (opened || !opened.error().isPosix(EBUSY) || left <= betweenQuestions) return opened;
  }
}

}  // namespace mirabel
