#include "support/FaultScript.h"

#include <numeric>
#include <utility>

namespace mirabel::testing {

void FaultScript::fail(Op op, Error error, std::size_t first, std::size_t count) {
  const std::lock_guard lock(mutex_);
  const std::size_t start = counted(op) + first;
  faults_.push_back({op, start, start + count, std::move(error)});
}

void FaultScript::failCall(std::size_t first, Error error) {
  const std::lock_guard lock(mutex_);
  const std::size_t start = counted({}) + first;
  faults_.push_back({{}, start, start + 1, std::move(error)});
}

void FaultScript::reset() {
  const std::lock_guard lock(mutex_);
  counts_.fill(0);
  faults_.clear();
}

std::size_t FaultScript::calls(Op op) const {
  const std::lock_guard lock(mutex_);
  return counted(op);
}

std::size_t FaultScript::calls() const {
  const std::lock_guard lock(mutex_);
  return counted({});
}

std::optional<Error> FaultScript::hit(Op op) {
  const std::lock_guard lock(mutex_);
  ++counts_[static_cast<std::size_t>(op)];
  for (const Fault& fault : faults_) {
    if (fault.op && fault.op != op) continue;
    const std::size_t now = counted(fault.op);
    if (now >= fault.first && now < fault.end) return fault.error;
  }
  return {};
}

std::size_t FaultScript::counted(std::optional<Op> op) const {
  if (op) return counts_[static_cast<std::size_t>(*op)];
  return std::accumulate(counts_.begin(), counts_.end(), std::size_t{0});
}

}  // namespace mirabel::testing
