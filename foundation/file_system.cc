#include "foundation/file_system.h"

#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstdio>

#include "foundation/warning.h"

namespace kelvane {

bool exists(const std::string& path) { return ::access(path.c_str(), F_OK) == 0; }

void remove(const std::string& path) {
  if (::unlink(path.c_str()) == 0) return;
  const int error = errno;
  if (error == ENOENT) return;
  warn("remove: could not remove %s", path.c_str());
  throw error;
}

void discard(const std::string& path) { std::remove(path.c_str()); }

std::string read_symlink(const std::string& path) {
  char target[1024];
  const ssize_t length = ::readlink(path.c_str(), target, sizeof target);
  if (length != -1) return std::string(target, static_cast<std::size_t>(length));
  const int error = errno;
  if (error == ENOENT) return std::string();
  warn("read_symlink: %s", path.c_str());
  throw error;
}

void create_symlink(const std::string& target, const std::string& link_path) {
  if (::symlink(target.c_str(), link_path.c_str()) == 0) return;
  const int error = errno;
  warn("create_symlink: from %s to %s", link_path.c_str(), target.c_str());
  throw error;
}

}  // namespace kelvane
