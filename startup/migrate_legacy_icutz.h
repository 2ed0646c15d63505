// Stage 2: the ICU link of the older store layout.

#ifndef KELVANE_STARTUP_MIGRATE_LEGACY_ICUTZ_H_
#define KELVANE_STARTUP_MIGRATE_LEGACY_ICUTZ_H_

namespace kelvane {

// Where "/var/db/icutz" leads to something:
//
//  1. Gives "/var/db/timezone/icutz" the same target, unless that leads to something itself. Warns
//     "Could not migrate /var/db/icutz to /var/db/timezone/icutz" where this fails, as for a file
//     in the old link's place.
//  2. Removes the old link, or the file in its place, whatever became of step 1. Warns "Could not
//     remove /var/db/icutz" where this fails, as for a directory.
//
// Both warnings follow that of the call that failed. Throws nothing.
void migrate_legacy_icutz();

}  // namespace kelvane

#endif  // KELVANE_STARTUP_MIGRATE_LEGACY_ICUTZ_H_
