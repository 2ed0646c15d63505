#include "foundation/warning.h"

#include <err.h>

#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdio>

namespace kelvane {

void warn(const char* format, ...) {
  const int error = errno;
  std::va_list arguments;
  va_start(arguments, format);
  ::vwarn(format, arguments);
  va_end(arguments);
  std::fflush(stderr);
  errno = error;
}

void prepare_warnings() {
  // A log without a reader and a file at its size limit are failed writes, not ends of the run.
  std::signal(SIGPIPE, SIG_IGN);
  std::signal(SIGXFSZ, SIG_IGN);
  // Fully buffered, because a line-buffered stream would cut a message at a newline in a path.
  static char buffer[BUFSIZ];
  std::setvbuf(stderr, buffer, _IOFBF, sizeof buffer);
  // The same name in the log, whatever argv[0] held.
  static char name[] = "kelvane";
  program_invocation_short_name = name;
}

}  // namespace kelvane
