// A device in a throw-away root directory, described and compared as text.
//
// One entry a line, blanks before it ignored, "~" for /var/db/timezone:
//   ~/a/directory/
//   ~/a/file = its content
//   ~/a/link -> its target

#ifndef KELVANE_TESTS_DEVICE_H_
#define KELVANE_TESTS_DEVICE_H_

#include <gtest/gtest.h>

#include <functional>
#include <string>

namespace kelvane {

class device : public testing::Test {
 protected:
  using action = std::function<void()>;
  // Asked before each system call of a run, by the call's name: 0 lets it go on, an error number
  // lets it fail.
  using watcher = std::function<int(const std::string& call)>;

  void SetUp() override;
  void TearDown() override;

  // Entries of the system partition, of a download, and of the links that select a download.
  static std::string system(const std::string& version, const std::string& schema = "44l");
  static std::string download(const std::string& version, const std::string& schema = "44l");
  static std::string on(const std::string& version);

  // Makes what the entries say, and the directories on the way; a link replaces what is there.
  static void build(const std::string& entries);

  // The entries below `top`, in order, without `except` and what is below.
  static std::string listing(const std::string& top, const std::string& except = "");
  // Those that a run may change; build_store() makes the entries the only ones of these.
  static std::string store() { return listing("/var/db", "/var/db/timezone/tz"); }
  static void build_store(const std::string& entries);

  // What an operation wrote on standard error, without the program's name and the error text of
  // each line, then what it threw.
  static std::string outcome(const action& operation);

  // Runs the program, after `prepare` in the new process: its outcome, "status N" or "signal N"
  // where it did not exit with 0, and the store. Expects that it changes nothing else.
  static std::string boot(const watcher& watch = {}, const action& prepare = {});

  // What a test expects of these: the entries, which come last, may be in any order.
  static std::string text(const std::string& lines);

 private:
  int outer_root_ = -1;
  std::string root_;
};

}  // namespace kelvane

#endif  // KELVANE_TESTS_DEVICE_H_
