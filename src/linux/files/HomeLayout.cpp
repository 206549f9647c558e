#include "linux/files/HomeLayout.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <pwd.h>
#include <string_view>
#include <system_error>
#include <unistd.h>

#include "foundation/URL.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

constexpr std::string_view documentsName = "Documents";

std::optional<std::string> environment(const char* name) {
  const char* value = std::getenv(name);
  if (value == nullptr || *value == '\0') return std::nullopt;
  return value;
}

std::string inQuotes(const std::string& path) {
  return "\"" + path + "\"";
}

Result<std::string> homeOfUser() {
  if (auto home = environment("HOME")) return *home;
  passwd entry{};
  passwd* found = nullptr;
  std::string buffer(16384, '\0');
  ::getpwuid_r(::getuid(), &entry, buffer.data(), buffer.size(), &found);
  if (found == nullptr || *found->pw_dir == '\0') {
    return fail(Error::posix(ENOENT, "$HOME is not set and the user database names no home"));
  }
  return found->pw_dir;
}

// A folder that is there, resolved.
Result<std::string> existingFolder(const std::string& path, const std::string& what) {
  auto resolved = resolvedPath(path);
  const auto status = resolved ? statusOf(*resolved) : Result<ObjectStatus>(fail(resolved.error()));
  if (!status) {
    const int code = static_cast<int>(status.error().code);
    return fail(Error::posix(code, what + " " + inQuotes(path) + " cannot be reached"));
  }
  if (status->kind == FileKind::symbolicLink) {
    return fail(Error::posix(ENOTDIR, what + " " + inQuotes(path) + " is a link to nothing"));
  }
  if (status->kind != FileKind::folder) {
    return fail(Error::posix(ENOTDIR, what + " " + inQuotes(path) + " is not a folder"));
  }
  return resolved;
}

Result<std::string> documentFolder(const std::string& path) {
  auto folder = existingFolder(path, "the document storage");
  if (!folder && folder.error().isPosix(ENOENT)) folder = resolvedPath(path);
  if (!folder) return folder;
  // The trash of a document lies in the first folder of that name on its path.
  const std::string parent = std::filesystem::path(*folder).parent_path();
  const URL parentURL = URL::fileURL(parent);
  const auto components = parentURL.pathComponents();
  if (std::ranges::find(components, documentsName) != components.end()) {
    return fail(Error::posix(EINVAL, "the document storage " + inQuotes(*folder) +
                                         " lies below another folder named \"Documents\", and "
                                         "what is trashed would end up there"));
  }
  return folder;
}

// Relative paths in XDG variables are to be ignored.
std::string folderOf(const char* variableName, const std::string& standIn, bool usesEnvironment) {
  const auto variable = usesEnvironment ? environment(variableName) : std::nullopt;
  if (variable && variable->starts_with('/')) return *variable;
  return standIn;
}

}  // namespace

Result<std::string> resolvedPath(const std::string& path) {
  std::error_code error;
  const std::filesystem::path absolute = std::filesystem::absolute(path, error);
  if (error) return fail(Error::posix(error.value()));
  std::filesystem::path resolved = std::filesystem::canonical(absolute, error);
  if (error && error != std::errc::no_such_file_or_directory) {
    return fail(Error::posix(error.value()));
  }
  // What is missing keeps its name, below a parent that is resolved where it exists.
  if (error) {
    resolved =
        std::filesystem::weakly_canonical(absolute.parent_path(), error) / absolute.filename();
  }
  if (error) return fail(Error::posix(error.value()));
  return resolved.string();
}

Result<HomeLayout> HomeLayout::resolve(const Choices& choices) {
  const auto chosen = choices.home ? Result<std::string>(*choices.home) : homeOfUser();
  if (!chosen) return fail(chosen.error());
  auto home = existingFolder(*chosen, "the home folder");
  if (!home) return fail(home.error());
  auto documents =
      documentFolder(choices.documents.value_or(*home + "/" + std::string(documentsName)));
  if (!documents) return fail(documents.error());
  const bool usesEnvironment = !choices.home.has_value();
  std::string applicationSupport =
      folderOf("XDG_DATA_HOME", *home + "/.local/share", usesEnvironment);
  // The folder itself stays unresolved: whether it is a link must still be seen when it is opened.
  const std::filesystem::path state = choices.stateFolder.value_or(
      folderOf("XDG_STATE_HOME", *home + "/.local/state", usesEnvironment) + "/mirabel");
  auto above = resolvedPath(state.parent_path());
  if (!above) {
    const int code = static_cast<int>(above.error().code);
    const std::string why = code == ENOTDIR ? ": something on the way is not a folder" : "";
    return fail(
        Error::posix(code, "the state folder " + inQuotes(state) + " cannot be reached" + why));
  }
  return HomeLayout{std::move(*home), std::move(*documents),
                    std::filesystem::path(*above) / state.filename(),
                    std::move(applicationSupport)};
}

}  // namespace mirabel
