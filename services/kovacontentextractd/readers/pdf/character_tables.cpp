#include "services/kovacontentextractd/readers/pdf/character_tables.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <map>
#include <string>
#include <string_view>

namespace ferrox::extract {

namespace {

// The library opens its tables by fopen and by no other way, so this program has an fopen of its own, which answers for
// them from memory and hands all else to the C library. The linker exports it (CMakeLists.txt), or the library would
// find the C library's first.

/// Where the package poppler-data has them.
constexpr std::string_view kFolder = "/usr/share/poppler/";
constexpr const char* kParts[] = {"cMap/Adobe-CNS1", "cMap/Adobe-GB1", "cMap/Adobe-Japan1", "cMap/Adobe-Korea1",
                                  "cidToUnicode"};

using Tables = std::map<std::string, std::string_view, std::less<>>;

/// By their paths. Filled before there are other threads, and never freed: it may be asked after main.
Tables& Held() {
  static auto* tables = new Tables;
  return *tables;
}

/// Maps a file for good. What cannot be had is left out, and text that needs it is lost.
void Hold(const std::string& path) {
  const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return;
  struct stat status = {};
  if (fstat(fd, &status) == 0 && status.st_size > 0) {
    const auto size = static_cast<size_t>(status.st_size);
    void* bytes = mmap(nullptr, size, PROT_READ, MAP_PRIVATE, fd, 0);
    if (bytes != MAP_FAILED) Held()[path] = {static_cast<const char*>(bytes), size};
  }
  (void)close(fd);
}

/// Opens a file as the function of the C library does that is called `name`, but the tables from memory.
FILE* OpenTable(const char* name, const char* path, const char* mode) {
  const auto found = std::string_view(path).starts_with(kFolder) ? Held().find(path) : Held().end();
  if (found != Held().end()) {
    return fmemopen(const_cast<char*>(found->second.data()), found->second.size(), "r");
  }
  const auto open_file = reinterpret_cast<FILE* (*)(const char*, const char*)>(dlsym(RTLD_NEXT, name));
  return open_file(path, mode);
}

}  // namespace

void HoldCharacterTables() {
  for (const char* part : kParts) {
    std::error_code none;
    for (const auto& file : std::filesystem::directory_iterator(std::string(kFolder) + part, none)) {
      Hold(file.path().string());
    }
  }
}

}  // namespace ferrox::extract

// What the library calls to open a file, by the one name or the other, comes here before it gets to the C library.
extern "C" {
[[gnu::visibility("default")]] FILE* ferrox_fopen(const char* path, const char* mode) __asm__("fopen");
[[gnu::visibility("default")]] FILE* ferrox_fopen64(const char* path, const char* mode) __asm__("fopen64");

FILE* ferrox_fopen(const char* path, const char* mode) { return ferrox::extract::OpenTable("fopen", path, mode); }
FILE* ferrox_fopen64(const char* path, const char* mode) { return ferrox::extract::OpenTable("fopen64", path, mode); }
}
