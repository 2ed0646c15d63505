// Stage 4: the decision which data set the store's links select.

#ifndef KELVANE_STARTUP_SELECT_DATASET_H_
#define KELVANE_STARTUP_SELECT_DATASET_H_

namespace kelvane {

// Makes the store's zoneinfo and ICU links select a usable data set:
//
//  1. Links that select none are reset to the system partition, after the warning "Invalid current
//     symlinks; resetting to system partition".
//  2. So are links that select a data set which is incompatible with the system partition's, or
//     older: "Symlink points at data incompatible with installed system".
//  3. The newest download, if there is one, is then activated when it is compatible with the system
//     partition's data set and newer than the one that the links selected at first, be it rejected
//     or not. "/var/db/timezone/TZVersionDiffRecord" then holds the version texts of the data set
//     active before and of the download, as in 2022a.1.0_2023c.1.0. A record that cannot be written
//     is no failure. A download that is not activated is reported: "New update not compatible or
//     older version: UPDATE vs. CURRENT".
//  4. Where any of this fails, the links are reset to the system partition after the warning
//  "Unable
//     to locate data; resetting to system partition".
//
// Throws what that last reset throws.
void select_dataset();

}  // namespace kelvane

#endif  // KELVANE_STARTUP_SELECT_DATASET_H_
