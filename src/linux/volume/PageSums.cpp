#include "linux/volume/PageSums.h"

#include <array>
#include <cstdint>
#include <cstring>
#include <sqlite3.h>

#include "linux/volume/Digest.h"

namespace mirabel {
namespace {

constexpr int pageSize = databasePageSize;
// Newer SQLite reads parts of pages where it is told that it may, which nobody could check.
constexpr int readsPartsOfPages = 0x00008000;
// What SQLite reads of a file besides its pages: the header at first, its counters later.
constexpr int largestHeaderRead = 100;

using Page = std::array<unsigned char, databasePageSize>;

/// What SQLite sees as the open database; the file of the layer below lies behind it in memory.
struct SummedFile {
  sqlite3_file base;
  bool metWrongPage;
  [[nodiscard]] static sqlite3_file* below(sqlite3_file* file) {
    return reinterpret_cast<sqlite3_file*>(reinterpret_cast<SummedFile*>(file) + 1);
  }
};

std::uint64_t sumOf(const unsigned char* page, sqlite3_int64 offset) {
  return digestOf({page, databasePageSize - pageSumSize},
                  static_cast<std::uint64_t>(offset) / databasePageSize);
}

int readSummed(sqlite3_file* below, void* buffer, int count, sqlite3_int64 offset) {
  // A header that gives other sizes is damaged too.
  if (count != pageSize || offset % pageSize != 0) return SQLITE_CORRUPT;
  const int code = below->pMethods->xRead(below, buffer, count, offset);
  if (code == SQLITE_IOERR_SHORT_READ) return SQLITE_CORRUPT;
  if (code != SQLITE_OK) return code;
  const auto* page = static_cast<const unsigned char*>(buffer);
  std::uint64_t sum = 0;
  std::memcpy(&sum, page + databasePageSize - pageSumSize, pageSumSize);
  return sum == sumOf(page, offset) ? SQLITE_OK : SQLITE_CORRUPT;
}

int readPage(sqlite3_file* file, void* buffer, int count, sqlite3_int64 offset) {
  sqlite3_file* below = SummedFile::below(file);
  if (count <= largestHeaderRead && offset + count <= largestHeaderRead) {
    return below->pMethods->xRead(below, buffer, count, offset);
  }
  const int code = readSummed(below, buffer, count, offset);
  if (code == SQLITE_CORRUPT) reinterpret_cast<SummedFile*>(file)->metWrongPage = true;
  return code;
}

int writePage(sqlite3_file* file, const void* buffer, int count, sqlite3_int64 offset) {
  sqlite3_file* below = SummedFile::below(file);
  if (count != pageSize || offset % pageSize != 0) return SQLITE_MISUSE;
  Page page;
  std::memcpy(page.data(), buffer, page.size());
  const std::uint64_t sum = sumOf(page.data(), offset);
  std::memcpy(page.data() + databasePageSize - pageSumSize, &sum, pageSumSize);
  return below->pMethods->xWrite(below, page.data(), count, offset);
}

template <auto method, class... Arguments>
int passOn(sqlite3_file* file, Arguments... arguments) {
  sqlite3_file* below = SummedFile::below(file);
  return (below->pMethods->*method)(below, arguments...);
}

int control(sqlite3_file* file, int operation, void* argument) {
  if (operation != metWrongPage) {
    return passOn<&sqlite3_io_methods::xFileControl>(file, operation, argument);
  }
  *static_cast<int*>(argument) = reinterpret_cast<SummedFile*>(file)->metWrongPage ? 1 : 0;
  return SQLITE_OK;
}

int abilities(sqlite3_file* file) {
  return passOn<&sqlite3_io_methods::xDeviceCharacteristics>(file) & ~readsPartsOfPages;
}

// The first version: no shared index of the log, and no mapped pages, which nobody could check.
constexpr sqlite3_io_methods methods{
    .iVersion = 1,
    .xClose = passOn<&sqlite3_io_methods::xClose>,
    .xRead = readPage,
    .xWrite = writePage,
    .xTruncate = passOn<&sqlite3_io_methods::xTruncate, sqlite3_int64>,
    .xSync = passOn<&sqlite3_io_methods::xSync, int>,
    .xFileSize = passOn<&sqlite3_io_methods::xFileSize, sqlite3_int64*>,
    .xLock = passOn<&sqlite3_io_methods::xLock, int>,
    .xUnlock = passOn<&sqlite3_io_methods::xUnlock, int>,
    .xCheckReservedLock = passOn<&sqlite3_io_methods::xCheckReservedLock, int*>,
    .xFileControl = control,
    .xSectorSize = passOn<&sqlite3_io_methods::xSectorSize>,
    .xDeviceCharacteristics = abilities,
    .xShmMap = nullptr,
    .xShmLock = nullptr,
    .xShmBarrier = nullptr,
    .xShmUnmap = nullptr,
    .xFetch = nullptr,
    .xUnfetch = nullptr,
};

int openFile(sqlite3_vfs* layer, const char* name, sqlite3_file* file, int flags, int* got) {
  auto* system = static_cast<sqlite3_vfs*>(layer->pAppData);
  if ((flags & SQLITE_OPEN_MAIN_DB) == 0) return system->xOpen(system, name, file, flags, got);
  file->pMethods = nullptr;
  reinterpret_cast<SummedFile*>(file)->metWrongPage = false;
  const int code = system->xOpen(system, name, SummedFile::below(file), flags, got);
  // SQLite closes what has methods, also after a failure.
  if (SummedFile::below(file)->pMethods != nullptr) file->pMethods = &methods;
  return code;
}

const char* registerLayer() {
  sqlite3_vfs* system = sqlite3_vfs_find(nullptr);
  if (system == nullptr) return nullptr;
  // Never unregistered: SQLite keeps the pointer for as long as the program runs.
  static sqlite3_vfs layer;
  layer = {};
  layer.iVersion = 1;
  layer.szOsFile = static_cast<int>(sizeof(SummedFile)) + system->szOsFile;
  layer.mxPathname = system->mxPathname;
  layer.zName = "mirabel-page-sums";
  layer.pAppData = system;
  layer.xOpen = openFile;
  layer.xDelete = [](sqlite3_vfs* self, const char* name, int sync) {
    auto* below = static_cast<sqlite3_vfs*>(self->pAppData);
    return below->xDelete(below, name, sync);
  };
  layer.xAccess = [](sqlite3_vfs* self, const char* name, int flags, int* answer) {
    auto* below = static_cast<sqlite3_vfs*>(self->pAppData);
    return below->xAccess(below, name, flags, answer);
  };
  layer.xFullPathname = [](sqlite3_vfs* self, const char* name, int size, char* out) {
    auto* below = static_cast<sqlite3_vfs*>(self->pAppData);
    return below->xFullPathname(below, name, size, out);
  };
  // What has nothing to do with files goes where it always does.
  layer.xDlOpen = system->xDlOpen;
  layer.xDlError = system->xDlError;
  layer.xDlSym = system->xDlSym;
  layer.xDlClose = system->xDlClose;
  layer.xRandomness = system->xRandomness;
  layer.xSleep = system->xSleep;
  layer.xCurrentTime = system->xCurrentTime;
  layer.xGetLastError = system->xGetLastError;
  return sqlite3_vfs_register(&layer, 0) == SQLITE_OK ? layer.zName : nullptr;
}

}  // namespace

const char* summedFileLayer() {
  static const char* const name = registerLayer();
  return name;
}

}  // namespace mirabel
