// The calls "remove", "symlink" and "unlink" of a run, seen before they happen. Only one source may
// include this, since it defines what the linker's --wrap calls.

#ifndef KELVANE_TESTS_SYSTEM_CALLS_H_
#define KELVANE_TESTS_SYSTEM_CALLS_H_

#include <cerrno>
#include <cstdlib>
#include <functional>
#include <string>

int kelvane_main();  // The program's main(), under a name of its own.

namespace kelvane {

// Is asked before each call: 0 lets it happen, an error number makes it fail.
inline std::function<int(const std::string& call)> watching;

// Becomes a run that is watched.
[[noreturn]] inline void run_watched(const decltype(watching)& watch) {
  watching = watch;
  std::exit(kelvane_main());
}

inline bool fails(const std::string& call) {
  const int error = watching ? watching(call) : 0;
  if (error != 0) errno = error;
  return error != 0;
}

extern "C" {
int __real_remove(const char*);
int __real_symlink(const char*, const char*);
int __real_unlink(const char*);

int __wrap_remove(const char* path) { return fails("remove") ? -1 : __real_remove(path); }
int __wrap_symlink(const char* target, const char* path) {
  return fails("symlink") ? -1 : __real_symlink(target, path);
}
int __wrap_unlink(const char* path) { return fails("unlink") ? -1 : __real_unlink(path); }
}

}  // namespace kelvane

#endif  // KELVANE_TESTS_SYSTEM_CALLS_H_
