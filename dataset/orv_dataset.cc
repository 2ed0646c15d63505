#include "dataset/orv_dataset.h"

#include <algorithm>
#include <stdexcept>
#include <string_view>

#include "dataset/orv_icu.h"
#include "dataset/orv_zoneinfo.h"
#include "foundation/warning.h"

namespace kelvane {
namespace {

constexpr std::string_view downloads = downloads_directory;

// The system partition's data has no sub-versions of its own.
std::string version_text(const std::string& directory, const orv_zoneinfo& zoneinfo) {
  if (directory.empty()) return zoneinfo.get_version() + ".1.0";
  if (is_below_downloads(directory)) return directory.substr(downloads.size());
  warn("orv_dataset::create_components: bad path %s", directory.c_str());
  throw std::invalid_argument("badpath");
}

}  // namespace

bool is_below_downloads(const std::string& path) {
  return path.size() > downloads.size() && path.starts_with(downloads);
}

orv_dataset::orv_dataset() { create_components(); }

orv_dataset::orv_dataset(const std::string& directory) : path(directory) { create_components(); }

std::string orv_dataset::get_version_string() const { return version_string; }

bool orv_dataset::compatible_schema(const orv_dataset& other) const {
  return std::equal(
      components.begin(), components.end(), other.components.begin(), other.components.end(),
      [](const auto& mine, const auto& theirs) { return mine->compatible_schema(*theirs); });
}

void orv_dataset::activate() const {
  for (const auto& component : components) component->activate();
}

bool orv_dataset::is_newer_than(const orv_dataset& other) const { return version > other.version; }

bool orv_dataset::same_path(const orv_dataset& other) const { return path == other.path; }

void orv_dataset::create_components() {
  const auto zoneinfo = std::make_shared<const orv_zoneinfo>(path);
  version_string = version_text(path, *zoneinfo);
  version.parse(version_string);
  components.push_back(zoneinfo);
  components.push_back(std::make_shared<const orv_icu>(path));
}

}  // namespace kelvane
