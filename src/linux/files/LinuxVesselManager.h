#pragma once

#include "foundation/URL.h"
#include "platform/VesselManager.h"

namespace mirabel {

/// Knows the document storage, which was resolved when the platform was opened.
class LinuxVesselManager final : public VesselManager {
 public:
  explicit LinuxVesselManager(URL documentStorage) : documentStorage_(std::move(documentStorage)) {}

  const URL& documentStorageURL() const override { return documentStorage_; }

 private:
  URL documentStorage_;
};

}  // namespace mirabel
