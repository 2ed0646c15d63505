#include "startup/prepare_process.h"

#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <exception>

#include "foundation/warning.h"

namespace kelvane {
namespace {

[[noreturn]] void give_up() {
  warn("Could not go on");
  std::_Exit(EXIT_FAILURE);
}

}  // namespace

void prepare_process() {
  prepare_warnings();
  ::close(STDIN_FILENO);
  ::close(STDOUT_FILENO);
  // Raising an exception takes memory, and the C library's fts_open(3) uses the memory for its root
  // whether granted or not; no lock of a stream is held there, so that give_up() may warn.
  std::set_terminate(give_up);
  std::signal(SIGSEGV, [](int) { give_up(); });
}

}  // namespace kelvane
