// A time-zone data set: a release of the data, on the system partition or in the store.

#ifndef KELVANE_DATASET_ORV_DATASET_H_
#define KELVANE_DATASET_ORV_DATASET_H_

#include <memory>
#include <string>
#include <vector>

#include "dataset/orv_dataset_component.h"
#include "foundation/tz_version.h"

namespace kelvane {

// The directory of the downloaded data sets: each lies in a directory below, whose name is its
// version text.
inline constexpr char downloads_directory[] = "/var/db/timezone/tz/";

// Whether `path` begins with `downloads_directory` and is longer.
bool is_below_downloads(const std::string& path);

// A data set, named by its directory: the empty string for the system partition, otherwise
// `downloads_directory` and the version text. No operation changes it.
class orv_dataset {
 public:
  // The system partition's data set; warns and throws as the next one does.
  orv_dataset();

  // The data set in `directory`, which is the empty string, or `downloads_directory` and a text
  // that is not empty, be it "x/y" or "2022b/". A text that is no version is warned about, as
  // tz_version::parse() does, and is older than every version.
  //
  // For any other directory, warns "orv_dataset::create_components: bad path DIRECTORY" and throws
  // std::invalid_argument("badpath"). Throws std::out_of_range for a version number that is too
  // large, and whatever the components' constructors throw.
  explicit orv_dataset(const std::string& directory);

  // The version text as found, for messages and the record: 2022b.1.1 for
  // "/var/db/timezone/tz/2022b.1.1", and 2022a.1.0 where the system partition's "+VERSION" holds
  // 2022a. Never empty.
  std::string get_version_string() const;

  // Whether each component can stand in for its counterpart in `other`, the one at the same
  // position; false where one data set has more components than the other. Stops at the first that
  // cannot.
  bool compatible_schema(const orv_dataset& other) const;

  // Makes the store's links select this data set: the zoneinfo link first, then the ICU link.
  // Throws as the components' activate() does, after their warnings, and leaves the rest undone.
  void activate() const;

  // Whether this version is newer than that of `other`; an equal one is not.
  bool is_newer_than(const orv_dataset& other) const;

  // Whether both data sets were named by the same text.
  bool same_path(const orv_dataset& other) const;

 private:
  void create_components();

  tz_version version;
  std::string version_string;
  std::string path;
  std::vector<std::shared_ptr<const orv_dataset_component>> components;
};

}  // namespace kelvane

#endif  // KELVANE_DATASET_ORV_DATASET_H_
