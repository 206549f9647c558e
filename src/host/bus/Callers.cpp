#include "host/bus/Callers.h"

#include <algorithm>
#include <cerrno>
#include <utility>
#include <vector>

#include "host/bus/RestrictedDocuments.h"

namespace mirabel::bus {
namespace {

// An open container costs memory, and a walk that is under way descriptors too.
constexpr std::size_t mostOpen = 8;
constexpr std::size_t mostWatches = 256;

}  // namespace

Result<Documents*> Caller::documents() {
  // Whoever is known waits for nobody who is not.
  if (Documents* known = documents_) return known;
  const std::lock_guard lock(identifying_);
  if (Documents* known = documents_) return known;
  auto identity = identities_.identify(name_);
  if (!identity) return fail(identity.error());
  if (identity->sandboxedApplication) {
    restricted_ = std::make_unique<RestrictedDocuments>(all_, *identity->sandboxedApplication);
    documents_ = restricted_.get();
  } else {
    documents_ = &all_;
  }
  return documents_.load();
}

Result<DocumentContainer*> Caller::container(const std::string& identifier) {
  const auto known = std::find_if(opened_.begin(), opened_.end(), [&](const Opened& opened) {
    return opened.identifier == identifier;
  });
  if (known != opened_.end()) {
    opened_.splice(opened_.begin(), opened_, known);
    return opened_.front().container.get();
  }
  const auto all = documents();
  if (!all) return fail(all.error());
  auto container = (*all)->container(identifier);
  if (!container) return fail(container.error());
  opened_.push_front({identifier, *std::move(container)});
  if (opened_.size() > mostOpen) opened_.pop_back();
  return opened_.front().container.get();
}

Result<void> Caller::watch(const std::string& identifier, std::function<void()> signalled) {
  {
    const std::lock_guard lock(mutex_);
    if (watches_.contains(identifier)) return {};
    if (watches_.size() >= mostWatches)
      return fail(Error::posix(ENOBUFS, "more containers are watched than one client may"));
  }
  const auto all = documents();
  if (!all) return fail(all.error());
  auto watch = (*all)->watch(identifier, std::move(signalled));
  if (!watch) return fail(watch.error());
  const std::lock_guard lock(mutex_);
  if (!hasLeft_) watches_.emplace(identifier, *std::move(watch));
  return {};
}

void Caller::unwatch(const std::string& identifier) {
  std::unique_ptr<ContainerWatch> ended;  // without the lock
  const std::lock_guard lock(mutex_);
  const auto found = watches_.find(identifier);
  if (found == watches_.end()) return;
  ended = std::move(found->second);
  watches_.erase(found);
}

void Caller::leave() {
  opened_.clear();
  std::map<std::string, std::unique_ptr<ContainerWatch>> ended;  // without the lock
  const std::lock_guard lock(mutex_);
  hasLeft_ = true;
  ended.swap(watches_);
}

std::shared_ptr<Caller> Callers::of(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  auto& caller = callers_[uniqueName];
  if (!caller) caller = std::make_shared<Caller>(uniqueName, all_, identities_);
  return caller;
}

std::shared_ptr<Caller> Callers::take(const std::string& uniqueName) {
  const std::lock_guard lock(mutex_);
  const auto node = callers_.extract(uniqueName);
  if (!node) return nullptr;
  leaving_.insert(node.mapped());
  return node.mapped();
}

void Callers::leave(const std::shared_ptr<Caller>& caller) {
  caller->leave();
  const std::lock_guard lock(mutex_);
  leaving_.erase(caller);
}

void Callers::leaveAll() {
  std::set<std::shared_ptr<Caller>> all;
  {
    const std::lock_guard lock(mutex_);
    all.swap(leaving_);
    for (const auto& [name, caller] : std::exchange(callers_, {}))
      all.insert(caller);
  }
  for (const auto& caller : all)
    caller->leave();
}

}  // namespace mirabel::bus
