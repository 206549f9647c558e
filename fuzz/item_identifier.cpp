// Any text as an identifier: it names nothing, or a place whose own identifier leads there again,
// and is the one that its object has.

#include <string>

#include "Require.h"
#include "SilentLog.h"
#include "identity/FileObjectURLs.h"
#include "identity/MRBFileObjectIdentifier.h"
#include "support/FakeAppLibraries.h"
#include "support/FakePlatform.h"

using namespace mirabel;

namespace {

struct Documents {
  Documents() {
    fake.volume.makeFolder(fake.path("folder/inner"));
    fake.volume.makeFolder(fake.path("letter.quill"));
    fake.volume.writeFile(fake.path("folder/file"));
    fake.install("org.example.Draw", "/home/me/.var/app/org.example.Draw");
    // Documents have their numbers from the first time that they are asked for.
    for (const char* name : {"letter.quill", "folder/file"})
      require(identity.itemIdentifier(fake.url(name)).has_value());
  }

  testing::FakePlatform fake;
  testing::FakeAppLibraries libraries{fake.applications};
  FileObjectURLs identity{fake.platform(), libraries};
};

/// "#bundle" is looked up by the libraries' manager, which compares it as it is.
bool hasCanonicalForm(const std::string& identifier) {
  return identifier == VesselRootContainerItemIdentifier || identifier.starts_with("fid=") ||
         identifier.starts_with("did=") || identifier.starts_with("#");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  silenceLog();
  static Documents documents;
  const FileObjectURLs& identity = documents.identity;
  const std::string text(reinterpret_cast<const char*>(data), size);
  const auto url = identity.fileURLWithItemIdentifier(text);
  if (!url) return 0;
  require(text.find('=') == text.rfind('='));
  const auto canonical = identity.itemIdentifier(*url);
  // What lies outside the documents has a place and no identifier.
  if (!canonical) return 0;
  require(hasCanonicalForm(*canonical));
  if (canonical->starts_with('#')) return 0;
  const auto again = identity.fileURLWithItemIdentifier(*canonical);
  require(again && *again == *url);
  require(identity.itemIdentifier(*again) == canonical);
  return 0;
}
