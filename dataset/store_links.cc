#include "dataset/store_links.h"

#include <cstddef>
#include <string_view>

#include "dataset/orv_dataset.h"
#include "dataset/orv_zoneinfo.h"
#include "foundation/file_system.h"
#include "foundation/warning.h"

namespace kelvane {
namespace {

constexpr char latest_link[] = "/var/db/timezone/tz_latest";

}  // namespace

void reset_to_system_partition() { orv_dataset().activate(); }

std::string latest_dataset_path() { return read_symlink(latest_link); }

std::string current_dataset_path() { return dataset_path_from_link(read_symlink(zoneinfo_link)); }

std::string dataset_path_from_link(const std::string& target) {
  if (target == system_zoneinfo) return std::string();
  if (is_below_downloads(target)) {
    // The last element, whatever it is, stands for the zoneinfo directory of the data set.
    const std::size_t last_slash = target.rfind('/');
    if (last_slash > std::string_view(downloads_directory).size()) {
      return target.substr(0, last_slash);
    }
  }
  warn("Bad zoneinfo link %s", target.c_str());
  throw -1;
}

}  // namespace kelvane
