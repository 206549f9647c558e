#include "cli/Session.h"

#include "linux/apps/LinuxApplicationRegistry.h"

namespace mirabel {

Result<std::unique_ptr<Session>> Session::open(Options options) {
  LinuxPlatform::Options platformOptions;
  platformOptions.home = std::move(options.home);
  platformOptions.timeout = options.timeout;
  platformOptions.notice = std::move(options.notice);
  auto hosted = HostedProvider::open(std::move(platformOptions));
  if (!hosted) return fail(hosted.error());
  return std::unique_ptr<Session>(new Session(std::move(*hosted)));
}

std::optional<std::string> Session::reasonLeftOut(std::string_view bundle) const {
  for (const LeftOut& leftOut : linuxPlatform().applications().leftOut())
    if (leftOut.identifier == bundle) return "it is left out: " + leftOut.reason;
  return {};
}

}  // namespace mirabel
