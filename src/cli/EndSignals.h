#pragma once

#include <csignal>

#include "mirabel/UniqueFd.h"

namespace mirabel {

/// While it lives, the signals that ask the process to end (SIGINT and SIGTERM, unless they were
/// ignored) are told by a descriptor, and end nothing by themselves. To be made before the threads
/// are that might get them instead.
class EndSignals {
 public:
  EndSignals();
  /// What came meanwhile was taken notice of.
  ~EndSignals();
  EndSignals(const EndSignals&) = delete;
  EndSignals& operator=(const EndSignals&) = delete;

  /// Readable when one came; -1 where there is none to be had: they end the process then.
  [[nodiscard]] int descriptor() const { return signals_.get(); }
  /// Ends the process as the signal that came would have.
  void endProcess();

 private:
  [[nodiscard]] int take() const;

  sigset_t before_{};
  UniqueFd signals_;
};

}  // namespace mirabel
