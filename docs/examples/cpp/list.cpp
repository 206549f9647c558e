// Prints what lies in the folder of a path, or in the root: an identifier and a name a line.
//
// usage: list HOME [PATH]

#include <filesystem>
#include <iostream>
#include <optional>
#include <string>

#include "mirabel/Session.h"

int main(int argc, char** argv) {
  if (argc < 2) return 2;
  const auto complain = [](const mirabel::Error& error) {
    std::cerr << "list: " << error.description() << '\n';
    return 1;
  };
  const auto documents = mirabel::openDocuments({.home = argv[1]});
  if (!documents) return complain(documents.error());

  std::string folder(mirabel::VesselRootContainerItemIdentifier);
  if (argc > 2) {
    const auto item = (*documents)->itemAtPath(std::filesystem::canonical(argv[2]));
    if (!item) return complain(item.error());
    folder = item->itemIdentifier;
  }
  const auto container = (*documents)->container(folder);
  if (!container) return complain(container.error());

  std::optional page = mirabel::dataFromString(mirabel::VesselInitialPageSortedByName);
  while (page) {
    auto answer = (*container)->items(*page);
    if (!answer) return complain(answer.error());
    for (const auto& item : answer->items)
      std::cout << item.itemIdentifier << '\t' << item.filename << '\n';
    page = std::move(answer->nextPage);
  }
}
