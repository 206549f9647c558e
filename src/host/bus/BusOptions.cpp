#include "host/bus/BusOptions.h"

#include <sdbus-c++/sdbus-c++.h>

#include "host/bus/BusText.h"

namespace mirabel::bus {

std::optional<std::string> mistypedOption(const Options& options,
                                          std::initializer_list<KnownOption> known) {
  for (const auto& [key, signature] : known) {
    const auto found = options.find(std::string(key));
    if (found == options.end() || found->second.peekValueType() == signature) continue;
    return "the option \"" + std::string(key) + "\" takes a value of type " +
           std::string(signature);
  }
  return {};
}

std::optional<std::string> textOption(const Options& options, const std::string& key) {
  const auto found = options.find(key);
  if (found == options.end() || !found->second.containsValueOfType<std::string>()) return {};
  return found->second.get<std::string>();
}

std::optional<std::string> nameOption(const Options& options, const std::string& key) {
  const auto bytes = options.find(key + "Bytes");
  if (bytes != options.end() && bytes->second.containsValueOfType<Data>())
    return std::string(stringView(bytes->second.get<Data>()));
  return textOption(options, key);
}

void setNameOption(Options& options, const std::string& key, const std::string& name) {
  if (isBusText(name)) {
    options[key] = sdbus::Variant(name);
  } else {
    options[key + "Bytes"] = sdbus::Variant(dataFromString(name));
  }
}

}  // namespace mirabel::bus
