#include <cerrno>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "linux/volume/StoredListingPositions.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

class StoredListingPositionsTest : public ::testing::Test {
 protected:
  static Data bytes(std::string_view text) { return dataFromString(text); }
  /// As the next process finds them.
  std::optional<Data> found(std::string_view container, std::string_view cursor) {
    return StoredListingPositions(folder).find(container, bytes(cursor));
  }
  std::string contents() {
    std::ifstream file(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(file), {});
  }
  void setContents(const std::string& text) {
    std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
  }

  TempHome home;
  StateFolder folder = StateFolder::acquire(home.stateFolder(), UUID::random(),
                                            std::chrono::milliseconds(0), nullptr)
                           .value();
  const std::string path = folder.file("listings");
};

TEST_F(StoredListingPositionsTest, AreFoundByTheNextProcess) {
  EXPECT_FALSE(found("a", "1"));
  EXPECT_FALSE(std::filesystem::exists(path)) << "nothing is made by looking";
  StoredListingPositions positions(folder);
  for (const std::string_view value : {"old", "\x01\xff"}) {
    ASSERT_TRUE(positions.keep("a", bytes("1"), bytes(value)));
    EXPECT_EQ(found("a", "1"), bytes(value));
  }
  ASSERT_TRUE(positions.keep("", {}, {}));
  EXPECT_EQ(found("", ""), Data{});
  EXPECT_FALSE(found("a1", ""));
  struct stat status {};
  ASSERT_EQ(::stat(path.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777, 0600u);
}

TEST_F(StoredListingPositionsTest, NewOnesTakeThePlaceOfTheOldest) {
  StoredListingPositions positions(folder);
  constexpr std::size_t one = StoredListingPositions::mostOfOne;
  constexpr std::size_t all = StoredListingPositions::slotCount;
  ASSERT_TRUE(positions.keep("quiet", bytes("0"), bytes("q")));
  // A long listing takes nothing from the others.
  for (std::size_t i = 0; i < 2 * all; ++i)
    ASSERT_TRUE(positions.keep("busy", bytes(std::to_string(i)), bytes("b")));
  EXPECT_TRUE(found("quiet", "0"));
  for (std::size_t i = 0; i < 2 * all; ++i)
    EXPECT_EQ(found("busy", std::to_string(i)).has_value(), i >= 2 * all - one) << i;
  // Many do, the oldest first. The order is known after a restart too.
  StoredListingPositions later(folder);
  for (std::size_t i = 0; i < all - one; ++i)
    ASSERT_TRUE(later.keep(std::to_string(i), bytes("0"), bytes("m")));
  EXPECT_FALSE(found("quiet", "0"));
  EXPECT_TRUE(found("busy", std::to_string(2 * all - one)));
  EXPECT_TRUE(found("0", "0"));
}

TEST_F(StoredListingPositionsTest, ThatAreTooLargeAreRefused) {
  StoredListingPositions positions(folder);
  ASSERT_TRUE(positions.keep("a", bytes("1"), bytes("small")));
  const auto refused = positions.keep("a", bytes("1"), Data(StoredListingPositions::slotSize));
  EXPECT_TRUE(!refused && refused.error().isPosix(EMSGSIZE));
  EXPECT_EQ(found("a", "1"), bytes("small"));
}

TEST_F(StoredListingPositionsTest, DamagedOnesAreForgottenAndNoOther) {
  ASSERT_TRUE(StoredListingPositions(folder).keep("first", bytes("1"), bytes("one")));
  ASSERT_TRUE(StoredListingPositions(folder).keep("second", bytes("2"), bytes("two")));
  const std::string good = contents();
  const std::size_t size = 36 + std::string("first1one").size();
  for (std::size_t i = 0; i < size; ++i) {
    std::string low = good, high = good;
    low[i] = static_cast<char>(low[i] ^ 1);
    high[i] = static_cast<char>(high[i] ^ 0x80);
    // A write that was cut short by a power failure.
    std::string torn = good;
    torn.replace(i, size - i, size - i, '\0');
    for (const std::string& damaged : {low, high, torn}) {
      setContents(damaged);
      EXPECT_FALSE(found("first", "1")) << i;
      EXPECT_EQ(found("second", "2"), bytes("two")) << i;
    }
  }
}

TEST_F(StoredListingPositionsTest, AFileOfAnotherFormIsReplaced) {
  StoredListingPositions(folder).keep("a", bytes("1"), bytes("old")).value();
  const std::string good = contents();
  const auto replaced = [&] {
    EXPECT_FALSE(found("a", "1"));
    EXPECT_TRUE(StoredListingPositions(folder).keep("b", bytes("2"), bytes("new")));
    EXPECT_EQ(found("b", "2"), bytes("new"));
  };
  for (const std::string& form :
       {std::string(), good.substr(1), good + '\0', good.substr(0, good.size() / 2)}) {
    setContents(form);
    replaced();
  }
  std::filesystem::rename(path, home.path() + "/elsewhere");
  setContents(good);
  std::filesystem::remove(path);
  std::filesystem::create_symlink(home.path() + "/elsewhere", path);
  replaced();
}

}  // namespace
}  // namespace mirabel::testing
