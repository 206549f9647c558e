// Any bytes as an extended attribute of a file, the first of them saying which: the item is there
// whatever they are, and what it says of them can be believed.

#include <array>
#include <string>

#include "ByteSource.h"
#include "Require.h"
#include "SilentLog.h"
#include "items/AttributeNames.h"
#include "items/LocalItem.h"
#include "mirabel/TagData.h"
#include "support/FakeAppLibraries.h"
#include "support/FakePlatform.h"

using namespace mirabel;

namespace {

constexpr std::string_view container = "/home/me/.var/app/org.example.Draw";
constexpr std::array attributes{attributename::lastUsedDate, attributename::tags,
                                attributename::favoriteRank, attributename::trashDate,
                                attributename::putBack};

struct Documents {
  Documents() {
    fake.install("org.example.Draw", container);
    fake.volume.makeFolder(std::string(container) + "/Documents/.Trash");
    fake.volume.writeFile(path);
  }

  testing::FakePlatform fake;
  testing::FakeAppLibraries libraries{fake.applications};
  FileObjectURLs identity{fake.platform(), libraries};
  const std::string path = std::string(container) + "/Documents/.Trash/drawing";
};

void requireBelowDocuments(const URL& place) {
  const std::string documents = std::string(container) + "/Documents/";
  require(place.path().starts_with(documents));
  std::string_view rest = std::string_view(place.path()).substr(documents.size());
  require(!rest.empty() && rest.find('\0') == std::string_view::npos);
  while (!rest.empty()) {
    const std::string_view component = takeUpTo(rest, '/');
    require(!component.empty() && component != "." && component != "..");
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  silenceLog();
  static Documents documents;
  ByteSource source(data, size);
  auto& given = documents.fake.volume.at(documents.path).attributes;
  given.clear();
  given.emplace(attributes[source.below(attributes.size())], dataFromString(source.rest()));
  const ItemContext context{documents.fake.platform(), documents.identity, documents.libraries};
  const auto item = LocalItem::create(context, URL::fileURL(documents.path));
  require(item != nullptr);
  if (const auto& used = item->lastUsedDate())
    require(*used >= Date::earliest && *used <= Date::latest);
  // Empty where the tags could not be understood.
  if (const auto& tags = item->tagData()) require(tags->empty() || decodeTagData(*tags));
  if (const auto& place = item->putBackURL()) requireBelowDocuments(*place);
  return 0;
}
