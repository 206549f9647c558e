#include <array>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <sys/mman.h>
#include <unistd.h>

#include "cli/InstalledApps.h"
#include "host/bus/BusClient.h"
#include "host/bus/Confined.h"
#include "host/bus/ServiceFixture.h"
#include "mirabel/UniqueFd.h"
#include "platform/VesselManager.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

const std::string itself = "org.example.One";
const std::string another = "org.example.Two";
const std::string infoOfOne = "[Application]\nname=org.example.One\n";
const std::string accessDenied = "org.freedesktop.DBus.Error.AccessDenied";
const std::string noAccess = "com.norvane.Vessel1.Error.POSIX.EACCES";
const std::string noSuchItem = "com.norvane.Vessel1.Error.NoSuchItem";
const Data nothing;
const BusOptions noOptions;
const std::vector<std::string> words{"doc"};

std::vector<std::string> namesOf(const std::vector<ItemRecord>& items) {
  std::vector<std::string> names;
  for (const ItemRecord& item : items) {
    EXPECT_EQ(item.path, "") << item.filename;
    EXPECT_EQ(item.putBackPath, std::nullopt) << item.filename;
    names.push_back(item.filename);
  }
  return names;
}

class Sandboxed : public ServiceFixture {
 protected:
  void SetUp() override {
    ServiceFixture::SetUp();
    if (IsSkipped()) return;
    if (!inSandbox("", [](BusClient&) {})) GTEST_SKIP() << "no root of its own can be had";
    home.writeFile("private doc", "secret");
    for (const std::string& bundle : {itself, another}) {
      apps.install(bundle, bundle.substr(12));
      apps.write(bundle, "doc of " + bundle.substr(12), "text");
    }
    fs::create_directory(at("folder"));
    for (const char* name : {"stays", "leaves", "goes"})
      apps.write(itself, std::string("folder/") + name, name);
    serve();
    outside = std::make_unique<BusClient>();
    for (const std::string& path : {home.at("private doc"), at("doc of One")})
      EXPECT_EQ(
          outside
              ->operations("SetFavoriteRank", outside->idOf(path), sdbus::Variant(std::int64_t{1}))
              .error,
          "");
  }

  std::string at(const std::string& name) const { return apps.documents(itself) + "/" + name; }
  void inOne(const std::function<void(BusClient& client)>& body) const {
    EXPECT_TRUE(inSandbox(infoOfOne, body));
  }

  const InstalledApps apps{home};
  std::unique_ptr<BusClient> outside;
};

TEST_F(Sandboxed, CallersSeeTheirOwnLibraryWithoutPlaces) {
  const std::string document = outside->idOf(at("doc of One"));
  const std::string folder = outside->idOf(at("folder"));
  inOne([&](BusClient& client) {
    EXPECT_THAT(namesOf(client.items(client.provider("ListAppLibraries"))), ElementsAre("One"));
    EXPECT_THAT(namesOf(client.items(client.provider("ListItems", "#" + itself, nothing))),
                UnorderedElementsAre("doc of One", "folder"));
    EXPECT_THAT(namesOf(client.items(client.provider("ListItems", folder, nothing))),
                UnorderedElementsAre("stays", "leaves", "goes"));
    for (const std::string& item : {document, "#" + itself})
      namesOf({client.item(client.provider("GetItem", item))});
    namesOf({client.item(client.provider("GetDefaultContainer", itself))});
    auto opened = client.provider("OpenItem", document, std::string("r"));
    ASSERT_EQ(opened.error, "") << opened.message;
    sdbus::UnixFd file;
    opened.reply >> file;
    std::array<char, 5> text{};
    EXPECT_EQ(::read(file.get(), text.data(), text.size()), 4);
    EXPECT_STREQ(text.data(), "text");
    EXPECT_THAT(namesOf(client.items(client.provider("Search", words, noOptions))),
                ElementsAre("doc of One"));
    EXPECT_THAT(namesOf(client.items(client.provider("GetRecent", std::uint32_t{10}))),
                UnorderedElementsAre("doc of One", "stays", "leaves", "goes"));
    EXPECT_THAT(namesOf(client.items(client.provider("GetFavorites", std::uint32_t{10}))),
                ElementsAre("doc of One"));
  });
}

TEST_F(Sandboxed, CallersAreRefusedWhatIsMadeOfSeveralFoldersAndTheManager) {
  const std::string path = home.at("private doc");
  inOne([&](BusClient& client) {
    for (const std::string_view container :
         {VesselRootContainerItemIdentifier, VesselWorkingSetContainerItemIdentifier,
          VesselAllDirectoriesContainerItemIdentifier}) {
      const std::string name(container);
      EXPECT_EQ(client.provider("ListItems", name, nothing).error, noAccess) << name;
      EXPECT_EQ(client.provider("EnumerateChanges", name, nothing).error, noAccess) << name;
      EXPECT_EQ(client.provider("GetCurrentSyncAnchor", name).error, noAccess) << name;
      EXPECT_EQ(client.provider("Watch", name).error, noAccess) << name;
      EXPECT_EQ(client.provider("GetItem", name).error, noSuchItem) << name;
    }
    const Data bytes = dataFromString(path);
    EXPECT_EQ(client.provider("GetItemAtPath", bytes).error, accessDenied);
    EXPECT_EQ(client.operations("ImportPath", bytes, "#" + itself).error, accessDenied);
    const std::string date = "2100-01-01T00:00:00Z";
    for (const char* method : {"GetStatus", "GetHome", "GetProgress"})
      EXPECT_EQ(client.call(bus::managerInterface, method).error, accessDenied) << method;
    for (const char* method : {"FindTrashedItems", "RemoveTrashedItems"})
      EXPECT_EQ(client.call(bus::managerInterface, method, date).error, accessDenied) << method;
  });
}

TEST_F(Sandboxed, CallersCannotTellWhatIsSomebodyElsesFromWhatIsNotThere) {
  const std::string own = outside->idOf(at("doc of One"));
  const std::vector<std::string> others = {outside->idOf(home.at("private doc")), "#" + another,
                                           outside->idOf(apps.documents(another) + "/doc of Two"),
                                           std::string(VesselRootContainerItemIdentifier)};
  inOne([&](BusClient& client) {
    const UniqueFd file(::memfd_create("imported", 0));
    const sdbus::UnixFd handed(file.get());
    const std::string name = "name";
    using Ask = std::function<BusClient::Answer(const std::string&)>;
    const Ask questions[] = {
        [&](auto& id) { return client.provider("GetItem", id); },
        [&](auto& id) { return client.provider("OpenItem", id, std::string("r")); },
        [&](auto& id) { return client.provider("GetIcon", id, std::uint32_t{16}); },
        [&](auto& id) { return client.operations("Rename", id, name, noOptions); },
        [&](auto& id) { return client.operations("Reparent", id, "#" + itself, noOptions); },
        [&](auto& id) { return client.operations("Reparent", own, id, noOptions); },
        [&](auto& id) { return client.operations("CreateDirectory", name, id, noOptions); },
        [&](auto& id) { return client.operations("ImportDocument", handed, name, id, noOptions); },
        [&](auto& id) { return client.operations("Delete", id, noOptions); },
        [&](auto& id) { return client.operations("Trash", id, noOptions); },
        [&](auto& id) { return client.operations("Restore", id, noOptions); },
        [&](auto& id) {
          return client.operations("Restore", own, BusOptions{{"parent", sdbus::Variant(id)}});
        },
        [&](auto& id) { return client.operations("SetLastUsedDate", id, std::string()); },
        [&](auto& id) { return client.operations("SetTags", id, words); },
        [&](auto& id) { return client.operations("SetTagData", id, nothing); },
        [&](auto& id) { return client.operations("ClearFavoriteRank", id); },
    };
    for (std::size_t i = 0; i < std::size(questions); ++i) {
      const auto missing = questions[i]("did=99999");
      EXPECT_EQ(missing.error, noSuchItem) << i;
      for (const std::string& other : others) {
        const auto answer = questions[i](other);
        EXPECT_EQ(answer.error, missing.error) << i << other;
        EXPECT_EQ(answer.message, missing.message) << i << other;
      }
    }
    const auto missing = client.provider("GetDefaultContainer", std::string("org.example.None"));
    const auto other = client.provider("GetDefaultContainer", another);
    EXPECT_EQ(other.error, missing.error);
    EXPECT_EQ(other.message, missing.message);
  });
  EXPECT_TRUE(fs::exists(home.at("private doc")) && fs::exists(apps.documents(another)));
}

TEST_F(Sandboxed, CallersAreToldThatWhatLeftTheirFolderIsGone) {
  const std::string folder = outside->idOf(at("folder"));
  const std::string leaves = outside->idOf(at("folder/leaves"));
  const std::string goes = outside->idOf(at("folder/goes"));
  const Data anchor = outside->anchorOf(folder);
  fs::rename(at("folder/leaves"), home.at("elsewhere"));
  fs::remove(at("folder/goes"));
  fs::resize_file(at("folder/stays"), 100);
  // Who may see it is told where it is now.
  EXPECT_THAT(outside->changes(outside->provider("EnumerateChanges", folder, anchor)).deleted,
              ElementsAre(goes));
  inOne([&](BusClient& client) {
    const auto changes = client.changes(client.provider("EnumerateChanges", folder, anchor));
    EXPECT_THAT(namesOf(changes.updated), ElementsAre("stays"));
    EXPECT_THAT(changes.deleted, UnorderedElementsAre(leaves, goes));
  });
}

TEST_F(Sandboxed, CallersImportWhatTheyCouldReadAndNothingElse) {
  const std::string file = home.path() + "/imported";
  std::ofstream(file) << "content";
  const UniqueFd reading(::open(file.c_str(), O_RDONLY));
  const UniqueFd place(::open(file.c_str(), O_PATH));
  const UniqueFd writing(::open(file.c_str(), O_WRONLY));
  const UniqueFd folder(::open(home.path().c_str(), O_RDONLY | O_DIRECTORY));
  inOne([&](BusClient& client) {
    const auto import = [&](const UniqueFd& from, const std::string& name) {
      return client.operations("ImportDocument", sdbus::UnixFd(from.get()), name, "#" + itself,
                               noOptions);
    };
    EXPECT_EQ(import(place, "place").error, "com.norvane.Vessel1.Error.POSIX.EBADF");
    EXPECT_EQ(import(writing, "writing").error, "com.norvane.Vessel1.Error.POSIX.EBADF");
    EXPECT_EQ(import(folder, "folder").error, "com.norvane.Vessel1.Error.POSIX.EISDIR");
    for (const std::string name : {"../up", "..", ".", "", "a/b"})
      EXPECT_EQ(import(reading, name).error, "com.norvane.Vessel1.Error.POSIX.EINVAL") << name;
    const ItemRecord item = client.item(import(reading, "imported"));
    EXPECT_THAT(namesOf({item}), ElementsAre("imported"));
    EXPECT_EQ(item.parentItemIdentifier, "#" + itself);
  });
  std::string content;
  std::ifstream(at("imported")) >> content;
  EXPECT_EQ(content, "content");
}

TEST_F(Sandboxed, CallersDoNotComeOutThroughLinksAndNames) {
  fs::create_symlink(home.at("private doc"), at("link"));
  home.makeFolder("private folder");
  fs::create_directory_symlink(home.at("private folder"), at("folder link"));
  const std::string link = outside->idOf(at("link"));
  const std::string folderLink = outside->idOf(at("folder link"));
  const std::string document = outside->idOf(at("doc of One"));
  inOne([&](BusClient& client) {
    const std::string notSupported = "com.norvane.Vessel1.Error.POSIX.EOPNOTSUPP";
    EXPECT_EQ(client.provider("OpenItem", link, std::string("r")).error, notSupported);
    EXPECT_EQ(client.provider("OpenItem", folderLink, std::string("r")).error, notSupported);
    EXPECT_EQ(client.provider("ListItems", folderLink, nothing).error,
              "com.norvane.Vessel1.Error.POSIX.ENOTDIR");
    for (const std::string name : {"../up", "/etc/up", "..", "folder link/in"}) {
      EXPECT_NE(client.operations("Rename", document, name, noOptions).error, "") << name;
      EXPECT_NE(client.operations("CreateDirectory", name, "#" + itself, noOptions).error, "")
          << name;
      const BusOptions named{{"name", sdbus::Variant(name)}};
      EXPECT_NE(client.operations("Reparent", document, "#" + itself, named).error, "") << name;
    }
    EXPECT_NE(client.operations("CreateDirectory", std::string("in"), folderLink, noOptions).error,
              "");
    EXPECT_NE(client.operations("Reparent", document, folderLink, noOptions).error, "");
  });
  EXPECT_TRUE(fs::is_empty(home.at("private folder")));
  EXPECT_TRUE(fs::exists(at("doc of One")));
}

TEST_F(Sandboxed, CallersOfNoKnownApplicationSeeNothing) {
  for (const char* info : {"[Instance]\nname=org.example.One\n", "[Application]\n", " "}) {
    EXPECT_TRUE(inSandbox(info, [&](BusClient& client) {
      EXPECT_THAT(client.items(client.provider("ListAppLibraries")), IsEmpty());
      EXPECT_EQ(client.provider("GetItem", "#" + itself).error, noSuchItem);
      EXPECT_EQ(client.provider("GetDefaultContainer", std::string()).error, noSuchItem);
      EXPECT_THAT(client.items(client.provider("Search", words, noOptions)), IsEmpty());
    }));
  }
  // A root of its own alone is no sandbox.
  EXPECT_TRUE(inSandbox("", [&](BusClient& client) {
    EXPECT_EQ(client.item(client.provider("GetItem", "#" + another)).path, apps.documents(another));
  }));
}

TEST_F(Sandboxed, AnotherUsersProgramIsRefused) {
  if (!OrdinaryUser::isRoot()) GTEST_SKIP() << "takes root";
  asUser(OrdinaryUser::substitute, [&](BusClient& client) {
    const std::string root(VesselRootContainerItemIdentifier);
    EXPECT_EQ(client.provider("GetItem", root).error, accessDenied);
    EXPECT_EQ(client.provider("ListItems", root, nothing).error, accessDenied);
    EXPECT_EQ(client.provider("Watch", root).error, accessDenied);
    EXPECT_EQ(client.provider("Unwatch", root).error, accessDenied);
    EXPECT_EQ(client.operations("Delete", root, noOptions).error, accessDenied);
    EXPECT_EQ(client.call(bus::managerInterface, "GetHome").error, accessDenied);
  });
}

}  // namespace
}  // namespace mirabel::testing
