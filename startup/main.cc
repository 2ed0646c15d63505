// kelvane: one pass over the time-zone data of a device that starts.

#include <cstdlib>

#include "foundation/file_system.h"
#include "foundation/warning.h"
#include "startup/migrate_legacy_icutz.h"
#include "startup/prepare_store.h"
#include "startup/repair_localtime.h"
#include "startup/select_dataset.h"

namespace {

// what(1) prints it: so the executable says what it is, also stripped and under another name. As
// nothing refers to it, compiler and linker would leave it out without the attributes.
[[gnu::used, gnu::retain]] const char identification[] =
    "@(#)PROGRAM:kelvane  PROJECT:Orvalen-80\n";

constexpr char obsolete_icu[] = "/var/db/icu";

// Whether the stage came to its end; warns with `complaint` where it did not.
bool run_stage(void (*stage)(), const char* complaint) {
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
  kelvane::prepare_warnings();
  kelvane::prepare_store();
  kelvane::migrate_legacy_icutz();
  kelvane::discard(obsolete_icu);
  const bool selected = run_stage(kelvane::select_dataset, "Could not reset to system partition");
  const bool repaired = run_stage(kelvane::repair_localtime, "Could not reset localtime link");
  return selected && repaired ? EXIT_SUCCESS : EXIT_FAILURE;
}
