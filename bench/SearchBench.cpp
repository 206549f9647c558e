// A working set of 100,000 documents in folders of a thousand, named as people name them: two to
// four words, half of them from a few that everybody uses, half from a thousand others, and most
// with a number. What the search index costs beside the listing that it is made from, which reads
// all of these documents anyway; and how long a person waits for an answer. Words that many names
// have are the worst case of an index of parts of words, so they stand beside rare ones; so do
// parts of words, and two that never come together. Two letters inside words are in no index: every
// row is compared.
#include <array>
#include <cstdint>
#include <fcntl.h>
#include <filesystem>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "BenchHome.h"
#include "host/HostedProvider.h"
#include "host/search/SearchFeeder.h"
#include "host/search/SearchIndex.h"

namespace mirabel::bench {
namespace {

constexpr const char* feedRow = "search index from nothing / listing the working set";
constexpr const char* rareRow = "search for two words, one of them rare / 5 ms";
constexpr const char* commonRow = "search for two common words / 5 ms";
constexpr const char* partsRow = "search for parts of two common words / 5 ms";
constexpr const char* apartRow = "search for common words never together / 5 ms";
constexpr const char* scanRow = "search for two letters that no name has / 100 ms";
constexpr const char* changeRow = "search index brought forward by 100 changes / listing";
constexpr double promised = 0.005;
constexpr std::size_t questionsOfRound = 20;
constexpr std::size_t folderSize = 1000;

constexpr std::array<std::string_view, 40> commonWords = {
    "annual",  "report",  "budget",  "holiday",  "invoice", "meeting",  "notes",   "draft",
    "photo",   "garden",  "project", "plan",     "letter",  "contract", "summary", "travel",
    "kitchen", "music",   "lesson",  "chapter",  "family",  "school",   "recipe",  "final",
    "review",  "design",  "sketch",  "archive",  "minutes", "tax",      "house",   "bank",
    "order",   "receipt", "manual",  "schedule", "survey",  "results",  "journal", "story"};
constexpr std::array<std::string_view, 4> endings = {".pdf", ".txt", ".odt", ".jpg"};

/// A word of no language, the same for the same number.
std::string rareWord(std::size_t number) {
  constexpr std::string_view consonants = "bdfgklmnprstvz";
  constexpr std::string_view vowels = "aeiou";
  std::minstd_rand random(static_cast<std::uint_fast32_t>(number + 1));
  std::string word;
  for (std::size_t i = 0; i < 3; ++i) {
    word += consonants[random() % consonants.size()];
    word += vowels[random() % vowels.size()];
  }
  return word + consonants[number % consonants.size()];
}

std::string documentName(std::size_t number, std::mt19937& random) {
  std::string name;
  const std::size_t words = 2 + random() % 3;
  for (std::size_t i = 0; i < words; ++i) {
    std::string word = random() % 2 == 0 ? std::string(commonWords[random() % commonWords.size()])
                                         : rareWord(random() % 1000);
    if (i == 0) word[0] = static_cast<char>(word[0] - 'a' + 'A');
    name += (i == 0 ? "" : " ") + word;
  }
  return name + " " + std::to_string(number) + std::string(endings[random() % endings.size()]);
}

void writeFile(const std::string& path) {
  const int file = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  require(file >= 0, "a file can be made");
  ::close(file);
}

std::vector<std::string> makeDocuments(const BenchHome& home, std::size_t count) {
  std::mt19937 random(1);
  std::vector<std::string> files;
  for (std::size_t i = 0; i < count; ++i) {
    const std::string folder = home.documents() + "/Folder " + std::to_string(i / folderSize);
    if (i % folderSize == 0) std::filesystem::create_directory(folder);
    files.push_back(folder + "/" + documentName(i, random));
    writeFile(files.back());
  }
  return files;
}

class Counting final : public VesselEnumerationObserver {
 public:
  void didEnumerateItems(const VesselItems& items) override { count += items.size(); }
  void finishEnumeratingUpToPage(const std::optional<Data>& page) override { next = page; }
  void finishEnumeratingWithError(const Error&) override { require(false, "a page is listed"); }

  std::size_t count = 0;
  std::optional<Data> next;
};

std::size_t list(VesselEnumerator& workingSet) {
  Counting pages;
  Data page = dataFromString(VesselInitialPageSortedByName);
  do {
    workingSet.enumerateItems(pages, page);
    if (pages.next) page = *pages.next;
  } while (pages.next);
  return pages.count;
}

/// The home's working set, with an index that is made for the first time in each round.
class Searched {
 public:
  explicit Searched(const BenchHome& home) : folder_(home.path() + "/index") {
    LinuxPlatform::Options options;
    options.home = home.path();
    provider_ = HostedProvider::open(std::move(options)).value();
    enumerator_ = provider_->vessel()
                      .enumeratorForContainerItemIdentifier(VesselWorkingSetContainerItemIdentifier)
                      .value();
  }

  [[nodiscard]] VesselEnumerator& workingSet() { return *enumerator_; }
  [[nodiscard]] SearchIndex& index() { return *index_; }
  void beginIndex() {
    index_.reset();
    std::filesystem::remove_all(folder_);
    std::filesystem::create_directory(folder_);
    index_ = SearchIndex::open(folder_).value();
  }
  void catchUp() {
    require(SearchFeeder(*index_).catchUp(*enumerator_).has_value(), "the index is fed");
  }

 private:
  std::string folder_;
  std::unique_ptr<HostedProvider> provider_;
  std::shared_ptr<VesselEnumerator> enumerator_;
  std::unique_ptr<SearchIndex> index_;
};

void benchFeed(Searched& searched, const std::vector<std::string>& files, const Scale& scale) {
  Comparison feed{feedRow, {}, {}, 2.0};
  Comparison change{changeRow, {}, {}, 0.1};
  const std::size_t items = list(searched.workingSet());  // every round finds the items known
  require(items == files.size() + (files.size() + folderSize - 1) / folderSize, "all are listed");
  for (int round = 0; round < scale.rounds; ++round) {
    const double listing =
        secondsOf([&] { require(list(searched.workingSet()) == items, "all are listed again"); });
    searched.beginIndex();
    feed.reference.push_back(listing);
    feed.ours.push_back(secondsOf([&] { searched.catchUp(); }));
    require(searched.index().count().value() == items, "all are in the index");
    for (std::size_t i = 0; i < 100; ++i)
      writeFile(files[i * files.size() / 100]);
    change.reference.push_back(listing);
    change.ours.push_back(secondsOf([&] { searched.catchUp(); }));
    require(searched.index().count().value() == items, "none is there twice");
  }
  for (const Comparison* comparison : {&feed, &change})
    if (scale.includes(comparison->name)) print(*comparison);
}

struct Question {
  const char* row;
  std::vector<std::string> words;
  double bound = promised;
};

/// Each question with other words each time: what the first of them left in memory is no help.
Question ask(const char* row, std::size_t number) {
  const auto common = [&](std::size_t i) {
    return std::string(commonWords[(number * 7 + i) % commonWords.size()]);
  };
  const auto part = [&](std::size_t i) { return common(i).substr(1, 4).substr(0, 3); };
  if (row == rareRow) return {row, {common(0), rareWord(number * 31 % 1000)}};
  if (row == commonRow) return {row, {common(0), common(1)}};
  if (row == partsRow) return {row, {part(0), part(1)}};
  // Nobody has a name that ends in both.
  if (row == apartRow) return {row, {"pdf", number % 2 == 0 ? "odt" : "jpg"}};
  return {row, {number % 2 == 0 ? "qx" : "xq"}, 20 * promised};
}

void benchQuestions(Searched& searched, const Scale& scale) {
  for (const char* row : {rareRow, commonRow, partsRow, apartRow, scanRow}) {
    if (!scale.includes(row)) continue;
    Comparison comparison{row, {}, {}, 1.0};
    std::size_t found = 0;
    for (std::size_t i = 0; i < static_cast<std::size_t>(scale.rounds) * questionsOfRound; ++i) {
      const Question question = ask(row, i);
      SearchQuery query;
      query.words = question.words;
      comparison.ours.push_back(
          secondsOf([&] { found += searched.index().search(query).value().size(); }));
      comparison.reference.push_back(question.bound);
    }
    const bool findsNone = row == apartRow || row == scanRow;
    require(findsNone == (found == 0), "there is an answer where there has to be one");
    print(comparison);
  }
}

}  // namespace

void runSearchBenchmarks(const Scale& scale) {
  if (!scale.includesAny({feedRow, changeRow, rareRow, commonRow, partsRow, apartRow, scanRow})) {
    return;
  }
  const BenchHome home(BenchHome::Where::memory);
  const auto files = makeDocuments(home, scale.files);
  Searched searched(home);
  printHeading(std::to_string(files.size()) + " documents to search, median of " +
               std::to_string(scale.rounds) + " rounds");
  if (scale.includesAny({feedRow, changeRow})) {
    benchFeed(searched, files, scale);
  } else {
    searched.beginIndex();
    searched.catchUp();
  }
  benchQuestions(searched, scale);
}

}  // namespace mirabel::bench
