#include "dataset/orv_icu.h"

#include <fts.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <vector>

#include "foundation/byte_regex.h"
#include "foundation/file_system.h"
#include "foundation/first_word.h"
#include "foundation/warning.h"

namespace kelvane {
namespace {

constexpr char system_icu[] = "/usr/share/icu";

// Otherwise a large file, or one from after 2038, could be neither opened nor seen.
static_assert(sizeof(off_t) >= 8 && sizeof(time_t) >= 8);

struct fts_closer {
  void operator()(FTS* traversal) const { ::fts_close(traversal); }
};
using fts_handle = std::unique_ptr<FTS, fts_closer>;

// On 32-bit machines glibc checks a directory that it changes to with a stat(2) of its own, whose
// times have 32 bits: one from after 2038 could not be read. There FTS_NOCHDIR keeps it from that.
constexpr int stay_on_32_bits = sizeof(long) < 8 ? FTS_NOCHDIR : 0;

// The entries come in the directory's own order, the root followed if it is a link, others not.
fts_handle open_traversal(const std::string& root) {
  std::string root_argument = root;
  char* const roots[] = {root_argument.data(), nullptr};
  constexpr int options = FTS_COMFOLLOW | FTS_PHYSICAL | FTS_XDEV | stay_on_32_bits;
  fts_handle traversal(::fts_open(roots, options, nullptr));
  if (traversal == nullptr) {
    const int error = errno;
    warn("tz_icu::initialize: fts_open of %s failed, %s", root.c_str(), std::strerror(error));
    throw error;
  }
  return traversal;
}

bool may_be_data_file(const FTSENT& entry) {
  return entry.fts_errno == 0 && entry.fts_level == 1 && entry.fts_namelen != 0 &&
         entry.fts_info == FTS_F && (entry.fts_statp->st_mode & S_IROTH) != 0;
}

// The schema in the name of the first data file directly in `directory`; empty where there is none.
std::string find_schema(const std::string& directory) {
  const std::wregex pattern = byte_regex(L"icutz([0-9]+[lbe])\\.dat");
  const fts_handle traversal = open_traversal(directory);
  std::string schema;
  while (const FTSENT* const entry = ::fts_read(traversal.get())) {
    if (!schema.empty()) break;
    if (!may_be_data_file(*entry)) continue;
    const std::vector<std::string> name = full_match(entry->fts_name, pattern);
    if (!name.empty()) schema = name[1];
  }
  return schema;
}

}  // namespace

orv_icu::orv_icu() : orv_icu(std::string()) {}

orv_icu::orv_icu(const std::string& directory)
    : orv_dataset_component(directory),
      path(directory.empty() ? system_icu : directory + "/icutz") {
  initialize();
}

void orv_icu::initialize() {
  if (dataset_path.empty()) {
    schema = first_word(path + "/icutzformat.txt");
    return;
  }
  schema = find_schema(path);
  if (schema.empty()) warn("No ICU schema found for %s", dataset_path.c_str());
}

bool orv_icu::compatible_schema(const orv_dataset_component& other) const {
  const auto* const other_icu = dynamic_cast<const orv_icu*>(&other);
  if (other_icu == nullptr) {
    warn("orv_icu::compatible_schema: could not dynamic_cast other component");
    return false;
  }
  return schema == other_icu->schema;
}

void orv_icu::activate() const {
  try {
    remove(icu_link);
    remove(legacy_icu_link);
  } catch (...) {
    warn("unlink of ICU softlink failed");
  }
  if (!dataset_path.empty()) create_symlink(path, icu_link);
}

}  // namespace kelvane
