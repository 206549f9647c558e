#include "mirabel/Session.h"

#include "host/LocalDocuments.h"
#include "host/bus/RemoteDocuments.h"
#include "linux/files/HomeLayout.h"

namespace mirabel {
namespace {

std::unique_ptr<Documents> servedDocuments(const SessionOptions& options) {
  HomeLayout::Choices choices;
  choices.home = options.home;
  const auto layout = HomeLayout::resolve(choices);
  if (!layout) return nullptr;
  return bus::RemoteDocuments::connect({layout->home, layout->stateFolder});
}

}  // namespace

Result<std::unique_ptr<Documents>> openDocuments(SessionOptions options) {
  if (!options.embedded) {
    if (auto served = servedDocuments(options)) return served;
  }
  LinuxPlatform::Options platformOptions;
  platformOptions.home = std::move(options.home);
  platformOptions.timeout = options.timeout;
  platformOptions.notice = std::move(options.notice);
  return LocalDocuments::open(std::move(platformOptions));
}

}  // namespace mirabel
