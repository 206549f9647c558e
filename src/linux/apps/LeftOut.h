#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace mirabel {

/// What a registry does not tell of, or not all of, and why, for a person to read.
struct LeftOut {
  std::string identifier;  ///< as the entry has it, so any bytes; a directory where it is about one
  std::string reason;

  friend bool operator==(const LeftOut&, const LeftOut&) = default;
};

/// The first of what was left out, and how many there were beyond it.
class LeftOutList {
 public:
  static constexpr std::size_t mostNamed = 1000;

  void add(std::string_view identifier, std::string_view reason) {
    if (named_.size() < mostNamed) {
      named_.push_back({std::string(identifier), std::string(reason)});
    } else {
      ++beyond_;
    }
  }
  /// With what is beyond as a last one, without an identifier.
  [[nodiscard]] std::vector<LeftOut> items() const {
    std::vector<LeftOut> result = named_;
    if (beyond_ > 0) result.push_back({"", "and " + std::to_string(beyond_) + " more"});
    return result;
  }

 private:
  std::vector<LeftOut> named_;
  std::size_t beyond_ = 0;
};

}  // namespace mirabel
