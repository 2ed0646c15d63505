// Stage 2: the ICU link of the older store layout.

#ifndef KELVANE_STARTUP_MIGRATE_LEGACY_ICUTZ_H_
#define KELVANE_STARTUP_MIGRATE_LEGACY_ICUTZ_H_

namespace kelvane {

// Where "/var/db/icutz" leads to something, gives "/var/db/timezone/icutz" the same target, unless
// that leads to something itself, and removes the old link. Failures are warned about, "Could not
// migrate /var/db/icutz to /var/db/timezone/icutz" and "Could not remove /var/db/icutz", and stop
// neither step. Throws nothing.
void migrate_legacy_icutz();

}  // namespace kelvane

#endif  // KELVANE_STARTUP_MIGRATE_LEGACY_ICUTZ_H_
