#include <cerrno>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "identity/FileObjectURLs.h"
#include "support/FakeAppLibraries.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::size_t always = 1000;

class FileObjectURLsTest : public ::testing::Test {
 protected:
  // Lines without a level's word.
  static LogLine debug(const std::string& text) { return {LogLevel::debug, text}; }
  static LogLine error(const std::string& text) { return {LogLevel::error, text}; }
  std::string idOf(std::string_view name) {
    return identity.itemIdentifier(fake.url(name)).value_or("nothing");
  }
  std::string fid(std::string_view name) {
    return "fid=" + std::to_string(fake.volume.at(fake.path(name)).fileID);
  }

  FakePlatform fake;
  FakeAppLibraries libraries{fake.applications};
  FileObjectURLs identity{fake.platform(), libraries};
  LogCapture log;
};

TEST_F(FileObjectURLsTest, DocumentsAreNamedByDocumentIDAndTheRestByFileID) {
  fake.volume.makeFolder(fake.path("folder"));
  fake.volume.writeFile(fake.path("file"));
  fake.volume.makeFolder(fake.path("letter.quill"));
  fake.volume.makeSymlink(fake.path("link"), "file");
  fake.volume.makeFifo(fake.path("fifo"));
  EXPECT_EQ(idOf("folder"), fid("folder"));
  EXPECT_EQ(idOf("link"), fid("link"));
  EXPECT_EQ(idOf("fifo"), fid("fifo"));
  EXPECT_EQ(idOf("file"), "did=1");
  EXPECT_EQ(idOf("letter.quill"), "did=2");
  EXPECT_EQ(idOf("file"), "did=1");
  EXPECT_THAT(log.lines(), IsEmpty());

  for (const std::string_view name : {"", "folder", "link", "fifo", "file", "letter.quill"}) {
    const auto url = identity.fileURLWithItemIdentifier(idOf(name));
    ASSERT_TRUE(url) << name;
    EXPECT_EQ(*url, fake.url(name));
  }
}

TEST_F(FileObjectURLsTest, ContainmentIsAPlainStringPrefix) {
  fake.volume.makeFolder("/home/me/Documents2/f");
  EXPECT_TRUE(identity.itemIdentifier(URL::fileURL("/home/me/Documents2/f")));
}

TEST(FileObjectURLsCanonical, BothSpellingsOfVarAreOnePlace) {
  for (const std::string_view storage : {"/private/var/me/Documents", "/var/me/Documents"}) {
    FakePlatform fake(storage);
    const NoAppLibraryRoots none;
    const FileObjectURLs identity(fake.platform(), none);
    for (const std::string_view spelling : {"/private/var/me/Documents", "/var/me/Documents"}) {
      fake.volume.makeFolder(std::string(spelling) + "/f");
      const URL url = URL::fileURL(spelling);
      EXPECT_EQ(identity.itemIdentifier(url), VesselRootContainerItemIdentifier);
      EXPECT_TRUE(identity.itemIdentifier(url.appendingPathComponent("f"))->starts_with("fid="));
    }
  }
}

TEST_F(FileObjectURLsTest, WhatOnlyBeginsLikeAnIdentifierIsOfNoItem) {
  fake.volume.writeFile(fake.path("f"));
  ASSERT_EQ(idOf("f"), "did=1");
  for (const std::string& text : {std::string("did=1=6"), fid("f") + "=6", std::string("did=1=")})
    EXPECT_EQ(identity.findItem(text), Result<std::optional<URL>>(std::nullopt)) << text;
}

TEST_F(FileObjectURLsTest, WhatHasNoIdentifierSaysWhy) {
  fake.volume.writeFile(fake.path("f"));
  fake.volume.makeFolder(fake.path("folder"));
  // Of these something is known already.
  const URL folder = fake.url("folder");
  folder.resources().set(ResourceKey::isDirectory, true);
  folder.resources().set(ResourceKey::isPackage, false);
  const URL undocumented = fake.url("f");
  undocumented.resources().set(ResourceKey::documentIdentifier, ResourceValue{});
  const Error gone = Error::file(FileErrorCode::noSuchFile);
  const Error broken = Error::posix(EIO);
  const std::string value = "can't get resource value for ";
  const std::string path = "\"" + fake.path("f") + "\"";
  const struct {
    URL url;
    Op op;
    Error error;
    LogLine line;
  } cases[] = {
      {URL::fromString("https://example.org/a"), Op::device, broken,
       error("can't compute file object identifier if not a file URL")},
      {URL::fileURL("/var/tmp/a"), Op::device, broken,
       debug("can't compute file object identifier because \"/private/var/tmp/a\" is not part of "
             "Mirabel")},
      {URL::fileURL("/apps/gone/Documents"), Op::device, broken,
       error("[ERROR] can't find bundle proxy at file:///apps/gone/Documents")},
      {fake.url("f"), Op::readValues, gone,
       debug(value + "documentIdentifier; " + gone.description())},
      {fake.url("f"), Op::readValues, broken,
       error(value + "documentIdentifier; " + broken.description())},
      {folder, Op::readValues, broken, error(value + "fileIdentifier; " + broken.description())},
      {undocumented, Op::readValues, broken,
       error("can't get resource isPackage for " + path + "; " + broken.description())},
      {fake.url("f"), Op::openObject, Error::posix(EACCES),
       error("can't open file at " + path + "; " + std::to_string(EACCES))},
      {fake.url("f"), Op::attributes, broken,
       error("can't get attribute list for " + path + "; " + std::to_string(EIO))},
      {fake.url("f"), Op::permanentStorage, broken,
       error("can't get permanent storage for " + path)},
  };
  FakeApplications unregistered(fake.faults);
  unregistered.installed.push_back({"gone", URL::fileURL("/apps/gone"), {}});
  const FakeAppLibraries orphaned(unregistered);
  const FileObjectURLs identifying(fake.platform(), orphaned);
  for (const auto& c : cases) {
    fake.faults.reset();
    fake.faults.fail(c.op, c.error, 1, always);
    log.clear();
    EXPECT_FALSE(identifying.itemIdentifier(c.url));
    EXPECT_THAT(log.lines(), ElementsAre(c.line));
  }
}

TEST_F(FileObjectURLsTest, IdentifiersThatNameNothingAreRefusedWithTheirReason) {
  const auto components = [](const std::string& count) {
    return error("invalid identifier; identifier should have 2 components, not " + count);
  };
  const auto unresolved = [](const std::string& number) {
    return debug("can't resolve path matching file ID \"" + number + "\"; " +
                 std::to_string(ENOENT));
  };
  const std::pair<std::string_view, LogLine> cases[] = {
      {"", components("1")},
      {"#org.example.draw", components("1")},
      {"did=5=6", components("3")},
      {"xid=5", error("invalid host for identifier \"xid=5\"")},
      {"FID=5", error("invalid host for identifier \"FID=5\"")},
      {"fid=abc", unresolved("0")},
      {"fid=", unresolved("0")},
      {"fid=-7x", unresolved("-7")},
      {"fid=18446744073709551615", unresolved("9223372036854775807")},
      {"fid=-99999999999999999999", unresolved("-9223372036854775808")},
      {"did=7", error("can't resolve doc ID \"7\"; " + std::to_string(ENOENT))},
  };
  for (const auto& [identifier, line] : cases) {
    log.clear();
    EXPECT_FALSE(identity.fileURLWithItemIdentifier(identifier)) << identifier;
    EXPECT_THAT(log.lines(), ElementsAre(line)) << identifier;
  }
}

TEST_F(FileObjectURLsTest, VolumeWithoutADeviceResolvesNothing) {
  const LogLine line =
      error("can't get device ID for \"" + fake.path("") + "\"; " + std::to_string(EIO));
  for (const Op op : {Op::openObject, Op::device}) {
    fake.faults.fail(op, Error::posix(EIO), 1, 2);
    EXPECT_FALSE(identity.fileURLWithItemIdentifier("fid=100"));
    EXPECT_FALSE(identity.fileURLWithFileIdentifier(100));
  }
  EXPECT_THAT(log.lines(), ElementsAre(line, line, line, line));
  EXPECT_EQ(identity.deviceID(fake.url("missing")), 0U);
  EXPECT_EQ(identity.deviceIDWithError(fake.url("missing")).error(), Error::posix(ENOENT));
}

TEST_F(FileObjectURLsTest, DocumentIsAskedForUpToSixTimes) {
  fake.volume.writeFile(fake.path("f"));
  ASSERT_EQ(idOf("f"), "did=1");
  const struct {
    std::vector<int> failures;
    std::optional<LogLine> last;
  } cases[] = {
      {{EBUSY, EBUSY}, {}},
      {{EAGAIN, EBUSY, ESTALE, EAGAIN, EAGAIN}, {}},
      {{EAGAIN, EAGAIN, EAGAIN, EAGAIN, EAGAIN, EAGAIN},
       debug("can't resolve doc ID \"1\" after five attempts")},
      {{EAGAIN, EIO}, error("can't resolve doc ID \"1\"; " + std::to_string(EIO))},
  };
  for (const auto& c : cases) {
    fake.faults.reset();
    fake.clock.sleeps.clear();
    log.clear();
    std::vector<LogLine> expected;
    for (const int code : c.failures) {
      expected.push_back(debug("doc ID resolution failed with errno(" + std::to_string(code) +
                               "), let's try again after resting"));
      fake.faults.fail(Op::fileIDOfDocument, Error::posix(code), expected.size());
    }
    if (c.last) expected.back() = *c.last;
    EXPECT_EQ(identity.fileURLWithItemIdentifier("did=1").has_value(), !c.last);
    EXPECT_EQ(log.lines(), expected);
    EXPECT_EQ(fake.clock.sleeps,
              std::vector(c.failures.size() - (c.last ? 1 : 0), std::chrono::milliseconds(1)));
  }
}

#ifndef NDEBUG
TEST_F(FileObjectURLsTest, ValueThatIsNoNumberStopsTheProcess) {
  fake.volume.writeFile(fake.path("f"));
  const URL url = fake.url("f");
  url.resources().set(ResourceKey::documentIdentifier, std::string("7"));
  EXPECT_DEATH(
      {
        Log::shared().setSink(nullptr, LogLevel::error);
        static_cast<void>(identity.itemIdentifier(url));
      },
      "class Number.*class String");
}
#endif

}  // namespace
}  // namespace mirabel::testing
