#include <cstdlib>
#include <fstream>
#include <nlohmann/json.hpp>

#include "host/bus/BusClient.h"
#include "host/bus/ServiceFixture.h"
#include "platform/VesselManager.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::UnorderedElementsAre;
using json = nlohmann::json;

const std::string top(VesselRootContainerItemIdentifier);

bool succeeds(const std::string& command) {
  return std::system((command + " >/dev/null 2>&1").c_str()) == 0;
}

/// Programs that nobody wrote for this service.
class Clients : public ServiceFixture {
 protected:
  void SetUp() override {
    ServiceFixture::SetUp();
    if (IsSkipped()) return;
    home.writeFile("letter.txt", "Dear Aunt");
    home.makeFolder("folder");
    serve();
  }

  static std::string outputOf(std::vector<std::string> command) {
    Running running(std::move(command));
    std::string output = running.output().rest();
    EXPECT_EQ(running.end(), 0) << running.errors().rest();
    return output;
  }
  /// The values of an answer.
  static json busctl(std::vector<std::string> arguments) {
    std::vector<std::string> command = {
        "busctl",         "--user",        "--json=short",        "call",
        bus::serviceName, bus::objectPath, bus::providerInterface};
    command.insert(command.end(), arguments.begin(), arguments.end());
    const json answer = json::parse(outputOf(std::move(command)), nullptr, false);
    return answer.is_object() ? answer.at("data") : json();
  }
  static std::string gdbus(const std::string& method, std::vector<std::string> arguments) {
    std::vector<std::string> command = {
        "gdbus",         "call",           "--session",
        "--dest",        bus::serviceName, "--object-path",
        bus::objectPath, "--method",       std::string(bus::providerInterface) + "." + method};
    command.insert(command.end(), arguments.begin(), arguments.end());
    return outputOf(std::move(command));
  }
  static std::vector<std::string> namesOf(const json& items) {
    std::vector<std::string> names;
    for (const json& item : items)
      names.push_back(item.at("filename").at("data"));
    return names;
  }
};

TEST_F(Clients, InPythonListFollowReadAndImport) {
  const std::string python = "/usr/bin/python3";
  if (!succeeds(python + " -c 'from gi.repository import Gio'"))
    GTEST_SKIP() << "there is no python3-gi";
  EXPECT_EQ(outputOf({python, MIRABEL_BUS_CLIENT, home.documents()}),
            "listed ['folder', 'letter.txt']\n"
            "size 9 path True date True\n"
            "signalled ['" +
                top +
                "']\n"
                "changed ['new.txt']\n"
                "read Dear Aunt\n"
                "imported imported.txt 13 text/plain\n"
                "refused com.norvane.Vessel1.Error.NoSuchItem\n");
  std::string text;
  std::getline(std::ifstream(home.at("folder/imported.txt")), text);
  EXPECT_EQ(text, "imported text");
}

TEST_F(Clients, OfSystemdListAndAskForChangesAndSeeSignals) {
  if (!succeeds("command -v busctl")) GTEST_SKIP() << "there is no busctl";
  EXPECT_THAT(namesOf(busctl({"ListItems", "say", top, "0"}).at(0)),
              UnorderedElementsAre("letter.txt", "folder"));
  std::vector<std::string> since = {"EnumerateChanges", "say", top};
  const json anchor = busctl({"GetCurrentSyncAnchor", "s", top}).at(0);
  since.push_back(std::to_string(anchor.size()));
  for (const json& byte : anchor)
    since.push_back(std::to_string(byte.get<int>()));
  // A watch is one of its connection, and that of a call ends with it. Signals come to the one that
  // watches, and to those that are shown everything.
  busctl({"Watch", "s", top});
  Running monitor({"busctl", "--user", "--json=short", "monitor", bus::serviceName});
  ASSERT_THAT(monitor.errors().line(), HasSubstr("Monitoring"));
  BusClient watching;
  ASSERT_EQ(watching.provider("Watch", top).error, "");
  home.writeFile("new.txt", "new");
  json message = json::object();
  while (message.value("member", "") != "EnumeratorSignaled") {
    const std::string line = monitor.output().line();
    ASSERT_NE(line, "");
    message = json::parse(line);
  }
  EXPECT_EQ(message.at("payload").at("data").at(0), top);
  EXPECT_EQ(message.at("interface"), bus::providerInterface);
  EXPECT_THAT(namesOf(busctl(since).at(0)), UnorderedElementsAre("new.txt"));
}

TEST_F(Clients, OfGLibListAndAskForChangesAndAreToldTheMethods) {
  if (!succeeds("command -v gdbus")) GTEST_SKIP() << "there is no gdbus";
  EXPECT_THAT(gdbus("ListItems", {top, "[]"}), HasSubstr("'filename': <'letter.txt'>"));
  // "([byte 0x62, …],)"
  const std::string printed = gdbus("GetCurrentSyncAnchor", {top});
  const std::string anchor = printed.substr(1, printed.rfind(']'));
  EXPECT_EQ(gdbus("Watch", {top}), "()\n");
  home.writeFile("new.txt", "new");
  const std::string changes = gdbus("EnumerateChanges", {top, anchor});
  EXPECT_THAT(changes, HasSubstr("'filename': <'new.txt'>"));
  EXPECT_THAT(changes, Not(HasSubstr("letter.txt")));
  EXPECT_THAT(changes, HasSubstr("], false)\n"));
  const std::string description = outputOf({"gdbus", "introspect", "--session", "--dest",
                                            bus::serviceName, "--object-path", bus::objectPath});
  for (const char* part :
       {"interface com.norvane.Vessel1.Provider {", "interface com.norvane.Vessel1.Operations {",
        "interface com.norvane.Vessel1.Manager {", "in  s itemIdentifier",
        "EnumeratorSignaled(s container)"})
    EXPECT_THAT(description, HasSubstr(part));
}

}  // namespace
}  // namespace mirabel::testing
