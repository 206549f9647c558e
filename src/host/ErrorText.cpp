#include "host/ErrorText.h"

#include <cerrno>
#include <string_view>
#include <system_error>

#include "foundation/AsciiCase.h"

namespace mirabel {
namespace {

constexpr std::string_view nothingThere = "no such file or folder";

std::string detailOf(const Error& error) {
  const auto found = error.userInfo.find(errorkey::detail);
  return found == error.userInfo.end() ? std::string() : found->second;
}

std::string posixMeaning(int code) {
  switch (code) {
    case ENOENT:
      return std::string(nothingThere);
    case ENOTDIR:
      return "it is not a folder";
    case EXDEV:
      return "another file system is mounted there, and is not entered";
    default:
      break;
  }
  std::string text = std::generic_category().message(code);
  text[0] = asciiLower(text[0]);
  return text;
}

// These are chosen for their exit code; their details say everything that their names would.
bool detailIsEnough(std::int64_t code) {
  return code == EBUSY || code == EINVAL || code == ENOTDIR || code == EPERM || code == ENOTCONN ||
         code == ENOBUFS || code == EADDRINUSE || code == ECANCELED || code == EDEADLK ||
         code == E2BIG || code == EMEDIUMTYPE;
}

std::string posixText(const Error& error) {
  const int code = static_cast<int>(error.code);
  std::string text = detailOf(error);
  if (text.empty() || !detailIsEnough(code)) {
    if (!text.empty()) text += ": ";
    text += posixMeaning(code);
  }
  if (code == EBUSY) {
    text += "; try again when it is done, or wait longer with --timeout SECONDS";
  }
  if (code == ENOSPC || code == EDQUOT) text += "; make room there and try again";
  return text;
}

std::string fileText(const Error& error) {
  if (error.is(FileErrorCode::noSuchFile)) return std::string(nothingThere);
  if (error.is(FileErrorCode::writeNotPermitted)) {
    return "nothing can be put into the root itself; choose a folder in it";
  }
  if (error.is(FileErrorCode::fileExists)) return "a file of that name is there already";
  return error.description();
}

std::string vesselText(const Error& error) {
  if (error.is(VesselErrorCode::syncAnchorExpired)) {
    return "the page or anchor is no longer valid; start over, with a new listing or a new anchor";
  }
  if (error.is(VesselErrorCode::noSuchItem)) return "no item has this identifier";
  if (error.is(VesselErrorCode::collision)) {
    const auto taker = error.userInfo.find(errorkey::collidingItem);
    return "the name is taken" +
           (taker == error.userInfo.end() ? std::string() : " by " + taker->second);
  }
  if (std::string detail = detailOf(error); !detail.empty()) return detail;
  return error.description();
}

std::string localText(const Error& error) {
  if (std::string detail = detailOf(error); !detail.empty()) return detail;
  if (error.is(LocalVesselError::unableToGetDeviceUUID)) {
    return "the volume can't be told from others; see what \"mirabel doctor\" says";
  }
  return "no such item";
}

}  // namespace

std::string explanation(const Error& error) {
  const auto told = error.userInfo.find(toldExplanation);
  if (told != error.userInfo.end()) return told->second;
  switch (error.domain) {
    case ErrorDomain::posix:
      return posixText(error);
    case ErrorDomain::file:
      return fileText(error);
    case ErrorDomain::vessel:
      return vesselText(error);
    case ErrorDomain::localVessel:
      return localText(error);
    case ErrorDomain::store:
      return "the volume's database: " + detailOf(error) + "; see what \"mirabel doctor\" says";
    case ErrorDomain::propertyList:
      return "the data can't be read: " + detailOf(error);
  }
  return error.description();
}

}  // namespace mirabel
