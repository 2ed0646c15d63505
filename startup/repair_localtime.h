// Stage 5: the link that names the device's local time zone.

#ifndef KELVANE_STARTUP_REPAIR_LOCALTIME_H_
#define KELVANE_STARTUP_REPAIR_LOCALTIME_H_

namespace kelvane {

// Makes the link "/var/db/timezone/localtime" lead through the store's zoneinfo link:
//
//  1. A target that begins with "/var/db/timezone/zoneinfo" stays, whether its zone exists or not.
//  2. In a target that begins with "/usr/share/zoneinfo", that text is replaced by
//     "/var/db/timezone/zoneinfo", after the warning "Correcting localtime link to TARGET" and
//     provided that the result exists.
//  3. Anything else, be it a missing link, a file, an empty directory or a failure of 1 or 2, is
//     replaced by a link to the default zone: "localtime link invalid; resetting to
//     America/Los_Angeles".
//
// Beginnings are compared as text: whatever character comes next, and no target is resolved.
// Throws the int error number when the link to the default zone cannot be created, after its
// warning; std::bad_alloc when memory runs out before.
void repair_localtime();

}  // namespace kelvane

#endif  // KELVANE_STARTUP_REPAIR_LOCALTIME_H_
