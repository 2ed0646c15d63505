#include "tests/system_calls.h"

#include <sys/types.h>

#include <cerrno>
#include <regex>

int kelvane_main();  // The program's main(), under a name of its own.

namespace {

kelvane::watcher watching;

bool fails(const std::string& call, const char* path) {
  static const std::regex store("/var/db/timezone");
  const int error = watching ? watching(call + " " + std::regex_replace(path, store, "~")) : 0;
  if (error != 0) errno = error;
  return error != 0;
}

}  // namespace

int kelvane::run_watched(const watcher& watch) {
  watching = watch;
  return kelvane_main();
}

// The linker's --wrap gives these the calls of the C library's functions.
extern "C" {
ssize_t __real_readlink(const char*, char*, size_t);
int __real_remove(const char*);
int __real_symlink(const char*, const char*);
int __real_unlink(const char*);

ssize_t __wrap_readlink(const char* path, char* buffer, size_t size) {
  return fails("readlink", path) ? -1 : __real_readlink(path, buffer, size);
}
int __wrap_remove(const char* path) { return fails("remove", path) ? -1 : __real_remove(path); }
int __wrap_symlink(const char* target, const char* path) {
  return fails("symlink", path) ? -1 : __real_symlink(target, path);
}
int __wrap_unlink(const char* path) { return fails("unlink", path) ? -1 : __real_unlink(path); }
}
