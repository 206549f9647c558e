#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

namespace mirabel {

/// A forked process that says lines and can be told to go on, until it is killed with SIGKILL, at
/// the latest by the destructor. To be started while nothing is open that it would share. It has
/// no threads but its own.
class KilledProcess {
 public:
  /// What the process itself has of it.
  class Self {
   public:
    /// When it returns, the line reaches the parent whatever happens next.
    void say(std::string_view line) const;
    /// Until the parent says to go on.
    void wait() const;

   private:
    friend KilledProcess;
    Self(int out, int in) : out_(out), in_(in) {}
    int out_;
    int in_;
  };

  /// Runs `work` in the process, which then waits to be killed.
  explicit KilledProcess(const std::function<void(const Self&)>& work);
  ~KilledProcess() { kill(); }
  KilledProcess(const KilledProcess&) = delete;
  KilledProcess& operator=(const KilledProcess&) = delete;

  /// The next line; empty when its work is over.
  std::string line();
  void goOn() const;
  /// Whether lines came within that time.
  bool listen(long microseconds);
  /// Kills it, and answers all lines that were not read yet.
  std::vector<std::string> kill();

 private:
  bool readMore();
  pid_t process_ = -1;
  int out_ = -1;
  int in_ = -1;
  std::string said_;
};

}  // namespace mirabel
