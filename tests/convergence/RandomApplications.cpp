#include "convergence/RandomApplications.h"

#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <stdio.h>
#include <system_error>

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

constexpr const char* applications[] = {"org.example.One", "org.example.Two", "org.example.Three"};
constexpr const char* names[] = {"Draw", "Write", "Sing"};
constexpr const char* caches[] = {"app-libraries.plist", "searchable-app-libraries.plist"};

template <class T, std::size_t size>
const T& anyOf(const T (&values)[size], RandomTree& random) {
  return values[random.pick(size)];
}

}  // namespace

RandomApplications::RandomApplications(std::string home) : home_(std::move(home)) {
  fs::create_directories(home_ + "/.local/share/applications");
  for (const std::string application : {applications[0], applications[1]}) {
    fs::create_directories(containerOf(application) + "/Documents");
    install(application, names[0]);
  }
}

std::string RandomApplications::entryOf(const std::string& application) const {
  return home_ + "/.local/share/applications/" + application + ".desktop";
}

std::string RandomApplications::containerOf(const std::string& application) const {
  return home_ + "/.var/app/" + application;
}

std::vector<std::string> RandomApplications::libraries() const {
  std::vector<std::string> folders;
  for (const char* application : applications)
    folders.push_back(containerOf(application) + "/Documents");
  return folders;
}

bool RandomApplications::isInstalled(const std::string& library) const {
  return fs::exists(entryOf(fs::path(library).parent_path().filename()));
}

// As whoever installs it does: in one go.
void RandomApplications::install(const std::string& application, const std::string& name) const {
  const std::string entry = entryOf(application), temporary = entry + ".new";
  std::ofstream(temporary) << "[Desktop Entry]\nType=Application\nName=" << name
                           << "\nExec=run %F\nMimeType=text/plain;\n";
  ::rename(temporary.c_str(), entry.c_str());
}

std::string RandomApplications::change(RandomTree& random) {
  const std::string application = anyOf(applications, random);
  const std::string documents = containerOf(application) + "/Documents";
  std::error_code ignored;
  switch (random.pick(7)) {
    case 0:
    case 1:
      fs::create_directories(documents, ignored);
      install(application, anyOf(names, random));
      return "install " + application;
    case 2:
      fs::remove(entryOf(application), ignored);
      return "uninstall " + application;
    case 3:
      if (random.pick(2) == 0) fs::remove_all(containerOf(application), ignored);
      return "maybe remove the container of " + application;
    case 4: {
      const std::string other = containerOf(anyOf(applications, random)) + "/Documents";
      ::renameat2(AT_FDCWD, documents.c_str(), AT_FDCWD, other.c_str(),
                  random.pick(2) == 0 ? RENAME_EXCHANGE : RENAME_NOREPLACE);
      return "move or exchange " + documents + " and " + other;
    }
    case 5:
      ::rename(documents.c_str(), (home_ + "/outside/library").c_str());
      return "move out " + documents;
    default:
      ::rename((home_ + "/outside/library").c_str(), documents.c_str());
      return "move in " + documents;
  }
}

std::string RandomApplications::damage(RandomTree& random) {
  const fs::path cache = home_ + "/.local/share/Mirabel/" + anyOf(caches, random);
  const fs::path copy =
      home_ + "/outside/copy" + std::to_string(random.pick(3)) + "of" + cache.filename().string();
  std::error_code ignored;
  switch (random.pick(4)) {
    case 0:
      fs::remove(cache, ignored);
      return "remove " + cache.string();
    case 1:
      if (const auto size = fs::file_size(cache, ignored); !ignored && size > 0)
        fs::resize_file(cache, random.pick(size), ignored);
      return "truncate " + cache.string();
    case 2:
      fs::copy_file(cache, copy, fs::copy_options::overwrite_existing, ignored);
      return "copy " + cache.string();
    default:
      if (fs::exists(copy)) fs::rename(copy, cache, ignored);
      return "put an older copy back as " + cache.string();
  }
}

}  // namespace mirabel::testing
