// kelvane: one pass over the time-zone data of a device that starts.

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>

#include "foundation/warning.h"
#include "startup/migrate_legacy_icutz.h"
#include "startup/prepare_store.h"
#include "startup/repair_localtime.h"
#include "startup/select_dataset.h"

namespace {

// Names the program inside the executable; kept though nothing refers to it.
[[gnu::used, gnu::retain]] const char identification[] =
    "@(#)PROGRAM:kelvane  PROJECT:Orvalen-80\n";

constexpr char obsolete_icu[] = "/var/db/icu";

// Runs a stage that may fail for good; where it does, says so and returns false.
bool completes(void (*stage)(), const char* complaint) {
  try {
    stage();
    return true;
  } catch (...) {
    kelvane::warn("%s", complaint);
    return false;
  }
}

[[noreturn]] void give_up() {
  kelvane::warn("Could not go on");
  std::_Exit(EXIT_FAILURE);
}

// What is left when memory runs out where no handler can catch it: while an exception is raised,
// or in the C library's fts_open(3), which uses the memory for its root whether granted or not.
void prepare_to_give_up() {
  std::set_terminate(give_up);
  std::signal(SIGSEGV, [](int) { give_up(); });
}

}  // namespace

int main() {
  prepare_to_give_up();
  kelvane::prepare_warnings();
  kelvane::prepare_store();
  kelvane::migrate_legacy_icutz();
  std::remove(obsolete_icu);
  const bool selected = completes(kelvane::select_dataset, "Could not reset to system partition");
  const bool repaired = completes(kelvane::repair_localtime, "Could not reset localtime link");
  return selected && repaired ? EXIT_SUCCESS : EXIT_FAILURE;
}
