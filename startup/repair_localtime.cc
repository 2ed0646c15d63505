#include "startup/repair_localtime.h"

#include <string>
#include <string_view>

#include "dataset/orv_zoneinfo.h"
#include "foundation/file_system.h"
#include "foundation/warning.h"

namespace kelvane {
namespace {

constexpr char localtime_link[] = "/var/db/timezone/localtime";
constexpr std::string_view legacy_prefix = "/usr/share/zoneinfo";
constexpr char default_zone[] = "America/Los_Angeles";

// By discard(), because an empty directory must give way as well.
void replace_link(const std::string& target) {
  const std::string link = localtime_link;  // Before the removal: memory may run out.
  discard(link);
  create_symlink(target, link);
}

// Throws where the link has to be reset; -1 where no call has failed.
void accept_or_correct_link() {
  std::string target = read_symlink(localtime_link);
  if (target.starts_with(zoneinfo_link)) return;
  if (!target.starts_with(legacy_prefix)) throw -1;
  target.replace(0, legacy_prefix.size(), zoneinfo_link);
  warn("Correcting localtime link to %s", target.c_str());
  if (!exists(target)) throw -1;
  replace_link(target);
}

}  // namespace

void repair_localtime() {
  try {
    accept_or_correct_link();
  } catch (...) {
    warn("localtime link invalid; resetting to %s", default_zone);
    replace_link(std::string(zoneinfo_link) + "/" + default_zone);
  }
}

}  // namespace kelvane
