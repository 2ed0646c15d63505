// The compiled time zones of a data set.

#ifndef KELVANE_DATASET_ORV_ZONEINFO_H_
#define KELVANE_DATASET_ORV_ZONEINFO_H_

#include <string>

#include "dataset/orv_dataset_component.h"

namespace kelvane {

// The store's link to the active zoneinfo directory.
inline constexpr char zoneinfo_link[] = "/var/db/timezone/zoneinfo";

// The zoneinfo directory of the system partition.
inline constexpr char system_zoneinfo[] = "/usr/share/zoneinfo.default";

// A zoneinfo directory: DIRECTORY/zoneinfo for a data set in DIRECTORY.
class orv_zoneinfo final : public orv_dataset_component {
 public:
  // The system partition's zoneinfo directory.
  orv_zoneinfo();

  // That of the data set in `directory`, which is taken as it is: nothing is normalised, and
  // nothing need exist. The empty string stands for the system partition.
  explicit orv_zoneinfo(const std::string& directory);

  // The release's name, such as 2023c: the first word of the directory's file "+VERSION". Empty
  // when there is none.
  std::string get_version() const;

  // Always true: compiled time zones of every release are interchangeable.
  bool compatible_schema(const orv_dataset_component& other) const override;

  // Makes `zoneinfo_link` hold this directory. A link that cannot be removed is reported with
  // "Unlink of zoneinfo softlink failed", after the warning of remove().
  void activate() const override;

 private:
  std::string read_version() const;

  const std::string path;
  const std::string version_text;
};

}  // namespace kelvane

#endif  // KELVANE_DATASET_ORV_ZONEINFO_H_
