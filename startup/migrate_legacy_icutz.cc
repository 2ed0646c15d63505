#include "startup/migrate_legacy_icutz.h"

#include "dataset/orv_icu.h"
#include "foundation/file_system.h"
#include "foundation/warning.h"

namespace kelvane {

void migrate_legacy_icutz() {
  try {
    if (exists(legacy_icu_link) && !exists(icu_link)) {
      create_symlink(read_symlink(legacy_icu_link), icu_link);
    }
  } catch (...) {
    warn("Could not migrate /var/db/icutz to /var/db/timezone/icutz");
  }
  // Migrated or not: nothing reads the old link any more.
  try {
    if (exists(legacy_icu_link)) remove(legacy_icu_link);
  } catch (...) {
    warn("Could not remove /var/db/icutz");
  }
}

}  // namespace kelvane
