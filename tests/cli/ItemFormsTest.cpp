#include <filesystem>

#include "cli/CommandLineFixture.h"
#include "support/OrdinaryUser.h"

namespace mirabel::testing {
namespace {

class ItemForms : public CommandLineFixture {
 protected:
  std::string pathOf(const std::string& item) const {
    const Answer answer = run({"path", item});
    return answer.code == 0 ? answer.out.substr(0, answer.out.size() - 1) : answer.err;
  }
  std::string idOf(const std::string& path) const {
    const Answer answer = run({"id", path});
    return answer.code == 0 ? answer.out.substr(0, answer.out.size() - 1) : answer.err;
  }
};

TEST_F(ItemForms, EachLeadsToTheItem) {
  home.makeFolder("folder");
  home.writeFile("folder/doc");
  home.writeFile("fid=3");
  home.makeFolder("Pack.quill");
  const std::string folder = idOf(home.at("folder"));
  const std::string document = idOf(home.at("folder/doc"));
  EXPECT_THAT(folder, ::testing::StartsWith("fid="));
  EXPECT_THAT(document, ::testing::StartsWith("did="));
  EXPECT_THAT(idOf(home.at("Pack.quill")), ::testing::StartsWith("did="));
  EXPECT_EQ(idOf(home.documents()), "VesselRootContainerItemIdentifier");
  EXPECT_EQ(pathOf(folder), home.at("folder"));
  EXPECT_EQ(pathOf(document), home.at("folder/doc"));
  EXPECT_EQ(pathOf("root"), home.documents());
  EXPECT_EQ(pathOf("VesselRootContainerItemIdentifier"), home.documents());
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path(home.documents());
  EXPECT_EQ(pathOf("./fid=3"), home.at("fid=3"));
  EXPECT_EQ(pathOf("folder/"), home.at("folder"));
  EXPECT_EQ(pathOf("folder/../folder//doc"), home.at("folder/doc"));
  EXPECT_EQ(pathOf("."), home.documents());
  // Where only a path can stand, it is one whatever it looks like.
  EXPECT_EQ(idOf("fid=3"), idOf(home.at("fid=3")));
  std::filesystem::current_path(home.at("folder"));
  EXPECT_EQ(pathOf(".."), home.documents());
  std::filesystem::current_path(before);
}

TEST_F(ItemForms, NoneThatFitsIsNoSuchItem) {
  for (const char* text : {"fid=", "did=", "fid=abc", "did=5=6", "fid=-1", "did=+1", "fid=1x",
                           "fid= 1", "did=99999999999999999999", "#"}) {
    expectFailure(run({"info", text}), 3, "identifiers are fid=N, did=N and #bundle");
    EXPECT_EQ(run({"--json", "path", text}).error().at("domain"), "LocalVessel") << text;
  }
  for (const char* text : {"did=0", "did=9999", "fid=9223372036854775807", "#com.example.app"}) {
    expectFailure(run({"path", text}), 3, "no item has this identifier");
    EXPECT_EQ(run({"--json", "ls", text}).error().at("code"), -1005) << text;
  }
  for (const char* text : {"xyz=1", "", "FID=1", "fid=1/x", "no\nsuch"}) {
    expectFailure(run({"info", text}), 3, "no such file or folder");
  }
}

TEST_F(ItemForms, LinksAreFollowedOnTheWayAndNotAtTheEnd) {
  home.writeFile("doc");
  home.makeSymlink("link", "doc");
  home.makeSymlink("out", "/etc");
  EXPECT_EQ(pathOf(home.at("link")), home.at("link"));
  expectFailure(run({"info", home.at("out/passwd")}), 3, "not below the document storage");
  expectFailure(run({"ls", home.at("out")}), 1, "not a folder");
  std::filesystem::create_directory_symlink(home.path(), home.path() + "/alias");
  EXPECT_EQ(pathOf(home.path() + "/alias/Documents/doc"), home.at("doc"));
}

TEST_F(ItemForms, OutsideTheDocumentsNothingIsAnItem) {
  std::filesystem::create_directory(home.path() + "/Documents2");
  std::filesystem::create_directory(home.path() + "/Documents2/in");
  for (const std::string& path : {std::string("/"), home.path(), home.path() + "/Documents2",
                                  home.path() + "/Documents2/in", std::string("/etc/passwd")}) {
    for (const char* command : {"id", "path", "info", "ls"}) {
      expectFailure(run({command, path}), 3, "not below the document storage");
    }
  }
}

TEST_F(ItemForms, SpecialFilesAreIdentifiedWithoutBeingOpened) {
  home.makeFifo("fifo");
  home.makeSocket("socket");
  home.makeSymlink("broken", "nowhere");
  for (const char* name : {"fifo", "socket", "broken"}) {
    EXPECT_EQ(pathOf(idOf(home.at(name))), home.at(name));
    EXPECT_EQ(done({"info", home.at(name)}).at("filename"), name);
    expectFailure(run({"ls", home.at(name)}), 1, "not a folder");
  }
}

TEST_F(ItemForms, PathsMayBeLongerThanTheKernelTakes) {
  const std::string name(250, 'n');
  std::string relative;
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path(home.documents());
  for (int depth = 0; depth < 20; ++depth) {
    std::filesystem::create_directory(name);
    std::filesystem::current_path(name);
    relative += (depth == 0 ? "" : "/") + name;
  }
  std::filesystem::current_path(before);
  std::filesystem::create_directory_symlink(home.path(), home.path() + "/alias");
  const std::string identifier = idOf(home.at(relative));
  EXPECT_THAT(identifier, ::testing::StartsWith("fid="));
  EXPECT_EQ(pathOf(identifier), home.at(relative));
  EXPECT_EQ(idOf(home.path() + "/alias/Documents/" + relative), identifier);
  EXPECT_EQ(run({"ls", home.at(relative)}).code, 0);
  expectFailure(run({"id", home.at(relative) + "/missing"}), 3, "no such file or folder");
  // The library that clears up can't reach that deep.
  EXPECT_EQ(shell("rm -rf \"$documents\"/n*").code, 0);
}

TEST_F(ItemForms, WhatMayNotBeReadIsNotPermitted) {
  home.makeFolder("closed");
  home.writeFile("closed/inside");
  home.setMode("closed", 0000);
  if (OrdinaryUser::isRoot()) home.giveTo(OrdinaryUser::substitute);
  const OrdinaryUser user;
  EXPECT_EQ(run({"info", home.at("closed")}).code, 0);
  expectFailure(run({"ls", home.at("closed")}), 5, "permission denied");
  expectFailure(run({"id", home.at("closed/inside")}), 5, "permission denied");
  EXPECT_EQ(done({"ls"}).at("items").size(), 1u);
}

}  // namespace
}  // namespace mirabel::testing
