#pragma once

#include <memory>
#include <nlohmann/json_fwd.hpp>
#include <string>
#include <sys/types.h>

#include "ChildProcess.h"

namespace mirabel::bench {

/// A watchman of the benchmark's own, with everything that it keeps in one folder, spoken to in
/// JSON over its socket.
class Watchman {
 public:
  /// Null when the program is not installed.
  [[nodiscard]] static std::unique_ptr<Watchman> start(const std::string& folder);
  ~Watchman();
  Watchman(const Watchman&) = delete;
  Watchman& operator=(const Watchman&) = delete;

  /// Has it watch the folder, and answers when it knows everything in it.
  void watch(const std::string& root);
  /// The answer to "what has changed in the watched folder since you were asked last", in step
  /// with the disk, as it came; nothing of it is read yet.
  [[nodiscard]] std::string changes() const;
  /// How many changes an answer holds; from now on the question is what comes after it.
  std::size_t take(const std::string& answer);

  [[nodiscard]] pid_t process() const { return server_.id(); }

 private:
  explicit Watchman(const std::string& folder);
  [[nodiscard]] std::string ask(const nlohmann::json& command) const;

  ChildProcess server_;
  int socket_ = -1;
  std::unique_ptr<char[]> buffer_;
  std::string root_;
  std::string clock_;
};

}  // namespace mirabel::bench
