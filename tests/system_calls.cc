#include "tests/system_calls.h"

#include <sys/types.h>

#include <cerrno>
#include <cstdlib>

int kelvane_main();  // The program's main(), under a name of its own.

namespace {

std::function<int()> watching;

bool fails() {
  const int error = watching ? watching() : 0;
  if (error != 0) errno = error;
  return error != 0;
}

}  // namespace

void kelvane::run_watched(const std::function<int()>& watch) {
  watching = watch;
  std::exit(kelvane_main());
}

// The linker's --wrap gives these the calls of the C library's functions.
extern "C" {
ssize_t __real_readlink(const char*, char*, size_t);
int __real_remove(const char*);
int __real_symlink(const char*, const char*);
int __real_unlink(const char*);

ssize_t __wrap_readlink(const char* path, char* text, size_t size) {
  return fails() ? -1 : __real_readlink(path, text, size);
}
int __wrap_remove(const char* path) { return fails() ? -1 : __real_remove(path); }
int __wrap_symlink(const char* target, const char* path) {
  return fails() ? -1 : __real_symlink(target, path);
}
int __wrap_unlink(const char* path) { return fails() ? -1 : __real_unlink(path); }
}
