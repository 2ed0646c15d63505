// Warnings: the only output of the utility.

#ifndef KELVANE_FOUNDATION_WARNING_H_
#define KELVANE_FOUNDATION_WARNING_H_

namespace kelvane {

// Writes one line on standard error with the C library's warn(3): "kelvane: ", the message made
// from the printf(3) format, ": ", the text of the current error number and a newline. Guarantees:
//
//  1. The line leaves in a single write, as long as it fits the buffer that prepare_warnings() gave
//     to the stream, so that lines of several programs in one log do not interleave.
//  2. The current error number is the same before and after, so that a second warning about the
//     same failure ends in the same text.
//  3. A line that cannot be written is lost, and nothing else happens. Only a reader that does not
//     read, as of a full pipe, holds the run.
//
// Example: with errno at EISDIR, warn("remove: could not remove %s", "/var/db/icutz") writes
//   kelvane: remove: could not remove /var/db/icutz: Is a directory
//
// The texts of the messages are an interface: those who watch the logs of a fleet search for them,
// and kelvane(8) explains them word for word. So their oddities stay.
[[gnu::format(printf, 1, 2)]] void warn(const char* format, ...);

// Makes warn() keep its guarantees, however the process was started: called once, first of all. It
// ignores SIGPIPE and SIGXFSZ, buffers standard error fully and sets the program's short name.
void prepare_warnings();

}  // namespace kelvane

#endif  // KELVANE_FOUNDATION_WARNING_H_
