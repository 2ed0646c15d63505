// Linked with --wrap=malloc and --wrap=realloc into a second program, whose allocation number
// $ALLOCATION fails, or all from that one on where a "+" follows. The C library's own start-up,
// which no program survives without memory, is not counted.

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <cstring>

// NOLINTBEGIN(readability-identifier-naming): the linker's names.
extern "C" {

void* __real_malloc(std::size_t);
void* __real_realloc(void*, std::size_t);

static long count = 0;
static const char* number = nullptr;
[[gnu::constructor(101)]] static void begin() { number = std::getenv("ALLOCATION"); }

static bool fails() {
  if (number == nullptr) return false;
  const long beyond = ++count - std::atol(number);
  if (beyond < 0 || (beyond > 0 && std::strchr(number, '+') == nullptr)) return false;
  errno = ENOMEM;
  return true;
}

void* __wrap_malloc(std::size_t size) { return fails() ? nullptr : __real_malloc(size); }
void* __wrap_realloc(void* old, std::size_t size) {
  return fails() ? nullptr : __real_realloc(old, size);
}
}
// NOLINTEND(readability-identifier-naming)
