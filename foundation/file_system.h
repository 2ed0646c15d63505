// File-system operations: the only places that call access, unlink, readlink and symlink. What must
// take an empty directory away as well calls remove(3), which is std::remove.
//
// Each is one system call. A path goes to the system unchanged: nothing is normalised or joined. An
// operation that fails writes its warning, which names the path, and then throws the error number
// of the failed call as a plain int. Absence (ENOENT) is no failure where it is ordinary, as stated
// below.

#ifndef KELVANE_FOUNDATION_FILE_SYSTEM_H_
#define KELVANE_FOUNDATION_FILE_SYSTEM_H_

#include <string>

namespace kelvane {

// Whether something is at `path`. Links are followed: a link whose target is missing counts as
// absent, and so does whatever cannot be reached. Never warns, never throws.
bool exists(const std::string& path);

// Removes the file or the link (never its target) at `path`; a missing path is no failure.
// Warns "remove: could not remove PATH", as for a directory, which stays.
void remove(const std::string& path);

// The text that the link at `path` holds, cut to its first 1,024 bytes, or the empty string when
// nothing is at `path`. Warns "read_symlink: PATH", as for a file or a directory (EINVAL).
std::string read_symlink(const std::string& path);

// Makes a link at `link_path` that holds `target` unchanged; the target need not exist.
// Warns "create_symlink: from LINK_PATH to TARGET", as when something is at `link_path` already
// (EEXIST), which stays.
void create_symlink(const std::string& target, const std::string& link_path);

}  // namespace kelvane

#endif  // KELVANE_FOUNDATION_FILE_SYSTEM_H_
