// The calls by which a run reads and changes links, seen before they happen.

#ifndef KELVANE_TESTS_SYSTEM_CALLS_H_
#define KELVANE_TESTS_SYSTEM_CALLS_H_

#include <functional>
#include <string>

namespace kelvane {

// Is told a call, such as "unlink ~/icutz", and answers 0 to let it happen or the error number with
// which it fails instead.
using watcher = std::function<int(const std::string& call)>;

// Runs the program's main() in this process, its calls watched.
int run_watched(const watcher& watch);

}  // namespace kelvane

#endif  // KELVANE_TESTS_SYSTEM_CALLS_H_
