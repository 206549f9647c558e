#pragma once

#include "foundation/Log.h"
#include "platform/DiagnosticReporter.h"

namespace mirabel {

/// Reports as error lines: people look for them in the journal of the service.
class LoggingDiagnosticReporter final : public DiagnosticReporter {
 public:
  void report(std::string_view text) override { logError(text); }
};

}  // namespace mirabel
