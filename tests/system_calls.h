// The calls by which a run reads and changes links, seen before they happen.

#ifndef KELVANE_TESTS_SYSTEM_CALLS_H_
#define KELVANE_TESTS_SYSTEM_CALLS_H_

#include <functional>

namespace kelvane {

// Becomes a run before each of whose calls `watch` is asked: 0 lets it happen, an error number
// makes it fail.
[[noreturn]] void run_watched(const std::function<int()>& watch);

}  // namespace kelvane

#endif  // KELVANE_TESTS_SYSTEM_CALLS_H_
