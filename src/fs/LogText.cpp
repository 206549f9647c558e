#include "fs/LogText.h"

#include <sstream>

#include "foundation/Log.h"

namespace mirabel {
namespace {

template <class Each, class Text>
std::string listOf(const std::vector<Each>& elements, Text text) {
  std::string list = "[";
  for (const Each& element : elements) {
    if (list.size() > 1) list += ", ";
    list += text(element);
  }
  return list + "]";
}

}  // namespace

std::string listOfTexts(const std::vector<std::string>& texts) {
  return listOf(texts, quoted);
}

std::string listOfPaths(const std::vector<URL>& urls) {
  return listOf(urls, [](const URL& url) { return quoted(url.path()); });
}

std::string listOfURLs(const std::vector<URL>& urls) {
  return listOf(urls, [](const URL& url) { return url.description(); });
}

std::string addressText(const void* object) {
  std::ostringstream text;
  text << object;
  return std::move(text).str();
}

}  // namespace mirabel
