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
/// on by its offset. Where two that stand at different places come under one cursor, neither is
/// kept, nor any further one. Any thread.
class OpenWalks {
 public:
  static constexpr std::size_t mostWalks = 16;
  /// Directories that all of them together keep open.
  static constexpr std::size_t mostDirectories = 256;

  /// `walk` was paused; `position` says where it stands, and is empty where that can't be told. It
  /// is not kept where it alone has too many directories open. False when another walk makes the
  /// cursor ambiguous.
  [[nodiscard]] bool keep(const std::string& container, const Data& cursor,
                          std::unique_ptr<FSDirectoryWalk> walk, const Data& position);
  /// Keeps nothing under that cursor any more.
  void spoil(const std::string& container, const Data& cursor);
  /// The walk that was kept there, which is then the caller's; null when there is none.
  [[nodiscard]] std::unique_ptr<FSDirectoryWalk> take(const std::string& container,
                                                      const Data& cursor);

 private:
  struct Kept {
    std::string container;
    Data cursor;
    Data position;
    std::unique_ptr<FSDirectoryWalk> walk;  ///< null where the cursor is ambiguous
  };
  [[nodiscard]] bool isAmbiguous(const Kept& next) const;
  void dropOldest();
  void close(Kept& kept);

  std::mutex mutex_;
  std::deque<Kept> kept_;  // the oldest first
  std::size_t directories_ = 0;
};

}  // namespace mirabel
