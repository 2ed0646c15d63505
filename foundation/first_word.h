// The first word of a text file, the form in which a data set states its version and its schema.

#ifndef KELVANE_FOUNDATION_FIRST_WORD_H_
#define KELVANE_FOUNDATION_FIRST_WORD_H_

#include <string>

namespace kelvane {

// The bytes of `file`, links followed, from the first that is not white space to the next that is,
// or to the end; of any length. White space is that of the C locale, whatever the process's locale.
// Empty when there is no such byte or the file cannot be opened; cut short where a read fails. A
// named pipe is not waited for. Never warns; throws only when memory runs out.
//
// Example: a file that holds "\n 2023c 2023d\n" gives "2023c".
std::string first_word(const std::string& file);

}  // namespace kelvane

#endif  // KELVANE_FOUNDATION_FIRST_WORD_H_
