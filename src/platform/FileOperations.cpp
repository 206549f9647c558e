#include "platform/FileOperations.h"

namespace mirabel {

std::optional<URL> vs_collidingURL(const Error& error) {
  const auto found = error.userInfo.find(errorkey::collidingURL);
  if (found == error.userInfo.end()) return {};
  return URL::fileURL(found->second);
}

Error fileExists(const URL& colliding) {
  Error error = Error::file(FileErrorCode::fileExists);
  error.userInfo.emplace(errorkey::collidingURL, colliding.path());
  return error;
}

}  // namespace mirabel
