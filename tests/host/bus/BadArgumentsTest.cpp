#include <array>
#include <cmath>
#include <fcntl.h>
#include <functional>
#include <limits>
#include <regex>
#include <sys/socket.h>
#include <unistd.h>

#include "host/bus/BusClient.h"
#include "host/bus/ServiceFixture.h"
#include "mirabel/UniqueFd.h"
#include "platform/VesselManager.h"

namespace mirabel::testing {
namespace {

using ::testing::AnyOf;
using ::testing::MatchesRegex;
using ::testing::StartsWith;
using Texts = std::vector<std::string>;
using Write = std::function<void(sdbus::Message& call)>;

struct Method {
  std::string interface;
  std::string name;
  std::vector<std::string> types;  ///< of the arguments
};

/// What the service says of itself, without the interfaces of the bus.
std::vector<Method> methodsOf(const std::string& description) {
  static const std::regex tags(
      "<(interface|method) name=\"([^\"]+)\"|<arg type=\"([^\"]+)\"[^>]*direction=\"in\"");
  std::vector<Method> methods;
  std::string interface;
  for (std::sregex_iterator it(description.begin(), description.end(), tags), end; it != end;
       ++it) {
    if ((*it)[1] == "interface")
      interface = (*it)[2];
    else if (!interface.starts_with("com.norvane."))
      continue;
    else if ((*it)[1] == "method")
      methods.push_back({interface, (*it)[2], {}});
    else
      methods.back().types.push_back((*it)[3]);
  }
  return methods;
}

template <class Value>
Write writing(Value value) {
  return [value = std::move(value)](sdbus::Message& call) { call << value; };
}

const std::string large(1 << 20, 'x');

std::vector<Write> hostileTexts() {
  std::vector<Write> all;
  for (const char* text :
       {"",          " ",      "/",    "..",    "../../etc/passwd", "/etc/passwd", "root",
        "\x01\x7f",  "\u202e", "fid=", "fid=0", "fid=-1",           "fid=1e3",     "did=",
        "did=-1",    "did= 1", "#",    "#..",   "#\u00fc",          "r",           "rw",
        "2026-02-30"})
    all.push_back(writing(std::string(text)));
  for (const char* text : {"fid=9223372036854775807", "did=9223372036854775808",
                           "#org.example.None", "0001-01-01T00:00:00Z", "9999-12-31"})
    all.push_back(writing(std::string(text)));
  for (const std::string_view container :
       {VesselRootContainerItemIdentifier, VesselWorkingSetContainerItemIdentifier,
        VesselAllDirectoriesContainerItemIdentifier, VesselTemporaryLocalFolderItemIdentifier})
    all.push_back(writing(std::string(container)));
  for (const char* prefix : {"", "fid=", "#"})
    all.push_back(writing(prefix + large));
  return all;
}

std::vector<Write> hostileBytes(const Data& anchor, const Data& page) {
  std::vector<Write> all = {writing(Data()), writing(Data(1 << 20, 0)),
                            writing(dataFromString("/" + large))};
  for (const std::string& text :
       {std::string("/"), std::string("relative"), std::string("/etc"), std::string("/a\0b", 4),
        std::string("bplist00"), std::string("\xff\xfe"), std::string("/dev/zero")})
    all.push_back(writing(dataFromString(text)));
  for (Data whole : {anchor, page}) {
    for (std::size_t at = 0; at < whole.size(); at += 7) {
      Data damaged = whole;
      damaged[at] ^= 0x41;
      all.push_back(writing(damaged));
      all.push_back(writing(Data(whole.begin(), whole.begin() + static_cast<long>(at))));
    }
  }
  return all;
}

std::vector<Write> hostileOptions() {
  BusOptions nested;
  for (int depth = 0; depth < 20; ++depth)
    nested = {{"name", sdbus::Variant(nested)}};
  std::vector<Write> all = {writing(BusOptions()), writing(nested)};
  const std::pair<const char*, sdbus::Variant> options[] = {
      {"name", sdbus::Variant(std::string())},
      {"name", sdbus::Variant(large)},
      {"name", sdbus::Variant(std::string("../up"))},
      {"name", sdbus::Variant(std::int32_t{7})},
      {"name", sdbus::Variant(sdbus::UnixFd(STDIN_FILENO))},
      {"nameBytes", sdbus::Variant(Data{'a', 0, 'b'})},
      {"path", sdbus::Variant(std::string("/"))},
      {"path", sdbus::Variant(Data{'/', 0, 'b'})},
      {"parent", sdbus::Variant(std::string())},
      {"parent", sdbus::Variant(large)},
      {"modifiedSince", sdbus::Variant(std::string("today"))},
      {"modifiedBefore", sdbus::Variant(std::int64_t{7})},
      {"type", sdbus::Variant(large)},
      {"tags", sdbus::Variant(std::vector<std::string>(1000, "tag"))},
      {"limit", sdbus::Variant(std::uint32_t{0})},
      {"limit", sdbus::Variant(std::numeric_limits<std::uint32_t>::max())},
      {"includesTrashed", sdbus::Variant(std::string("yes"))}};
  for (const auto& [key, value] : options)
    all.push_back(writing(BusOptions{{key, value}}));
  return all;
}

std::vector<Write> hostileVariants() {
  std::vector<Write> all = {writing(sdbus::Variant(std::numeric_limits<std::int64_t>::min())),
                            writing(sdbus::Variant(std::numeric_limits<std::uint64_t>::max())),
                            writing(sdbus::Variant(std::string("1"))),
                            writing(sdbus::Variant(true)), writing(sdbus::Variant(BusOptions()))};
  for (const double number : {std::nan(""), std::numeric_limits<double>::infinity(), -0.0, 1e308})
    all.push_back(writing(sdbus::Variant(number)));
  return all;
}

class BadArguments : public ServiceFixture {
 protected:
  void SetUp() override {
    ServiceFixture::SetUp();
    if (IsSkipped()) return;
    home.makeFolder("kept");
    home.makeFolder("folder");
    for (int i = 0; i < 250; ++i)
      home.writeFile("folder/" + std::to_string(i));
    serve();
    client = std::make_unique<BusClient>();
    kept = client->idOf(home.at("kept"));
    folder = client->idOf(home.at("folder"));
    auto description = client->call("org.freedesktop.DBus.Introspectable", "Introspect");
    std::string text;
    description.reply >> text;
    methods = methodsOf(text);
    ASSERT_GE(methods.size(), 30u);
  }

  void expectAnswer(const Method& method, const std::vector<Write>& arguments) {
    auto call = client->methodCall(method.interface.c_str(), method.name.c_str());
    for (const Write& write : arguments)
      write(call);
    const auto answer = client->send(call);
    if (answer.error.empty()) return;
    EXPECT_THAT(answer.error, AnyOf(StartsWith("com.norvane.Vessel1.Error."),
                                    StartsWith("org.freedesktop.DBus.Error.")))
        << method.name;
    EXPECT_NE(answer.message, "") << method.name << answer.error;
  }
  void expectItWorks(const std::string& after) {
    EXPECT_EQ(BusClient::item(client->provider("GetItem", kept)).filename, "kept") << after;
  }

  std::unique_ptr<BusClient> client;
  std::string kept;
  std::string folder;
  std::vector<Method> methods;
};

TEST_F(BadArguments, OfAnotherTypeAreRefusedByTheBus) {
  for (const Method& method : methods) {
    auto call = client->methodCall(method.interface.c_str(), method.name.c_str());
    call << sdbus::Struct<std::int32_t>(7);
    EXPECT_EQ(client->send(call).error, "org.freedesktop.DBus.Error.InvalidArgs") << method.name;
    if (method.types.empty()) continue;
    const auto empty = client->methodCall(method.interface.c_str(), method.name.c_str());
    EXPECT_EQ(client->send(empty).error, "org.freedesktop.DBus.Error.InvalidArgs") << method.name;
    expectItWorks(method.name);
  }
}

TEST_F(BadArguments, ThatAreTooLargeAreNotKept) {
  const std::string text(5 << 20, 'x');
  const Data bytes(text.size());
  const std::string tooLarge = "com.norvane.Vessel1.Error.POSIX.E2BIG";
  EXPECT_EQ(client->operations("SetTagData", kept, bytes).error, tooLarge);
  EXPECT_EQ(client->provider("Search", Texts{text}, BusOptions()).error, tooLarge);
  EXPECT_EQ(client->provider("Search", Texts(1 << 20), BusOptions()).error, tooLarge);
  // Whether an option is known or not, and however deep it lies.
  BusOptions options;
  for (int depth = 0; depth < 10; ++depth)
    options = {{"nested", sdbus::Variant(options)}, {"bytes", sdbus::Variant(Data(1 << 19))}};
  EXPECT_EQ(client->operations("Delete", kept, options).error, tooLarge);
  expectItWorks("what is too large");
}

TEST_F(BadArguments, OfTheRightTypeGetAnAnswer) {
  const Data anchor = client->anchorOf(folder);
  auto listed = client->provider("ListItems", folder, Data());
  BusClient::items({"", "", listed.reply});
  const Data page = bus::readBytes(listed.reply);
  ASSERT_FALSE(page.empty());
  std::array<int, 2> pipe{};
  std::array<int, 2> sockets{};
  ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC), 0);
  ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, sockets.data()), 0);
  std::vector<UniqueFd> files;
  for (const int file :
       {pipe[0], pipe[1], sockets[0], sockets[1], ::open("/", O_RDONLY | O_DIRECTORY),
        ::open("/dev/zero", O_RDONLY), ::open(home.at("folder/0").c_str(), O_PATH),
        ::open(home.at("folder/0").c_str(), O_WRONLY)})
    files.emplace_back(file);
  std::map<std::string, std::vector<Write>> hostile = {
      {"s", hostileTexts()},
      {"ay", hostileBytes(anchor, page)},
      {"a{sv}", hostileOptions()},
      {"v", hostileVariants()},
      {"u", {writing(0u), writing(1u), writing(std::numeric_limits<std::uint32_t>::max())}},
      {"as",
       {writing(Texts()), writing(Texts{""}), writing(Texts{large}),
        writing(Texts(5000, "word"))}}};
  for (const UniqueFd& file : files)
    hostile["h"].push_back(writing(sdbus::UnixFd(file.get())));
  // For the other arguments, so that the hostile one is looked at: an identifier, which is a name
  // too, and a file.
  const UniqueFd readable(::open(home.at("folder/0").c_str(), O_RDONLY));
  const std::map<std::string, Write> harmless = {{"s", writing(folder)},
                                                 {"ay", writing(page)},
                                                 {"a{sv}", writing(BusOptions())},
                                                 {"v", writing(sdbus::Variant(1.0))},
                                                 {"u", writing(std::uint32_t{16})},
                                                 {"as", writing(Texts{"folder"})},
                                                 {"h", writing(sdbus::UnixFd(readable.get()))}};
  for (const Method& method : methods) {
    for (std::size_t place = 0; place < method.types.size(); ++place) {
      ASSERT_TRUE(hostile.contains(method.types[place])) << method.types[place];
      for (const Write& write : hostile[method.types[place]]) {
        std::vector<Write> arguments;
        for (const std::string& type : method.types)
          arguments.push_back(harmless.at(type));
        arguments[place] = write;
        expectAnswer(method, arguments);
      }
    }
    expectItWorks(method.name);
    if (HasFailure()) return;
  }
}

}  // namespace
}  // namespace mirabel::testing
