// The ICU time-zone data of a data set.

#ifndef KELVANE_DATASET_ORV_ICU_H_
#define KELVANE_DATASET_ORV_ICU_H_

#include <string>

#include "dataset/orv_dataset_component.h"

namespace kelvane {

// The store's link to the active ICU directory. A reset to the system partition's leaves none.
inline constexpr char icu_link[] = "/var/db/timezone/icutz";

// Where that link was in an older layout of the store.
inline constexpr char legacy_icu_link[] = "/var/db/icutz";

// An ICU directory, DIRECTORY/icutz for a data set in DIRECTORY, with the schema of its data: a
// number and one of the letters l, b and e, such as 44l. Schemas are texts: 44l and 044l differ.
class orv_icu final : public orv_dataset_component {
 public:
  // The system partition's ICU directory.
  orv_icu();

  // That of the data set in `directory`, which is taken as it is; the empty string stands for the
  // system partition. The schema is:
  //
  //  1. On the system partition, the first word of the file "icutzformat.txt", or empty.
  //  2. In a release, 44l for a file icutz44l.dat; of several such files, the first that the system
  //     lists counts. It must lie directly in the ICU directory, which may be a link, be a regular
  //     file, and be readable by others, since all users' programs read it. Where there is none, be
  //     it that the ICU directory is missing or cannot be read, the schema is empty, after the
  //     warning "No ICU schema found for DIRECTORY".
  //
  // Throws the int error number when memory is short or the path too long for a search, after the
  // warning "tz_icu::initialize: fts_open of ICU_DIRECTORY failed, ERROR".
  explicit orv_icu(const std::string& directory);

  // Whether `other` is an ICU directory of the same schema, the empty one included. Warns
  // "orv_icu::compatible_schema: could not dynamic_cast other component" for another kind.
  bool compatible_schema(const orv_dataset_component& other) const override;

  // Removes `icu_link`, then `legacy_icu_link`; then, unless this is the system partition's, makes
  // `icu_link` hold this directory. A link that cannot be removed is reported with "unlink of ICU
  // softlink failed", after the warning of remove(); if it is `icu_link`, the other stays as well.
  void activate() const override;

 private:
  void initialize();

  std::string schema;
  const std::string path;
};

}  // namespace kelvane

#endif  // KELVANE_DATASET_ORV_ICU_H_
