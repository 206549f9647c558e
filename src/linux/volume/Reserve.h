#pragma once

#include "linux/volume/StateFolder.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Room on the disk that is given up when there is none left: the file "reserve" in the volume's
/// state folder. Whoever wants to delete something on a full disk has to name it first, and what an
/// answer needs must be on disk before it is given. Used under the lock of the index.
class Reserve {
 public:
  /// `folder` outlives it.
  explicit Reserve(const StateFolder& folder) : folder_(folder) {}

  /// Takes the room where it is not taken yet. Where there is none to take, there is no reserve.
  void make() const;
  /// Gives the room up after that failure, if it is for want of room; whether there was any to
  /// give.
  [[nodiscard]] bool releaseAfter(const Error& failure) const;

 private:
  const StateFolder& folder_;
};

}  // namespace mirabel
