#include "host/HostedProvider.h"

#include <utility>

#include "linux/volume/StateFolder.h"
#include "linux/volume/VolumeIndex.h"

namespace mirabel {

Result<std::unique_ptr<HostedProvider>> HostedProvider::open(LinuxPlatform::Options options) {
  auto platform = LinuxPlatform::open(std::move(options));
  if (!platform) return fail(platform.error());
  std::unique_ptr<HostedProvider> provider(new HostedProvider(std::move(*platform)));
  // What is answered must not depend on how far the first refresh has come.
  provider->vessel_->waitForAppLibraries();
  return provider;
}

HostedProvider::HostedProvider(std::unique_ptr<LinuxPlatform> platform)
    : platform_(std::move(platform)),
      searchable_(std::make_unique<SearchableItems>(platform_->index().stateFolder().path())),
      libraries_(std::make_unique<MRBAppLibraryManager>(platform_->platform())),
      identity_(std::make_unique<FileObjectURLs>(platform_->platform(), *libraries_)) {
  platform_->manager().setDomainDeleter(
      [this](const std::vector<std::string>& domains) -> std::optional<Error> {
        const auto deleted = searchable_->deleteDomains(domains);
        return deleted ? std::nullopt : std::optional(deleted.error());
      });
  EventStreams& events = platform_->events();
  enumerations_ = std::make_unique<FSChangesEnumerations>(
      ItemContext{platform_->platform(), *identity_, *libraries_}, events, *libraries_);
  vessel_ = std::make_unique<LocalVessel>(
      platform_->platform(), *libraries_, *libraries_,
      ChangeServices{events, diagnostics_, *enumerations_},
      ApplicationServices{*libraries_, platform_->notifications(), platform_->icons()});
  trash_ = std::make_unique<HostTrash>(*vessel_, platform_->index().keptAttributes());
}

HostedProvider::~HostedProvider() {
  // Ends what may still delete; the platform, which outlives the index, has nobody to ask then.
  vessel_.reset();
  platform_->manager().setDomainDeleter({});
}

}  // namespace mirabel
