#include "cli/Session.h"

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

}  // namespace mirabel
