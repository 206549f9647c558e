// Any text: no document record, or one that is the same when it is written and read again.

#include <string>

#include "Require.h"
#include "fs/DocumentIDPath.h"

using namespace mirabel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  const auto path = DocumentIDPath::parse(text);
  if (!path) return 0;
  const std::string end = "changed/" + std::to_string(path->documentID) +
                          "/src=" + std::to_string(path->sourceFileID) +
                          ",dst=" + std::to_string(path->destinationFileID);
  for (const char* beginning : {".docid/", "/.docid/", "//.docid/2049/"})
    require(DocumentIDPath::parse(beginning + end) == path);
  // Whole, and nothing more.
  require(!DocumentIDPath::parse(text + "x"));
  require(!DocumentIDPath::parse("x" + text));
  return 0;
}
