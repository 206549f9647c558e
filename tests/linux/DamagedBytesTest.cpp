#include <algorithm>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <map>
#include <random>
#include <set>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include "linux/KilledProcess.h"
#include "linux/VolumeFixture.h"
#include "linux/volume/Database.h"
#include "linux/volume/PageSums.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

std::string bytesOf(const std::string& file) {
  std::ifstream in(file, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), {}};
}

void setBytes(const std::string& file, std::string_view bytes) {
  std::ofstream out(file, std::ios::binary | std::ios::trunc);
  out << bytes;
}

using PageSums = VolumeFixture;

// Every single byte of a database file: it is found out, or it is of no page that is used.
TEST_F(PageSums, NoByteOfADatabaseChangesUnnoticed) {
  const std::string file = base_ + "/sums.db";
  const auto rows = [&]() -> Result<std::string> {
    auto database = Database::open(file);
    if (!database) return fail(database.error());
    auto statement = (*database)->prepare("SELECT text FROM t ORDER BY id");
    if (!statement) return fail(statement.error());
    StatementScope scope(*statement);
    std::string all;
    while (true) {
      auto found = statement->step();
      if (!found) return fail(found.error());
      if (!*found) return all;
      all += statement->blob(0);
    }
  };
  {
    auto database = std::move(Database::open(file).value());
    ASSERT_TRUE(
        database->execute("CREATE TABLE t(id INTEGER PRIMARY KEY, text BLOB);"
                          "INSERT INTO t VALUES(1, 'a name'), (2, zeroblob(500))"));
    ASSERT_TRUE(database->checkpoint(Database::Log::emptied));
  }
  ASSERT_EQ(fs::file_size(file), 2 * databasePageSize);
  const std::string right = rows().value();
  const int descriptor = ::open(file.c_str(), O_RDWR | O_CLOEXEC);
  for (std::size_t i = 0; i < 2 * databasePageSize; ++i) {
    char byte = 0;
    ASSERT_EQ(::pread(descriptor, &byte, 1, static_cast<off_t>(i)), 1);
    const char damaged = static_cast<char>(byte ^ (1 << (i % 8)));
    ASSERT_EQ(::pwrite(descriptor, &damaged, 1, static_cast<off_t>(i)), 1);
    const auto found = rows();
    ASSERT_FALSE(found) << "byte " << i;
    ASSERT_TRUE(found.error().code == SQLITE_CORRUPT || found.error().code == SQLITE_NOTADB)
        << "byte " << i << ": " << found.error().description();
    ASSERT_EQ(::pwrite(descriptor, &byte, 1, static_cast<off_t>(i)), 1);
  }
  ::close(descriptor);
  EXPECT_EQ(rows().value(), right);
}

/// A volume's state with a history in it, which can be damaged and mended any number of times.
class DamagedBytes : public VolumeFixture {
 protected:
  std::string file(const std::string& name) const { return volumeFolder() + "/" + name; }

  void makeTree() {
    makeFolder("folder");
    for (int i = 0; i < 12; ++i)
      write("folder/doc" + std::to_string(i));
    anchor_ = index().currentEventID().value();
    history_ = index().historyUUID();
  }
  void change() {
    run("write tmp new; mv tmp folder/doc1; write tmp new; mv tmp folder/doc2; "
        "mv folder/doc3 moved; rm folder/doc4; mkdir folder/inner");
    index().currentEventID().value();
  }

  /// Remembers the files as they are, and what is right.
  void keep() {
    for (const auto& entry : fs::directory_iterator(volumeFolder())) {
      files_[entry.path().filename()] = bytesOf(entry.path());
    }
    // The witness knows its own file.
    ASSERT_EQ(::link(file("witness").c_str(), (base_ + "/witness").c_str()), 0);
    right_ = told();
    for (const Sighting& sighting : list("folder"))
      identities_[sighting.name] = sighting.documentID;
    ASSERT_FALSE(right_.empty());
  }

  void mend() {
    close();
    for (const auto& entry : fs::directory_iterator(volumeFolder()))
      if (!files_.contains(entry.path().filename())) fs::remove(entry.path());
    fs::remove(file("witness"));
    ASSERT_EQ(::link((base_ + "/witness").c_str(), file("witness").c_str()), 0);
    for (const auto& [name, bytes] : files_)
      setBytes(file(name), bytes);
  }

  /// What is told after the anchor; nothing when it is refused.
  std::vector<std::string> told() {
    std::vector<std::string> lines;
    if (index().historyUUID() != history_) return lines;
    EXPECT_TRUE(index().currentEventID());
    const auto records = index().events(anchor_, 1000);
    if (!records) {
      EXPECT_TRUE(records.error().isPosix(ESTALE)) << records.error().description();
      return lines;
    }
    lines.emplace_back("a delta");
    for (const JournalRecord& record : *records) {
      lines.push_back(std::to_string(record.id) + " " + record.path + " " +
                      std::to_string(record.fileID) + " " + std::to_string(record.documentID) +
                      " " + std::to_string(record.source) + " " +
                      std::to_string(record.destination) + " " + std::to_string(record.folder));
    }
    return lines;
  }

  void expectRightOrStartOver(const std::string& what) {
    SCOPED_TRACE(what);
    const auto lines = told();
    if (lines.empty()) {
      ++startedOver_;
    } else {
      ++keptRight_;
      EXPECT_EQ(lines, right_);
    }
    for (const Sighting& sighting : list("folder")) {
      if (sighting.documentID == 0) continue;
      // Its own, or one that nothing had before.
      const bool isOwn = identities_.at(sighting.name) == sighting.documentID;
      const bool isAnother = std::ranges::any_of(
          identities_, [&](const auto& known) { return known.second == sighting.documentID; });
      EXPECT_TRUE(isOwn || (lines.empty() && !isAnother)) << sighting.name;
    }
  }

  /// Changes bytes of the file: its beginning, some of each piece behind the header, and some of
  /// the rest.
  void damageBytes(const std::string& name, std::size_t header, std::size_t piece) {
    const std::size_t size = files_.at(name).size();
    std::set<std::size_t> offsets;
    for (std::size_t i = 0; i < std::min<std::size_t>(size, 32); ++i)
      offsets.insert(i);
    std::mt19937_64 random(seedOr(7));
    for (std::size_t start = header; start < size; start += piece)
      offsets.insert(std::min(size - 1, start + random() % 24));
    for (int i = 0; i < 60; ++i)
      offsets.insert(random() % size);
    for (const std::size_t offset : offsets) {
      mend();
      std::string bytes = files_.at(name);
      bytes[offset] = static_cast<char>(bytes[offset] ^ (1 + static_cast<int>(offset % 255)));
      setBytes(file(name), bytes);
      expectRightOrStartOver(name + ", byte " + std::to_string(offset));
      if (HasFailure()) return;
    }
  }
  /// Cuts it off everywhere between pieces, and within them.
  void cut(const std::string& name, std::size_t header, std::size_t piece) {
    const std::size_t whole = files_.at(name).size();
    std::set<std::size_t> sizes{0, header};
    for (std::size_t start = header + piece; start <= whole; start += piece)
      sizes.insert({start - 1, start - piece / 2, start});
    sizes.erase(whole);
    for (const std::size_t size : sizes) {
      mend();
      fs::resize_file(file(name), size);
      expectRightOrStartOver(name + ", cut to " + std::to_string(size));
      if (HasFailure()) return;
    }
  }

  UUID history_;
  std::uint64_t anchor_ = 0;
  std::map<std::string, std::string> files_;
  std::vector<std::string> right_;
  std::map<std::string, std::uint32_t> identities_;
  int startedOver_ = 0;
  int keptRight_ = 0;
};

constexpr std::size_t frameSize = databasePageSize + 24;
constexpr std::size_t logHeaderSize = 32;

TEST_F(DamagedBytes, OfAClosedStateGiveTheRightChangesOrStartOver) {
  makeTree();
  change();
  close();
  keep();
  for (const auto& [name, piece] :
       {std::pair{"volume.db", databasePageSize}, std::pair{"witness", std::size_t{8}}}) {
    damageBytes(name, 0, piece);
    cut(name, 0, piece);
  }
  EXPECT_EQ(keptRight_, 0) << "no byte is without use";
  mend();
  expectRightOrStartOver("mended");
  EXPECT_EQ(keptRight_, 1);
}

TEST_F(DamagedBytes, OfAKilledProcessGiveTheRightChangesOrStartOver) {
  makeTree();
  close();
  {
    KilledProcess process([this](const KilledProcess::Self& self) {
      change();
      self.say("done");
    });
    ASSERT_EQ(process.line(), "done");
  }
  keep();
  damageBytes("volume.db-wal", logHeaderSize, frameSize);
  cut("volume.db-wal", logHeaderSize, frameSize);
  const int startedOver = startedOver_;
  EXPECT_GT(startedOver, 0);
  // What the log holds as well is not read from the database.
  damageBytes("volume.db", 0, databasePageSize);
  cut("volume.db", 0, databasePageSize);
  EXPECT_GT(startedOver_, startedOver);
  EXPECT_GT(keptRight_, 0);
}

// The file looks untouched: what is wrong shows when it is read, and no later than that.
TEST_F(DamagedBytes, ThatLeaveTheTimesOfTheFileAloneAreNotBelieved) {
  makeTree();
  change();
  close();
  keep();
  const std::string database = file("volume.db");
  const std::size_t size = files_.at("volume.db").size();
  for (std::size_t page = 0; page < size / databasePageSize; ++page) {
    mend();
    struct stat before {};
    ASSERT_EQ(::stat(database.c_str(), &before), 0);
    // As it is when the witness was written of just this file.
    index();
    close();
    ASSERT_EQ(::stat(database.c_str(), &before), 0);
    std::string bytes = bytesOf(database);
    bytes[page * databasePageSize + 1000] ^= 0x10;
    setBytes(database, bytes);
    const timespec times[] = {before.st_atim, before.st_mtim};
    ASSERT_EQ(::utimensat(AT_FDCWD, database.c_str(), times, 0), 0);
    auto opened = tryOpen();
    ASSERT_TRUE(opened);
    if ((*opened)->historyUUID() == history_ && (*opened)->currentEventID()) {
      const auto records = (*opened)->events(anchor_, 1000);
      if (records) {
        EXPECT_EQ(records->size() + 1, right_.size()) << "page " << page;
      }
    }
    opened->reset();
    // The first that meets it fails, and leaves word for the next.
    const auto isMet = [&] {
      if (!index().currentEventID()) return true;
      return std::ranges::any_of(identities_, [&](const auto& known) {
        const std::string place = "folder/" + known.first;
        const auto seen = statusOf(path(place));
        return seen && !index().learnPath(path(place), *seen, false);
      });
    };
    if (isMet()) close();
    expectRightOrStartOver("page " + std::to_string(page));
  }
  EXPECT_GT(startedOver_, 0);
}

}  // namespace
}  // namespace mirabel
