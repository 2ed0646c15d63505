#include "dataset/orv_zoneinfo.h"

#include "foundation/file_system.h"
#include "foundation/first_word.h"
#include "foundation/warning.h"

namespace kelvane {

orv_zoneinfo::orv_zoneinfo() : orv_zoneinfo(std::string()) {}

orv_zoneinfo::orv_zoneinfo(const std::string& directory)
    : orv_dataset_component(directory),
      path(directory.empty() ? system_zoneinfo : directory + "/zoneinfo"),
      version_text(read_version()) {}

std::string orv_zoneinfo::get_version() const { return version_text; }

bool orv_zoneinfo::compatible_schema(const orv_dataset_component&) const { return true; }

void orv_zoneinfo::activate() const {
  try {
    remove(zoneinfo_link);
  } catch (...) {
    warn("Unlink of zoneinfo softlink failed");
  }
  create_symlink(path, zoneinfo_link);
}

std::string orv_zoneinfo::read_version() const { return first_word(path + "/+VERSION"); }

}  // namespace kelvane
