#include <cerrno>
#include <gtest/gtest.h>
#include <string>
#include <utility>

#include "mirabel/Error.h"

namespace mirabel {
namespace {

TEST(Error, DescribesItselfInOneLine) {
  const std::pair<Error, std::string> cases[] = {
      {Error::posix(ENOENT), "POSIX error 2: No such file or directory"},
      {Error::posix(EACCES, "open of \"a\""), "POSIX error 13: Permission denied; open of \"a\""},
      {Error::file(FileErrorCode::noSuchFile), "file error 260: no such file"},
      {Error::file(FileErrorCode::writeNotPermitted), "file error 513: write not permitted"},
      {Error::file(FileErrorCode::fileExists), "file error 516: file already exists"},
      {Error::vessel(VesselErrorCode::collision),
       "Vessel error -1001: an item of that name already exists"},
      {Error::syncAnchorExpired(), "Vessel error -1002: sync anchor expired"},
      {Error::nonExistentItem("fid=7"), "Vessel error -1005: no such item"},
      {Error::invalidParameter("rank", "x"), "Vessel error -1010: invalid parameter"},
      {Error::local(LocalVesselError::itemNotFound), "LocalVessel error 2: item not found"},
      {Error::local(LocalVesselError::unableToGetDeviceUUID),
       "LocalVessel error 3: unable to get device UUID"},
      {Error::propertyList("cut short"), "property list error 0: unreadable data; cut short"},
      {Error::store(5, "locked"), "store error 5: database failure; locked"},
      {Error{ErrorDomain::file, 999, {}}, "file error 999"},
  };
  for (const auto& [error, text] : cases)
    EXPECT_EQ(error.description(), text);
}

}  // namespace
}  // namespace mirabel
