// Extensions: from a wide name to a shared library beside the host or on the search path, and to its entry's answer.
#include <dlfcn.h>
#include <link.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "host/checker.hpp"

namespace sm::host {
namespace {

constexpr std::int32_t kLongestName = 64;
constexpr std::int32_t kInterfaceMajor = 5;

using VersionEntry = std::int32_t (*)(HostServices* handle, std::int32_t* major, std::int32_t* minor);
using ExtensionEntry = void* (*)(void* unused, void* owner);

// A number in an error line.
struct Digits {
  explicit Digits(std::int32_t number) { std::snprintf(text, sizeof text, "%d", static_cast<int>(number)); }
  char text[12];
};

bool is_plain(wchar_t c) {
  return (c >= L'a' && c <= L'z') || (c >= L'A' && c <= L'Z') || (c >= L'0' && c <= L'9') || c == L'_';
}

// The name in ASCII, so that it can be neither a path nor an option of the file system's encoding.
bool narrow(const wchar_t* name, std::int64_t length, char (&ascii)[kLongestName + 1]) {
  if (!name || length < 1 || length > kLongestName) return false;
  for (std::int64_t i = 0; i < length; ++i) {
    if (!is_plain(name[i])) return false;
    ascii[i] = static_cast<char>(name[i]);
  }
  ascii[length] = '\0';
  return true;
}

// The first file of that name on the search path. Whatever it is, no later one is tried: a broken installation is told,
// not papered over by an older copy.
bool locate(Loader& loader, const char* ascii, char (&file)[PATH_MAX]) {
  for (const SearchPath* path = loader.paths; path; path = path->next) {
    const int written = std::snprintf(file, sizeof file, "%s/lib%s.so", path->directory, ascii);
    if (written > 0 && static_cast<std::size_t>(written) < sizeof file && access(file, F_OK) == 0) return true;
  }
  const bool folders = loader.paths && loader.paths->next;
  load_failed(loader, {"lib", ascii, ".so: not found beside the host library",
                       folders ? ", nor in the folders added to the search" : ""});
  return false;
}

// Keeps one handle of each library until the host goes.
bool keep(Loader& loader, void* handle) {
  for (const LoadedLibrary* library = loader.libraries; library; library = library->next) {
    if (library->handle != handle) continue;
    dlclose(handle);  // gives back the second count only
    return true;
  }
  auto* library = static_cast<LoadedLibrary*>(std::malloc(sizeof(LoadedLibrary)));
  if (!library) {
    dlclose(handle);
    return false;
  }
  *library = {loader.libraries, handle};
  loader.libraries = library;
  return true;
}

// A symbol that the library itself defines. dlsym also looks through what the library depends on, where a chance
// namesake would be called as an entry.
void* own_symbol(void* handle, const char* symbol) {
  void* address = dlsym(handle, symbol);
  if (!address) return nullptr;
  link_map* library = nullptr;
  link_map* definer = nullptr;
  Dl_info info = {};
  if (dlinfo(handle, RTLD_DI_LINKMAP, &library) != 0) return nullptr;
  if (dladdr1(address, &info, reinterpret_cast<void**>(&definer), RTLD_DL_LINKMAP) == 0) return nullptr;
  return definer == library ? address : nullptr;
}

const char* dl_cause() {
  const char* cause = dlerror();
  return cause ? cause : "unknown cause";
}

void* open_library(Loader& loader, const char* file) {
  void* handle = dlopen(file, RTLD_NOW | RTLD_LOCAL);
  if (!handle) return load_failed(loader, {file, ": cannot be loaded: ", dl_cause()});
  if (!keep(loader, handle)) return load_failed(loader, {file, ": out of memory"});
  return handle;
}

// Hands over the services and calls the entry.
void* start(QxHost& host, void* handle, const char* file, const char* ascii) {
  Loader& loader = host.loader;
  const auto version = reinterpret_cast<VersionEntry>(own_symbol(handle, "qxextver"));
  if (!version) return load_failed(loader, {file, ": has no qxextver"});
  const auto entry = reinterpret_cast<ExtensionEntry>(own_symbol(handle, ascii));
  if (!entry) return load_failed(loader, {file, ": has no entry ", ascii});
  std::int32_t major = 0;
  std::int32_t minor = 0;
  if (const std::int32_t answer = version(&host.services, &major, &minor); answer != 0) {
    return load_failed(loader, {file, ": its qxextver answered ", Digits(answer).text});
  }
  if (major != kInterfaceMajor) {
    return load_failed(loader, {file, ": speaks interface ", Digits(major).text, ".", Digits(minor).text,
                                ", this host speaks ", Digits(kInterfaceMajor).text});
  }
  const std::int64_t failures = loader.failures;
  void* extension = entry(nullptr, nullptr);
  if (extension) return extension;
  if (loader.failures == failures) return load_failed(loader, {file, ": its entry ", ascii, " answered null"});
  char within[sizeof loader.error];  // it failed because one that it loads did
  std::memcpy(within, loader.error, sizeof within);
  return load_failed(loader, {file, ": its entry ", ascii, " answered null (", within, ")"});
}

}  // namespace

std::nullptr_t load_failed(Loader& loader, std::initializer_list<const char*> parts) {
  char* end = loader.error;
  const char* limit = loader.error + sizeof loader.error - 1;
  for (const char* part : parts) {
    for (; *part && end < limit; ++part) *end++ = *part == '\n' ? ' ' : *part;
  }
  *end = '\0';
  ++loader.failures;
  return nullptr;
}

bool add_search_path(Loader& loader, const char* directory) {
  if (!directory || !*directory) return false;
  auto* path = static_cast<SearchPath*>(std::calloc(1, sizeof(SearchPath)));
  if (!path) return false;
  path->directory = strdup(directory);
  if (!path->directory) {
    std::free(path);
    return false;
  }
  SearchPath** link = &loader.paths;
  while (*link) link = &(*link)->next;
  *link = path;
  return true;
}

bool begin_search_beside_host(Loader& loader) {
  Dl_info self = {};
  if (dladdr(reinterpret_cast<const void*>(&qxhost_create), &self) == 0 || !self.dli_fname) return false;
  char file[PATH_MAX];
  const int written = std::snprintf(file, sizeof file, "%s", self.dli_fname);
  if (written < 0 || static_cast<std::size_t>(written) >= sizeof file) return false;
  char* slash = std::strrchr(file, '/');
  if (slash == file) return add_search_path(loader, "/");
  if (slash) *slash = '\0';
  // Made absolute now, because the program may change its working folder before it loads.
  char* directory = realpath(slash ? file : ".", nullptr);
  const bool added = add_search_path(loader, directory);
  std::free(directory);
  return added;
}

void* load_extension(QxHost& host, const wchar_t* name, std::int64_t length) {
  Loader& loader = host.loader;
  char ascii[kLongestName + 1];
  if (!narrow(name, length, ascii)) {
    return load_failed(
        loader, {"extension name: 1 to ", Digits(kLongestName).text, " letters, digits and underscores expected"});
  }
  char file[PATH_MAX];
  if (!locate(loader, ascii, file)) return nullptr;
  void* handle = open_library(loader, file);
  if (!handle) return nullptr;
  void* extension = start(host, handle, file, ascii);
  if (!extension || !host.checker || std::strcmp(ascii, "qxeavl") != 0) return extension;
  auto* real = static_cast<TreeExtension*>(extension);
  TreeExtension* watched = watch_trees(host, real);
  if (!watched) {
    real->destroy(real);
    return load_failed(loader, {file, ": out of memory"});
  }
  return watched;
}

void unload_all(Loader& loader) {
  while (LoadedLibrary* library = loader.libraries) {
    loader.libraries = library->next;
    dlclose(library->handle);
    std::free(library);
  }
  while (SearchPath* path = loader.paths) {
    loader.paths = path->next;
    std::free(path->directory);
    std::free(path);
  }
}

}  // namespace sm::host
