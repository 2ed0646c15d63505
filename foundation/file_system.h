// File-system operations: the only places that call access, unlink, readlink, symlink or remove(3).
//
// A path goes to the system unchanged: nothing is normalised or joined. remove(), read_symlink()
// and create_symlink() warn when their call fails, naming the path, and then throw its error number
// as a plain int. Absence (ENOENT) is no failure where it is ordinary, as stated below; a file
// where the path wants a directory (ENOTDIR) is one.

#ifndef KELVANE_FOUNDATION_FILE_SYSTEM_H_
#define KELVANE_FOUNDATION_FILE_SYSTEM_H_

#include <string>

namespace kelvane {

// Whether something is at `path`. Links are followed: a link whose target is missing counts as
// absent, and so does whatever cannot be reached. Never warns, never throws.
bool exists(const std::string& path);

// Removes the file or the link (never its target) at `path`; a missing path is no failure.
// Warns "remove: could not remove PATH", as for a directory, which stays.
//
// Call it by its full name outside this namespace: with a using directive, a string literal would
// go to the C library's remove(3) without a word.
void remove(const std::string& path);

// Removes the file, the link or the empty directory at `path`, as remove(3) does; where that fails,
// what is there stays. Never warns, never throws.
void discard(const std::string& path);

// The text that the link at `path` holds, cut to its first 1,024 bytes, or the empty string when
// nothing is at `path`. Warns "read_symlink: PATH", as for a file or a directory (EINVAL).
std::string read_symlink(const std::string& path);

// Makes a link at `link_path` that holds `target` unchanged; the target need not exist.
// Warns "create_symlink: from LINK_PATH to TARGET", as when something is at `link_path` already
// (EEXIST), which stays.
void create_symlink(const std::string& target, const std::string& link_path);

}  // namespace kelvane

#endif  // KELVANE_FOUNDATION_FILE_SYSTEM_H_
