// Any bytes as the file of the app libraries: nothing, or records that are the same when they are
// saved and loaded again.

#include <algorithm>

#include "Require.h"
#include "SilentLog.h"
#include "applibrary/AppLibraryContent.h"
#include "applibrary/LocalAppLibraryCache.h"

using namespace mirabel;

namespace {

/// One file, whatever it is called.
class OneFile final : public CacheFiles {
 public:
  const URL& applicationSupportURL() const override { return support_; }
  Result<std::optional<Data>> read(const URL&, std::size_t) override { return bytes; }
  Result<void> createDirectory(const URL&) override { return {}; }
  Result<void> replace(const URL&, const Data& next) override {
    bytes = next;
    return {};
  }
  Result<std::uint64_t> claimVersion(std::string_view, std::uint64_t after) override {
    return after + 1;
  }

  std::optional<Data> bytes;

 private:
  URL support_ = URL::fileURL("/home/me/.local/share");
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  silenceLog();
  static OneFile file;
  static LocalAppLibraryCache cache(file, LocalAppLibraryCacheSource::main);
  file.bytes = Data(data, data + size);
  const auto content = cache.load();
  if (!content) return 0;
  require(cache.versionToken() >= content->versionToken);
  const auto saved =
      cache.save(content->records, content->versionToken, LocalAppLibraryCache::Increment::no);
  if (!saved) return 0;  // what shared objects in the input is written apart
  require(*saved == content->versionToken);
  const auto again = cache.load();
  require(again && again->versionToken == content->versionToken);
  require(std::ranges::equal(again->records, content->records, makeTheSame));
  return 0;
}
