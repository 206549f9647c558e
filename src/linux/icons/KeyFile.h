#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "mirabel/Error.h"

namespace mirabel {

/// A file of groups, keys and values, as desktops use for their entries and themes. Used by one
/// thread at a time.
class KeyFile {
 public:
  /// POSIX errors: those of `readBoundedFile`; EILSEQ for what is no file of this kind.
  [[nodiscard]] static Result<KeyFile> read(const std::string& path, std::size_t limit);
  /// The same for what such a file holds.
  [[nodiscard]] static Result<KeyFile> parse(std::string_view text);
  ~KeyFile();
  KeyFile(KeyFile&&) noexcept;
  KeyFile& operator=(KeyFile&&) noexcept;

  /// Nothing for a key that is not there or whose value is not UTF-8, or no whole number.
  [[nodiscard]] std::optional<std::string> text(const std::string& group, const char* key) const;
  [[nodiscard]] std::optional<int> number(const std::string& group, const char* key) const;
  /// The parts of a value between the commas, without the blanks around them; at most `most`.
  [[nodiscard]] std::vector<std::string> list(const std::string& group, const char* key,
                                              std::size_t most) const;

 private:
  struct Parsed;
  explicit KeyFile(std::unique_ptr<Parsed> parsed);
  std::unique_ptr<Parsed> parsed_;
};

}  // namespace mirabel
