#pragma once

#include <cstddef>
#include <deque>
#include <memory>
#include <mutex>
#include <string>

#include "fs/FSDirectoryWalk.h"
#include "mirabel/Values.h"

namespace mirabel {

/// The walks of listings whose next page has not been asked for yet, each under the cursor that
/// was handed out for it: going on with one costs a page, where walking to the cursor's offset
/// anew makes a listing quadratic. A bounded number; the oldest is dropped, and its listing goes
/// on by its offset. Any thread.
class OpenWalks {
 public:
  static constexpr std::size_t mostWalks = 16;
  /// Directories that all of them together keep open.
  static constexpr std::size_t mostDirectories = 256;

  /// `walk` was paused. It is not kept where it alone has too many directories open.
  void keep(const std::string& container, const Data& cursor,
            std::unique_ptr<FSDirectoryWalk> walk);
  /// The walk that was kept there, which is then the caller's; null when there is none.
  [[nodiscard]] std::unique_ptr<FSDirectoryWalk> take(const std::string& container,
                                                      const Data& cursor);

 private:
  struct Kept {
    std::string container;
    Data cursor;
    std::unique_ptr<FSDirectoryWalk> walk;
  };
  void dropOldest();

  std::mutex mutex_;
  std::deque<Kept> kept_;  // the oldest first
  std::size_t directories_ = 0;
};

}  // namespace mirabel
