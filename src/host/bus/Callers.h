#pragma once

#include <atomic>
#include <functional>
#include <list>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>

#include "host/bus/CallerIdentity.h"
#include "mirabel/Documents.h"

namespace mirabel::bus {

/// A connection on the bus that has called, with what is kept for it until it leaves.
class Caller {
 public:
  Caller(std::string name, Documents& all, CallerIdentities& identities)
      : name_(std::move(name)), all_(all), identities_(identities) {}

  [[nodiscard]] const std::string& name() const { return name_; }
  /// The documents as the caller may see them. It is asked who it is once. Errors: those of
  /// `CallerIdentities::identify`. Any thread.
  [[nodiscard]] Result<Documents*> documents();
  /// Whether it has been asked who it is, and may see all documents. Waits for nobody.
  [[nodiscard]] bool isKnownToSeeAll() const { return documents_ == &all_; }
  /// Whether it runs in a sandbox; to be asked when `documents` was.
  [[nodiscard]] bool isSandboxed() const { return restricted_ != nullptr; }

  /// Errors are answered with their information from now on, see `BusError`. Any thread.
  void describeErrors() { describesErrors_ = true; }
  [[nodiscard]] bool wantsErrorsDescribed() const { return describesErrors_; }

  // For calls of the lane in which those of a caller run one after the other.

  /// What the caller lists and follows; the least used of them is let go of when they are many, and
  /// its anchors and pages hold all the same. Errors: those of `Documents::container`.
  [[nodiscard]] Result<DocumentContainer*> container(const std::string& identifier);
  /// Has `signalled` called for what happens in the container; again is harmless. POSIX ENOBUFS for
  /// more than a caller may watch.
  [[nodiscard]] Result<void> watch(const std::string& identifier, std::function<void()> signalled);
  void unwatch(const std::string& identifier);

  /// It has left the bus: nothing is kept for it any more, nor from now on. Waits for a signal that
  /// is being sent, and so is not called on the thread that drives the bus.
  void leave();

 private:
  struct Opened {
    std::string identifier;
    std::unique_ptr<DocumentContainer> container;
  };

  const std::string name_;
  Documents& all_;
  CallerIdentities& identities_;
  std::mutex identifying_;
  std::atomic<Documents*> documents_ = nullptr;
  std::unique_ptr<Documents> restricted_;
  std::atomic<bool> describesErrors_ = false;

  std::list<Opened> opened_;  ///< the last used first

  std::mutex mutex_;  ///< for what follows
  bool hasLeft_ = false;
  std::map<std::string, std::unique_ptr<ContainerWatch>> watches_;
};

/// The callers that are on the bus. Any thread may call it.
class Callers {
 public:
  /// Outlives its callers.
  explicit Callers(Documents& all) : all_(all) {}

  /// The caller of that name on the bus. To be called for each message in the order in which they
  /// came, so that what a caller sent before it left does not bring it back.
  [[nodiscard]] std::shared_ptr<Caller> of(const std::string& uniqueName);
  /// Forgets the name of the caller, who is to leave. Null for one that has not called.
  [[nodiscard]] std::shared_ptr<Caller> take(const std::string& uniqueName);
  /// Has one that was taken leave.
  void leave(const std::shared_ptr<Caller>& caller);
  /// Has all of them leave, also those that were taken and have not left. For when none of their
  /// calls runs any more, nor `leave`.
  void leaveAll();

 private:
  Documents& all_;
  CallerIdentities identities_;
  std::mutex mutex_;
  std::map<std::string, std::shared_ptr<Caller>> callers_;
  /// Those that were taken: nobody else may be left who would have them leave.
  std::set<std::shared_ptr<Caller>> leaving_;
};

}  // namespace mirabel::bus
