#include "startup/select_dataset.h"

#include <fcntl.h>
#include <unistd.h>

#include <string>

#include "dataset/orv_dataset.h"
#include "dataset/store_links.h"
#include "foundation/descriptor.h"
#include "foundation/warning.h"

namespace kelvane {
namespace {

constexpr char version_difference_record[] = "/var/db/timezone/TZVersionDiffRecord";

std::string current_path_or_reset() {
  try {
    return current_dataset_path();
  } catch (...) {
    warn("Invalid current symlinks; resetting to system partition");
    reset_to_system_partition();
    return std::string();
  }
}

bool is_usable(const orv_dataset& current, const orv_dataset& system) {
  return current.compatible_schema(system) && !system.is_newer_than(current);
}

void write_version_difference(const orv_dataset& active, const orv_dataset& update) {
  // All memory is taken before the old record is emptied.
  const std::string text = active.get_version_string() + "_" + update.get_version_string();
  // Without O_NONBLOCK a named pipe in the record's place would hold the run until somebody reads.
  const descriptor record(version_difference_record, O_WRONLY | O_CREAT | O_TRUNC | O_NONBLOCK);
  if (record.number == -1) return;
  [[maybe_unused]] const ssize_t written = ::write(record.number, text.data(), text.size());
}

// `current` and not `active` is what an update is measured against: a rejected data set's version
// still counts, so that an update newer than it is taken.
void consider_update(const orv_dataset& update, const orv_dataset& system,
                     const orv_dataset& current, const orv_dataset& active) {
  if (!update.compatible_schema(system) || !update.is_newer_than(current)) {
    warn("New update not compatible or older version: %s vs. %s",
         update.get_version_string().c_str(), current.get_version_string().c_str());
    return;
  }
  update.activate();
  write_version_difference(active, update);
}

void select_or_throw() {
  const orv_dataset system;
  // Before the zoneinfo link, which is not even read where this one is unreadable.
  const std::string update_path = latest_dataset_path();
  const orv_dataset current(current_path_or_reset());
  const bool usable = is_usable(current, system);
  if (!usable) {
    warn("Symlink points at data incompatible with installed system");
    reset_to_system_partition();
  }
  if (update_path.empty()) return;
  consider_update(orv_dataset(update_path), system, current, usable ? current : system);
}

}  // namespace

void select_dataset() {
  try {
    select_or_throw();
  } catch (...) {
    warn("Unable to locate data; resetting to system partition");
    reset_to_system_partition();
  }
}

}  // namespace kelvane
