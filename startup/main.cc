// kelvane: one pass over the time-zone data of a device that starts.

#include <cstdio>
#include <cstdlib>

#include "foundation/warning.h"
#include "startup/migrate_legacy_icutz.h"
#include "startup/prepare_process.h"
#include "startup/prepare_store.h"
#include "startup/repair_localtime.h"
#include "startup/select_dataset.h"

namespace {

// Names the program inside the executable; kept though nothing refers to it.
[[gnu::used, gnu::retain]] const char identification[] =
    "@(#)PROGRAM:kelvane  PROJECT:Orvalen-80\n";

// Left by older layouts: a link, a file or an empty directory. Anything else there stays.
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

}  // namespace

int main() {
  kelvane::prepare_process();
  kelvane::prepare_store();
  kelvane::migrate_legacy_icutz();
  std::remove(obsolete_icu);  // Stage 3.
  const bool selected = completes(kelvane::select_dataset, "Could not reset to system partition");
  const bool repaired = completes(kelvane::repair_localtime, "Could not reset localtime link");
  return selected && repaired ? EXIT_SUCCESS : EXIT_FAILURE;
}
