// A throw-away root directory for each test, described and compared as text.
//
// One entry a line, leading spaces ignored:
//   /a/directory/
//   /a/file = its content
//   /a/link -> its target

#ifndef KELVANE_TESTS_WORLD_H_
#define KELVANE_TESTS_WORLD_H_

#include <gtest/gtest.h>

#include <functional>
#include <string>

namespace kelvane {

class world : public testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;

  // Entries of the system partition's data set and of a download.
  static std::string system(const std::string& version, const std::string& schema = "44l");
  static std::string download(const std::string& version, const std::string& schema = "44l");

  // Makes what the entries say, and the directories on the way; a link replaces what is there.
  static void build(const std::string& entries);

  // The entries below `top`, in order, without `except` and what is below; empty without `top`.
  static std::string listing(const std::string& top, const std::string& except = "");

  // What an operation wrote on standard error, without the name before each line, then what it
  // threw: "int 17", or an exception's text.
  static std::string outcome(const std::function<void()>& operation);

  // Expects equal lines, the wanted entries in any order; ": *" at the end of a wanted line stands
  // for any error text.
  static void expect_text(const std::string& actual, const std::string& wanted);

  // Runs the program on what `before` adds to the world, and expects its warnings, "status N" if N
  // is not 0, and what /var/db then holds besides the downloads; these and /usr must not change.
  static void expect_run(const std::string& before, const std::string& after,
                         const char* file = __builtin_FILE(), int line = __builtin_LINE());

 private:
  int outer_root_ = -1;
  std::string root_;
};

}  // namespace kelvane

#endif  // KELVANE_TESTS_WORLD_H_
