#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <fstream>
#include <sstream>
#include <vector>

#include "foundation/file_system.h"
#include "foundation/first_word.h"
#include "foundation/tz_version.h"
#include "foundation/warning.h"
#include "tests/device.h"

namespace kelvane {
namespace {

class foundation : public device {
 protected:
  // The outcome of parsing `text` into a version that was set before, and its fields then.
  static std::string parsed(const std::string& text) {
    tz_version version("1x.1.1");
    std::ostringstream result;
    result << outcome([&] { version.parse(text); }) << version.year << " " << version.letters << " "
           << version.major << " " << version.minor;
    return result.str();
  }
};

TEST_F(foundation, file_operations_fail_with_a_warning_and_change_nothing_then) {
  const std::string full(1024, 'x');
  build("/s/dir/below = x\n/s/gone -> dir/below\n/s/same -> no//target/\n/s/dead -> /missing\n" +
        std::string("/s/empty/\n/s/long -> ") + full + "y");
  const std::pair<std::function<void()>, const char*> table[] = {
      {[] { remove("/s/dir"); }, "remove: could not remove /s/dir\nint 21\n"},
      {[] { remove("/s/dir/below/x"); }, "remove: could not remove /s/dir/below/x\nint 20\n"},
      {[] { remove("/s/missing"); }, ""},
      {[] { remove("/s/gone"); }, ""},
      {[] { discard("/s/dir"), discard("/s/missing"), discard("/s/empty"); }, ""},
      {[] { read_symlink("/s/dir"); }, "read_symlink: /s/dir\nint 22\n"},
      {[] { read_symlink("/s/dir/below/x"); }, "read_symlink: /s/dir/below/x\nint 20\n"},
      {[] { EXPECT_EQ(read_symlink("/s/missing/x"), ""); }, ""},
      {[] { EXPECT_EQ(read_symlink("/s/same"), "no//target/"); }, ""},
      {[&] { EXPECT_EQ(read_symlink("/s/long"), full); }, ""},
      {[] { create_symlink("no//target/", "/s/same"); },
       "create_symlink: from /s/same to no//target/\nint 17\n"},
      {[] { create_symlink("..//x/", "/s/new"); }, ""},
      {[] { EXPECT_TRUE(exists("/s/dir") && !exists("/s/dead") && !exists("/s/dir/below/x")); },
       ""}};
  for (const auto& [operation, wanted] : table) EXPECT_EQ(outcome(operation), wanted);
  EXPECT_EQ(listing("/s"), "/s/dead -> /missing\n/s/dir/below = x\n/s/long -> " + full +
                               "y\n/s/new -> ..//x/\n/s/same -> no//target/\n");
}

TEST_F(foundation, a_warning_that_cannot_be_written_is_lost_and_the_error_number_stays) {
  const auto lost = [] {
    ::close(STDERR_FILENO);
    errno = EISDIR;
    warn("lost");
    EXPECT_EQ(errno, EISDIR);
  };
  EXPECT_EQ(outcome(lost) + outcome([] { warn("seen"); }), "seen\n");
}

TEST_F(foundation, the_first_word_lies_between_white_space_of_any_kind) {
  const std::string gap = " \t\n\v\f\r", high = "2016a\xa0\x85", pages(9000, 'w');
  const std::pair<std::string, std::string> table[] = {
      {"2023c" + gap, "2023c"},
      {gap + "2023c", "2023c"},
      {"2023c\v2023d" + gap, "2023c"},
      {gap, ""},
      {"x", "x"},
      {pages + "\t" + pages, pages},
      {std::string(9000, ' ') + high + "\rx", high}};
  for (const auto& [content, word] : table) {
    std::ofstream("/file") << content;
    EXPECT_EQ(first_word("/file"), word);
  }
  build("/directory/");
  ASSERT_EQ(::mkfifo("/pipe", 0600), 0);
  for (const char* path : {"/directory", "/missing", "/pipe"}) EXPECT_EQ(first_word(path), "");
}

TEST_F(foundation, a_version_text_is_parsed_up_to_a_number_too_large) {
  const std::string letters(1000000, 'z');
  const std::pair<std::string, std::string> table[] = {
      {"2016a.1.0", "2016 a 1 0"},
      {"2016ab.3", "2016 ab 3 -1"},
      {"02016az", "2016 az -1 -1"},
      {"1" + letters, "1 " + letters + " -1 -1"},
      {"2147483647z.2147483647.02147483647", "2147483647 z 2147483647 2147483647"},
      {"2147483648b", "out_of_range\n1 x 1 1"},
      {"2017b.2147483648", "out_of_range\n2017 b 1 1"},
      {"2017b.2.2147483648", "out_of_range\n2017 b 2 1"}};
  for (const auto& [text, fields] : table) EXPECT_EQ(parsed(text), fields);
}

TEST_F(foundation, a_text_of_another_shape_gives_the_unset_version) {
  for (const std::string text :
       {"", "2016", "2016A", "2016a.", "2016a.1.2.3", " 2016a", "2016a ", "a2016", "2016\xe9",
        "2016a.-1", "2016a1", "2016ax1", "2016a.1x0"}) {
    const std::string warning = "Cannot parse version string " + text;
    EXPECT_EQ(parsed(text), warning + ", results.size() = 0\n" + warning + "\n-1  -1 -1");
  }
}

TEST_F(foundation, versions_are_ordered_by_the_first_field_that_differs) {
  std::vector<tz_version> rising = {tz_version()};
  for (const std::string text :
       {"0a", "2015z.9.9", "2016a", "2016a.0", "2016a.1", "2016a.1.0", "2016a.1.9", "2016a.2",
        "2016aa", "2016b", "2016z", "2016za", "2017a", "10000a"}) {
    rising.emplace_back(text);
  }
  for (const tz_version& left : rising) {
    for (const tz_version& right : rising) {
      EXPECT_EQ(left > right, &left > &right);
      EXPECT_EQ(left == right, &left == &right);
    }
  }
  EXPECT_EQ(tz_version("02016a.01"), tz_version("2016a.1"));
}

}  // namespace
}  // namespace kelvane
