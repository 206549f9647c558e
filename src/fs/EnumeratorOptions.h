#pragma once

#include <cstdint>
#include <initializer_list>

namespace mirabel {

/// Which entries a walk leaves out: a set of bits.
struct EnumeratorOptions {
  std::int64_t rawValue = 0;

  static const EnumeratorOptions skipsHiddenFiles;              // 1
  static const EnumeratorOptions skipsPackageDescendants;       // 2
  static const EnumeratorOptions skipsSubdirectoryDescendants;  // 4

  constexpr EnumeratorOptions() = default;
  constexpr explicit EnumeratorOptions(std::int64_t raw) : rawValue(raw) {}
  constexpr EnumeratorOptions(std::initializer_list<EnumeratorOptions> options) {
    for (const EnumeratorOptions& option : options)
      rawValue |= option.rawValue;
  }

  [[nodiscard]] constexpr bool contains(EnumeratorOptions o) const {
    return (rawValue & o.rawValue) == o.rawValue;
  }
  [[nodiscard]] constexpr bool isEmpty() const { return rawValue == 0; }
  [[nodiscard]] constexpr EnumeratorOptions unionWith(EnumeratorOptions o) const {
    return EnumeratorOptions(rawValue | o.rawValue);
  }
  friend constexpr bool operator==(EnumeratorOptions, EnumeratorOptions) = default;
};

inline constexpr EnumeratorOptions EnumeratorOptions::skipsHiddenFiles{1};
inline constexpr EnumeratorOptions EnumeratorOptions::skipsPackageDescendants{2};
inline constexpr EnumeratorOptions EnumeratorOptions::skipsSubdirectoryDescendants{4};

}  // namespace mirabel
