#pragma once

#include <cerrno>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>

#include "foundation/ExtendedAttributes.h"
#include "foundation/URL.h"
#include "support/FakeVolume.h"
#include "support/FaultScript.h"

namespace mirabel::testing {

/// What the interfaces of a `FakePlatform` share.
struct FakeCore {
  FakeVolume& volume;
  FaultScript& faults;
  std::mutex mutex;

  Result<std::shared_ptr<FakeNode>> look(Op op, const URL& url) {
    if (auto error = faults.hit(op)) return fail(*std::move(error));
    if (url.path().empty()) return fail(Error::posix(EINVAL));
    return volume.find(url.path());
  }
};

/// An object of the volume, open so that its attributes can be written.
class FakeAttributeTarget final : public AttributeTarget {
 public:
  FakeAttributeTarget(FakeCore& core, std::shared_ptr<FakeNode> node)
      : core_(core), node_(std::move(node)) {}

  Result<void> set(std::string_view name, const Data& value) override {
    const std::lock_guard lock(core_.mutex);
    if (auto error = core_.faults.hit(Op::attributeSet)) return fail(*std::move(error));
    if (const int refusal = refusalToWrite()) return fail(Error::posix(refusal));
    node_->attributes[std::string(name)] = value;
    return {};
  }

  Result<void> remove(std::string_view name) override {
    const std::lock_guard lock(core_.mutex);
    if (auto error = core_.faults.hit(Op::attributeRemove)) return fail(*std::move(error));
    if (const int refusal = refusalToWrite()) return fail(Error::posix(refusal));
    if (node_->attributes.erase(std::string(name)) == 0) return fail(Error::posix(ENODATA));
    return {};
  }

 private:
  [[nodiscard]] int refusalToWrite() const {
    const bool holdsAttributes =
        node_->kind == FileKind::regular || node_->kind == FileKind::folder;
    if (!holdsAttributes) return EPERM;
    return node_->isWritable ? 0 : EACCES;
  }

  FakeCore& core_;
  std::shared_ptr<FakeNode> node_;
};

}  // namespace mirabel::testing
