// An open file.

#ifndef KELVANE_FOUNDATION_DESCRIPTOR_H_
#define KELVANE_FOUNDATION_DESCRIPTOR_H_

#include <fcntl.h>
#include <unistd.h>

#include <string>

namespace kelvane {

// The descriptor of what stands at a path, closed at the end of the scope.
class descriptor {
 public:
  // Opens `path`, links followed, with the flags of open(2) and O_CLOEXEC. With O_CREAT a missing
  // file is made with the permissions that the umask leaves of 0666. Reports nothing.
  descriptor(const std::string& path, int flags)
      : number(::open(path.c_str(), flags | O_CLOEXEC, 0666)) {}
  ~descriptor() {
    if (number != -1) ::close(number);
  }
  descriptor(const descriptor&) = delete;
  descriptor& operator=(const descriptor&) = delete;

  // The descriptor for system calls; -1 where nothing could be opened.
  const int number;
};

}  // namespace kelvane

#endif  // KELVANE_FOUNDATION_DESCRIPTOR_H_
