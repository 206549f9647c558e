#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "host/Documents.h"

namespace mirabel {

struct SessionOptions {
  std::optional<std::string> home{};
  std::chrono::milliseconds timeout{30'000};  ///< how long to wait for who holds the volume
  bool embedded = false;                      ///< do without the service, even where it runs
  std::function<void(std::string_view)> notice{};
};

/// The documents of one home: through the service, if it runs for that home, or else through a
/// provider inside this process. Errors: those of `LinuxPlatform::open`.
[[nodiscard]] Result<std::unique_ptr<Documents>> openDocuments(SessionOptions options);

}  // namespace mirabel
