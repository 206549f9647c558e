#include "cli/IconCommand.h"

#include <cerrno>
#include <fstream>
#include <nlohmann/json.hpp>
#include <optional>
#include <ostream>
#include <utility>

#include "cli/ItemArgument.h"
#include "cli/ItemJSON.h"
#include "cli/Printing.h"

namespace mirabel {
namespace {

constexpr std::int64_t largestSize = 4096;

Result<std::optional<Data>> pictureOf(const LocalVessel& provider, const std::string& identifier,
                                      std::int64_t size) {
  Result<std::optional<Data>> picture;
  const auto side = static_cast<double>(size);
  provider.fetchThumbnailsForItemIdentifiers(
      {identifier}, {side, side},
      AppThumbnails::PerThumbnailHandler(
          [&](std::string_view, std::optional<Data> image, std::optional<Error> error) {
            if (error) {
              picture = fail(*std::move(error));
            } else {
              picture = std::move(image);
            }
          }),
      [](const auto&) {});
  return picture;
}

Result<void> write(const std::string& file, const Data& bytes) {
  errno = 0;
  std::ofstream out(file, std::ios::binary | std::ios::trunc);
  out << stringView(bytes);
  // What is still to be written may fail only now.
  out.close();
  if (out) return {};
  return fail(Error::posix(errno == 0 ? EIO : errno));
}

}  // namespace

ExitCode runIcon(Program& program, const IconOptions& options) {
  if (options.size < 1 || options.size > largestSize) {
    return program.reportUsage("--size takes 1 to " + std::to_string(largestSize) + " pixels");
  }
  Session* session = program.session();
  if (session == nullptr) return program.exitCode();
  const auto found = ItemArgument(options.item).item(*session);
  if (!found) return program.report(found.error(), "can't find " + options.item);
  const auto picture = pictureOf(session->provider(), (*found)->itemIdentifier(), options.size);
  if (!picture) return program.report(picture.error(), "can't get the icon of " + options.item);
  if (!*picture) {
    return program.reportFailed(options.item +
                                " has no icon; only the documents of an application have one");
  }
  if (auto written = write(options.file, **picture); !written) {
    return program.report(written.error(), "can't write " + options.file);
  }
  if (program.options().json) {
    nlohmann::json line;
    setText(line, "path", options.file);
    line["bytes"] = std::to_string((*picture)->size());
    program.out() << line.dump() << '\n';
  } else {
    program.out() << "wrote " << printable(options.file) << "  (" << humanSize((*picture)->size())
                  << ")\n";
  }
  return ExitCode::done;
}

}  // namespace mirabel
