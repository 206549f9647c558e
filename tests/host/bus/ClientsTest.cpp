#include <cstdlib>
#include <fstream>

#include "host/bus/ServiceFixture.h"
#include "platform/VesselManager.h"

namespace mirabel::testing {
namespace {

using Clients = ServiceFixture;

// One that nobody wrote for this service.
TEST_F(Clients, InPythonListFollowReadAndImport) {
  const std::string python = "/usr/bin/python3";
  if (std::system((python + " -c 'from gi.repository import Gio' >/dev/null 2>&1").c_str()) != 0)
    GTEST_SKIP() << "there is no python3-gi";
  home.writeFile("letter.txt", "Dear Aunt");
  home.makeFolder("folder");
  serve();
  Running client({python, MIRABEL_BUS_CLIENT, home.documents()});
  EXPECT_EQ(client.output().rest(),
            "listed ['folder', 'letter.txt']\n"
            "size 9 path True date True\n"
            "signalled ['" +
                std::string(VesselRootContainerItemIdentifier) +
                "']\n"
                "changed ['new.txt']\n"
                "read Dear Aunt\n"
                "imported imported.txt 13 text/plain\n"
                "refused com.norvane.Vessel1.Error.NoSuchItem\n");
  EXPECT_EQ(client.end(), 0) << client.errors().rest();
  std::string text;
  std::getline(std::ifstream(home.at("folder/imported.txt")), text);
  EXPECT_EQ(text, "imported text");
}

}  // namespace
}  // namespace mirabel::testing
