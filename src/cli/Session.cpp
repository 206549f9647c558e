#include "cli/Session.h"

#include <utility>

namespace mirabel {

Result<std::unique_ptr<Session>> Session::open(Options options) {
  LinuxPlatform::Options platformOptions;
  platformOptions.home = std::move(options.home);
  platformOptions.timeout = options.timeout;
  platformOptions.notice = std::move(options.notice);
  auto platform = LinuxPlatform::open(std::move(platformOptions));
  if (!platform) return fail(platform.error());
  std::unique_ptr<Session> session(new Session);
  session->platform_ = std::move(*platform);
  EventStreams& events = session->platform_->events();
  session->libraries_ = std::make_unique<MRBAppLibraryManager>(session->platform());
  MRBAppLibraryManager& libraries = *session->libraries_;
  session->identity_ = std::make_unique<FileObjectURLs>(session->platform(), libraries);
  session->enumerations_ = std::make_unique<FSChangesEnumerations>(
      ItemContext{session->platform(), *session->identity_, libraries}, events, libraries);
  session->provider_ = std::make_unique<LocalVessel>(
      session->platform(), libraries, libraries,
      ChangeServices{events, session->diagnostics_, *session->enumerations_},
      ApplicationServices{libraries, session->platform_->notifications()});
  // What is answered must not depend on how far the first refresh has come.
  session->provider_->waitForAppLibraries();
  session->trash_ = std::make_unique<HostTrash>(*session->provider_,
                                                session->platform_->index().keptAttributes());
  return session;
}

}  // namespace mirabel
