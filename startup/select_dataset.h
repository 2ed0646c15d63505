// Stage 4: the decision which data set the store's links select.

#ifndef KELVANE_STARTUP_SELECT_DATASET_H_
#define KELVANE_STARTUP_SELECT_DATASET_H_

namespace kelvane {

// Makes the store's zoneinfo link select a data set that the system can use. The ICU link follows
// in a reset and in an activation, and is not looked at otherwise.
//
//  1. A zoneinfo link that selects no data set, or cannot be read, is reset to the system
//     partition, after the warning "Invalid current symlinks; resetting to system partition".
//  2. So is one that selects a data set which is incompatible with the system partition's, or
//     older: "Symlink points at data incompatible with installed system".
//  3. The newest download, if there is one, is then activated when it is compatible with the system
//     partition's data set and newer than the one that the link selected after step 1, be it
//     rejected in step 2 or not; it may be older than the system partition's. Otherwise it is
//     reported: "New update not compatible or older version: UPDATE vs. CURRENT".
//  4. After an activation, "/var/db/timezone/TZVersionDiffRecord" holds the version texts of the
//     data set active before and of the download, as in 2022a.1.0_2023c.1.0. A record that cannot
//     be opened or written is no failure.
//  5. Where anything else fails, as a data set that cannot be built, the links are reset after the
//     warning "Unable to locate data; resetting to system partition".
//
// Throws what that last reset throws.
void select_dataset();

}  // namespace kelvane

#endif  // KELVANE_STARTUP_SELECT_DATASET_H_
