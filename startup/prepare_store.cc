#include "startup/prepare_store.h"

#include <fcntl.h>

#include <string>

#include "dataset/orv_dataset.h"
#include "foundation/descriptor.h"

namespace kelvane {
namespace {

constexpr char store_directory[] = "/var/db/timezone/";

void set_protection_class(const std::string& path) {
  // This system has no data-protection classes: once a file system is mounted, its files stay
  // readable and writable in every lock state, which is all that is wanted. The fcntl(2) command
  // for it on systems that have them is not sent: its number is free here, and may mean anything
  // tomorrow.
  const descriptor directory(path, O_RDONLY);
}

}  // namespace

void prepare_store() {
  for (const char* const directory : {store_directory, downloads_directory}) {
    try {
      set_protection_class(directory);
    } catch (...) {
      // Memory has run out; the stages that need the store will say so.
    }
  }
}

}  // namespace kelvane
