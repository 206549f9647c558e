#include <atomic>
#include <fcntl.h>
#include <map>
#include <thread>

#include "linux/VolumeFixture.h"
#include "linux/kernel/RawDirectory.h"
#include "linux/volume/ObjectMatcher.h"

namespace mirabel {
namespace {

using IdentityRaces = VolumeFixture;

Result<void> learnIn(VolumeIndex& index, const std::string& folder, std::span<Sighting> sightings) {
  const UniqueFd opened(::open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  auto learned = index.learn(folder, opened.get(), sightings);
  return learned ? Result<void>() : Result<void>(fail(learned.error()));
}

// A thread looks at a name and then has to wait for the index, while others look later and say so
// first.
TEST_F(IdentityRaces, ALookThatComesLateTurnsNothingBack) {
  age_ = 1'000'000'000;
  write("doc");
  const Sighting before = see("doc");
  Sighting late{"doc", status("doc")};
  run("write tmp; mv tmp doc");
  const Sighting saved = see("doc");
  ASSERT_EQ(saved.documentID, before.documentID);

  ASSERT_TRUE(learnIn(index(), documents_, {&late, 1}));
  EXPECT_EQ(late.documentID, before.documentID);
  EXPECT_EQ(late.fileID, saved.fileID);
  EXPECT_EQ(late.status.inode, inode("doc"));
  run("write tmp; mv tmp doc");
  EXPECT_EQ(findDocument(before.documentID), "doc");
}

TEST_F(IdentityRaces, WhatWentAwayAfterItWasSeenHasNoIdentity) {
  run("mkdir known; look known; mv known moved; mkdir unknown");
  Sighting gone[] = {{"moved", status("moved")}, {"unknown", status("unknown")}};
  run("rm moved; rm unknown");
  ASSERT_TRUE(learnIn(index(), documents_, gone));
  EXPECT_EQ(gone[0].fileID, 0u);
  EXPECT_EQ(gone[1].fileID, 0u);
}

// Its time may be that of the next object with its number: only the time of the look can tell, not
// the time at which the index hears of it.
TEST_F(IdentityRaces, AFreshTimeStaysUnsettledHoweverLateItIsNoted) {
  write("doc");
  ObjectStatus status = this->status("doc");
  status.seenAt = status.changeTime + 1'000'000;
  ObjectRow row;
  refresh(row, status);
  EXPECT_FALSE(row.isSettled);
  status.seenAt = status.changeTime + 4 * nanosecondsPerSecond;
  EXPECT_TRUE(isStale(row, status));
  refresh(row, status);
  EXPECT_TRUE(row.isSettled);
}

class Editors : public VolumeFixture {
 protected:
  static constexpr int editorCount = 2, documentCount = 4, saveCount = 100;

  static std::string name(int editor, int number) {
    return (number % 2 == 0 ? "doc" : "folder/doc") + std::to_string(editor) +
           std::to_string(number);
  }

  void listUntilDone(const std::string& folder) {
    while (!done_) {
      RawDirectory directory(UniqueFd(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)));
      std::vector<Sighting> sightings;
      while (auto entry = directory.next().value()) {
        const std::string name(entry->name);
        auto status = statusAt(directory.descriptor(), name);
        if (name != "." && name != ".." && status) sightings.push_back({name, *status});
      }
      EXPECT_TRUE(index().learn(folder, directory.descriptor(), sightings));
    }
  }

  void edit(int editor) {
    for (int i = 0; i < saveCount; ++i) {
      const std::string document = name(editor, i % documentCount);
      const std::string temporary = document + ".tmp";
      if (i % 3 == 0) rename(document, document + "~");
      write(i % 3 == 0 ? document : temporary, "new");
      if (i % 3 != 0) rename(temporary, document);
      EXPECT_EQ(this->document(document), documents_of_[document]) << i;
    }
  }

  std::map<std::string, std::uint32_t> documents_of_;
  std::atomic<bool> done_ = false;
};

TEST_F(Editors, KeepTheirDocumentsWhileOthersListThem) {
  makeFolder("folder");
  for (int editor = 0; editor < editorCount; ++editor) {
    for (int i = 0; i < documentCount; ++i) {
      write(name(editor, i));
      documents_of_[name(editor, i)] = document(name(editor, i));
    }
  }
  std::vector<std::jthread> listers;
  for (const std::string& folder : {documents_, path("folder")})
    listers.emplace_back([this, folder] { listUntilDone(folder); });
  {
    std::vector<std::jthread> editors;
    for (int editor = 0; editor < editorCount; ++editor)
      editors.emplace_back([this, editor] { edit(editor); });
  }
  done_ = true;
  listers.clear();
  for (const auto& [name, id] : documents_of_)
    EXPECT_EQ(findDocument(id), name);
}

}  // namespace
}  // namespace mirabel
