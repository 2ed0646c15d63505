// The store's links in terms of data sets: what they say, and how they are reset.
//
// A data set is named by its directory, in the form that orv_dataset takes: empty for the system
// partition. Link targets are texts; none is resolved.

#ifndef KELVANE_DATASET_STORE_LINKS_H_
#define KELVANE_DATASET_STORE_LINKS_H_

#include <string>

namespace kelvane {

// Makes the links select the system partition's data set: the zoneinfo link is made anew, the ICU
// link and the legacy ICU link are removed. Throws what the data set's construction and activate()
// throw.
void reset_to_system_partition();

// The target of "/var/db/timezone/tz_latest", by which other software names the newest download,
// as it is; empty when there is no such link. Warns and throws as read_symlink() does.
std::string latest_dataset_path();

// The directory of the data set that the zoneinfo link selects. Warns and throws as read_symlink()
// and dataset_path_from_link() do; a missing link counts as an empty target.
std::string current_dataset_path();

// The directory of the data set that a zoneinfo link with this target selects:
//
//  1. For exactly the system partition's zoneinfo directory, the empty string.
//  2. For `downloads_directory` and a text with a slash after its first byte, the target up to its
//     last slash: "/var/db/timezone/tz/2022b.1.1/zoneinfo" gives "/var/db/timezone/tz/2022b.1.1".
//  3. For anything else, such as "/var/db/timezone/tz/2022b" or "/var/db/timezone/tz//zoneinfo",
//     none: warns "Bad zoneinfo link TARGET" and throws the int -1, which is no error number.
std::string dataset_path_from_link(const std::string& target);

}  // namespace kelvane

#endif  // KELVANE_DATASET_STORE_LINKS_H_
