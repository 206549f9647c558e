#include <gtest/gtest.h>

#include "host/bus/CallerIdentity.h"

namespace mirabel::testing {
namespace {

using namespace std::string_literals;

TEST(ApplicationOfSandbox, IsTheNameInItsGroupAndNowhereElse) {
  const std::string longName(60'000, 'n');
  const struct {
    std::string info;
    std::string application;
  } cases[] = {
      {"[Application]\nname=org.example.One\n", "org.example.One"},
      {"[Application]\nname=org.example.One", "org.example.One"},
      {"[Application]\r\nname=org.example.One\r\n", "org.example.One"},
      {"  [Application]\t\n \tname = org.example.One \t\n", "org.example.One"},
      {"[Instance]\nname=other\n[Application]\nruntime=x\nname=org.example.One\n",
       "org.example.One"},
      {"[Application]\nname=org.example.One\nname=org.example.Two\n", "org.example.One"},
      {"[Application]\nname=" + longName, longName},
      // Nothing is known of these.
      {"", ""},
      {"[Application]\nname=\n", ""},
      {"[Application]\nruntime=x\n[Instance]\nname=org.example.One\n", ""},
      {"[Application\nname=org.example.One\n", ""},
      {"[Application]\nNAME=org.example.One\nnames=x\n#name=org.example.One\n", ""},
      {"[Application]\n[name=org.example.One\n", ""},
      {"[Application]\rname=org.example.One\n", ""},
      {"[Application]\0\nname=org.example.One\n"s, ""},
      {std::string(60'000, '['), ""},
  };
  for (const auto& [info, application] : cases)
    EXPECT_EQ(bus::applicationOfSandbox(info), application) << info.substr(0, 100);
}

}  // namespace
}  // namespace mirabel::testing
