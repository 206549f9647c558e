#include <gtest/gtest.h>
#include <string>

#include "linux/operations/ItemNames.h"

namespace mirabel::testing {
namespace {

TEST(ItemNames, AnotherNameKeepsTheExtension) {
  struct Row {
    const char* name;
    NameOf kind;
    const char* second;
  };
  constexpr Row rows[] = {
      {"report.txt", NameOf::file, "report 2.txt"},
      {"report", NameOf::file, "report 2"},
      {"backup.tar.gz", NameOf::file, "backup 2.tar.gz"},
      {".tar.gz", NameOf::file, ".tar 2.gz"},
      {".hidden", NameOf::file, ".hidden 2"},
      {"...", NameOf::file, "... 2"},
      {"v1.2", NameOf::plainFolder, "v1.2 2"},
      {"letter.quill", NameOf::file, "letter 2.quill"},
      {"ends.", NameOf::file, "ends 2."},
      {"a. long sentence that has a full stop near its beginning", NameOf::file,
       "a. long sentence that has a full stop near its beginning 2"},
      {"100%.txt\n", NameOf::file, "100% 2.txt\n"},
      {"\xFF\xFE.txt", NameOf::file, "\xFF\xFE 2.txt"},
  };
  for (const Row& row : rows)
    EXPECT_EQ(numberedName(row.name, 2, row.kind), row.second) << row.name;
}

TEST(ItemNames, AnotherNameIsNeverTooLongAndIsNotCutWithinACharacter) {
  EXPECT_EQ(numberedName(std::string(251, 'x') + ".txt", 10, NameOf::file),
            std::string(248, 'x') + " 10.txt");
  std::string umlauts;
  while (umlauts.size() < 254)
    umlauts += "\xC3\xA4";
  const std::string cut = numberedName(umlauts + "x", 2, NameOf::file);
  EXPECT_EQ(cut, umlauts.substr(0, 252) + " 2");
}

}  // namespace
}  // namespace mirabel::testing
