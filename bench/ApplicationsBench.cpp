// 10,000 applications with documents, half of them the user's and half of them the system's: what
// it costs to learn of all of them, as at each start and after each notification. The plain loops
// make the system calls that it cannot do without, with the names known beforehand: for entries on
// first sight open, fstat, read and close, for known ones a statx, and a statx for each document
// folder.
#include <array>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <string_view>
#include <sys/stat.h>
#include <unistd.h>

#include "BenchHome.h"
#include "host/HostedProvider.h"
#include "linux/apps/LinuxApplicationRegistry.h"

namespace mirabel::bench {
namespace {

constexpr const char* firstRow = "all applications on first sight / open, read, statx";
constexpr const char* againRow = "all applications again / statx";
constexpr const char* lookupRow = "each application by its document folder / statx";
constexpr const char* refreshRow = "app libraries: a refresh, nothing new / one second";
constexpr const char* changeRow = "app libraries: one comes and goes / a refresh, nothing new";
constexpr std::array keys = {std::string_view("UISupportsDocumentBrowser")};

// As long as an entry with some translations and an action is.
std::string entryText(std::size_t number) {
  const std::string name = "Application " + std::to_string(number);
  std::string text = "[Desktop Entry]\nType=Application\nVersion=1.0\nName=" + name + "\n";
  for (const char* language : {"ca", "cs", "de", "es", "fi", "fr", "it", "ja", "pl", "sv", "uk"}) {
    text += "Name[" + std::string(language) + "]=" + name + "\nComment[" + language +
            "]=What it is for, in a few words\n";
  }
  return text +
         "Exec=/usr/bin/flatpak run --file-forwarding org.example.App @@u %U @@\n"
         "Icon=org.example.App\nTerminal=false\nCategories=Office;Utility;\n"
         "MimeType=text/plain;text/markdown;application/pdf;\nStartupNotify=true\n"
         "Actions=new-window;\n\n[Desktop Action new-window]\nName=New Window\n"
         "Exec=/usr/bin/flatpak run org.example.App --new-window\n";
}

/// Where the applications lie.
struct Applications {
  std::vector<std::string> entries{};
  std::vector<std::string> documents{};
  LinuxApplicationRegistry::Options options{};
};

Applications install(const BenchHome& home, std::size_t count) {
  Applications made;
  const std::string folders[] = {home.path() + "/user", home.path() + "/system"};
  made.options.home = home.path();
  made.options.directories = {{folders[0]}, {folders[1]}};
  made.options.locales = {"de_DE.UTF-8"};
  struct stat status {};
  require(::stat(home.path().c_str(), &status) == 0, "the home has a status");
  made.options.device = status.st_dev;
  for (const std::string& folder : folders)
    std::filesystem::create_directory(folder);
  for (std::size_t i = 0; i < count; ++i) {
    const std::string identifier = "org.example.App" + std::to_string(i);
    made.entries.push_back(folders[i % 2] + "/" + identifier + ".desktop");
    std::ofstream(made.entries.back()) << entryText(i);
    made.documents.push_back(home.path() + "/.var/app/" + identifier + "/Documents");
    std::filesystem::create_directories(made.documents.back());
  }
  return made;
}

void lookAt(const std::vector<std::string>& paths) {
  struct statx status;
  for (const std::string& path : paths) {
    require(::statx(AT_FDCWD, path.c_str(), 0, STATX_BASIC_STATS, &status) == 0,
            "everything has a status");
  }
}

void read(const std::vector<std::string>& paths) {
  std::array<char, 16 << 10> buffer;
  struct stat status {};
  for (const std::string& path : paths) {
    const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    require(file >= 0 && ::fstat(file, &status) == 0, "each entry can be opened");
    require(::read(file, buffer.data(), buffer.size()) == status.st_size, "and read");
    ::close(file);
  }
}

/// As the list of app libraries is made; answers how many there are.
std::size_t enumerate(LinuxApplicationRegistry& registry) {
  std::size_t count = 0;
  for (const auto type : {ApplicationType::user, ApplicationType::system}) {
    const auto done = registry.enumerateApplicationsOfType(
        type, [&](const std::optional<BundleProxy>& application) {
          require(application && application->dataContainerURL, "each application has documents");
          require(registry.infoDictionaryValues(*application, keys).has_value(),
                  "and a dictionary");
          ++count;
        });
    require(done.has_value(), "applications can be enumerated");
  }
  return count;
}

void refresh(HostedProvider& provider) {
  MRBAppLibraryManager& libraries = provider.libraries();
  libraries.refreshFromRegistry();
  libraries.upgradeFromMainCache();
  libraries.followLibraries(provider.linuxPlatform().events());
}

/// What the provider does after a notification, with a history that is followed: once with nothing
/// new, and once for an application that comes and once for it when it goes.
void benchRefresh(const Scale& scale) {
  if (!scale.includesAny({refreshRow, changeRow})) return;
  const BenchHome home(BenchHome::Where::memory);
  const std::string entries = home.path() + "/.local/share/applications";
  std::filesystem::create_directories(entries);
  const auto entryOf = [&](std::size_t i) {
    return entries + "/org.example.App" + std::to_string(i) + ".desktop";
  };
  const std::size_t count = scale.files / 10;
  for (std::size_t i = 0; i <= count; ++i) {
    std::filesystem::create_directories(home.path() + "/.var/app/org.example.App" +
                                        std::to_string(i) + "/Documents");
    if (i < count) std::ofstream(entryOf(i)) << entryText(i);
  }
  LinuxPlatform::Options options;
  options.home = home.path();
  const auto provider = HostedProvider::open(std::move(options)).value();
  static_cast<void>(provider->linuxPlatform().events().currentEventID());
  const auto all = [&] { return provider->libraries().rootURLsForAppLibraries()->size(); };
  require(all() == count, "all app libraries are known");
  Comparison same{refreshRow, {}, {}, 1.0};
  Comparison change{changeRow, {}, {}, 3.0};
  for (int round = 0; round < scale.rounds; ++round) {
    const double unchanged = secondsOf([&] { refresh(*provider); });
    same.ours.push_back(unchanged);
    same.reference.push_back(1.0);
    std::ofstream(entryOf(count)) << entryText(count);
    const double comes = secondsOf([&] { refresh(*provider); });
    require(all() == count + 1, "one has come");
    std::filesystem::remove(entryOf(count));
    const double goes = secondsOf([&] { refresh(*provider); });
    require(all() == count, "it is gone");
    change.ours.push_back((comes + goes) / 2);
    change.reference.push_back(unchanged);
  }
  for (const Comparison* comparison : {&same, &change})
    if (scale.includes(comparison->name)) print(*comparison);
}

}  // namespace

void runApplicationsBenchmarks(const Scale& scale) {
  if (!scale.includesAny({firstRow, againRow, lookupRow, refreshRow, changeRow})) return;
  const BenchHome home(BenchHome::Where::memory);
  const std::size_t count = scale.files / 10;
  const Applications applications = install(home, count);
  printHeading(std::to_string(count) + " applications, median of " + std::to_string(scale.rounds) +
               " rounds");
  Comparison first{firstRow, {}, {}, 7.0};
  Comparison again{againRow, {}, {}, 5.0};
  Comparison lookup{lookupRow, {}, {}, 5.0};
  for (int round = 0; round < scale.rounds; ++round) {
    LinuxApplicationRegistry registry(applications.options);
    const auto all = [&] { require(enumerate(registry) == count, "all of them are reported"); };
    first.reference.push_back(secondsOf([&] {
      read(applications.entries);
      lookAt(applications.documents);
    }));
    first.ours.push_back(secondsOf(all));
    const auto look = [&] {
      lookAt(applications.entries);
      lookAt(applications.documents);
    };
    again.reference.push_back(secondsOf(look));
    again.ours.push_back(secondsOf(all));
    lookup.reference.push_back(secondsOf(look));
    lookup.ours.push_back(secondsOf([&] {
      for (const std::string& path : applications.documents)
        require(registry.proxyAt(URL::fileURL(path)).has_value(), "each is found by its documents");
    }));
  }
  for (const Comparison* comparison : {&first, &again, &lookup})
    if (scale.includes(comparison->name)) print(*comparison);
  benchRefresh(scale);
}

}  // namespace mirabel::bench
