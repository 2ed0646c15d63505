#include "foundation/first_word.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <string_view>

#include "foundation/descriptor.h"

namespace kelvane {

std::string first_word(const std::string& file) {
  constexpr std::string_view white_space = " \t\n\v\f\r";
  // Without O_NONBLOCK a named pipe in the file's place would hold the run for ever.
  const descriptor source(file, O_RDONLY | O_NONBLOCK);
  std::string word;
  if (source.number == -1) return word;
  char chunk[4096];
  for (ssize_t count = 0; (count = ::read(source.number, chunk, sizeof chunk)) > 0;) {
    std::string_view text(chunk, static_cast<std::size_t>(count));
    if (word.empty())
      text.remove_prefix(std::min(text.find_first_not_of(white_space), text.size()));
    const std::size_t end = text.find_first_of(white_space);
    word += text.substr(0, end);
    if (end != std::string_view::npos) break;
  }
  return word;
}

}  // namespace kelvane
