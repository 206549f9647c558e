#pragma once

#include <string>

namespace mirabel {

enum class Health { good, limited, bad };

/// One line of the doctor's: what was looked at, how it is, and how to mend it where it can be
/// mended. The text says what is missing and what works all the same; both are one line in lower
/// case without a full stop.
struct Finding {
  std::string subject;
  Health health;
  std::string text;
  std::string remedy;
};

}  // namespace mirabel
