#include <cerrno>

#include "foundation/file_system.h"
#include "foundation/first_word.h"
#include "foundation/tz_version.h"
#include "tests/device.h"

namespace kelvane {
namespace {

class foundation : public device {};

TEST_F(foundation, file_operations_fail_with_a_warning_and_change_nothing_then) {
  build("/s/dir/f = x\n/s/gone -> dir/f\n/s/link -> no//target/\n/s/dead -> /missing\n/s/empty/");
  const std::pair<action, const char*> table[] = {
      {[] { remove("/s/dir"); }, "remove: could not remove /s/dir\nint 21\n"},
      {[] { remove("/s/dir/f/x"); }, "remove: could not remove /s/dir/f/x\nint 20\n"},
      {[] { remove("/s/gone"), remove("/s/missing"); }, ""},
      {[] { discard("/s/dir"), discard("/s/missing"), discard("/s/empty"); }, ""},
      {[] { read_symlink("/s/dir"); }, "read_symlink: /s/dir\nint 22\n"},
      {[] { read_symlink("/s/dir/f/x"); }, "read_symlink: /s/dir/f/x\nint 20\n"},
      {[] { create_symlink("..//x/", "/s/new"); }, ""},
      {[] { create_symlink("no//target/", "/s/link"); },
       "create_symlink: from /s/link to no//target/\nint 17\n"}};
  for (const auto& [operation, wanted] : table) EXPECT_EQ(outcome(operation), wanted);
  EXPECT_EQ(listing(), text("/s/dead -> /missing\n/s/dir/f = x\n/s/link -> no//target/\n"
                            "/s/new -> ..//x/\n/var/db/"));
  const std::string longest(1024, 'x');
  fs::create_symlink(longest + "y", "/s/long");
  EXPECT_EQ(read_symlink("/s/missing/x") + read_symlink("/s/long"), longest);
  EXPECT_TRUE(exists("/s/dir") && !exists("/s/dead") && !exists("/s/dir/f/x"));
}

TEST_F(foundation, a_warning_ends_in_the_error_and_is_lost_where_it_cannot_be_written) {
  EXPECT_EQ(outcome([] { errno = EISDIR, warn("seen %d", 1); }), "seen 1\n");
  EXPECT_EQ(content("/stderr"), "kelvane: seen 1: Is a directory\n");
  int after = 0;
  EXPECT_EQ(outcome([&] { ::close(2), errno = EISDIR, warn("lost"), after = errno; }), "");
  EXPECT_EQ(after, EISDIR);
}

TEST_F(foundation, the_first_word_lies_between_white_space_of_any_kind) {
  const std::string gap = " \t\n\v\f\r", high = "2016a\xa0\x85", pages(9000, 'w');
  const std::pair<std::string, std::string> table[] = {
      {"x", "x"}, {gap + "2023c", "2023c"}, {std::string(9000, ' ') + high + "\rx", high},
      {gap, ""},  {"a\v2023d" + gap, "a"},  {pages + "\t" + pages, pages}};
  for (const auto& [content, word] : table) {
    std::ofstream("/file") << content;
    EXPECT_EQ(first_word("/file"), word);
  }
  build("/s/");
  ASSERT_EQ(::mkfifo("/s/pipe", 0600), 0);
  for (const char* path : {"/s", "/s/missing", "/s/pipe"}) EXPECT_EQ(first_word(path), "");
}

TEST_F(foundation, a_version_text_is_parsed_up_to_a_number_too_large) {
  const std::string million(1000000, 'z'), above = "St12out_of_range stoi\n";
  std::vector<std::pair<std::string, std::string>> table = {
      {"2016a.1.0", "2016 a 1 0"},
      {"2016ab.3", "2016 ab 3 -1"},
      {"02016az", "2016 az -1 -1"},
      {"2147483647z.2147483647.02147483647", "2147483647 z 2147483647 2147483647"},
      {"1" + million, "1 " + million + " -1 -1"},
      {"2147483648b", above + "1 x 1 1"},
      {"2017b.2147483648", above + "2017 b 1 1"},
      {"2017b.2.2147483648", above + "2017 b 2 1"}};
  for (const std::string text :
       {"", "2016", "2016A", "2016a.", "2016a.1.2.3", " 2016a", "2016a ", "a2016", "2016\xe9",
        "2016a.-1", "2016a1", "2016ax1", "2016a.1x0"}) {
    const std::string warning = "Cannot parse version string " + text;
    table.emplace_back(text, warning + ", results.size() = 0\n" + warning + "\n-1  -1 -1");
  }
  for (const auto& [text, fields] : table) {
    tz_version version("1x.1.1");
    std::ostringstream result;
    result << outcome([&] { version.parse(text); }) << version.year << " " << version.letters << " "
           << version.major << " " << version.minor;
    EXPECT_EQ(result.str(), fields);
  }
}

TEST_F(foundation, versions_are_ordered_by_the_first_field_that_differs) {
  std::vector<tz_version> rising = {tz_version()};
  for (const std::string text :
       {"0a", "2015z.9.9", "2016a", "2016a.0", "2016a.1", "2016a.1.0", "2016a.1.9", "2016a.2",
        "2016aa", "2016b", "2016z", "2016za", "2017a", "10000a"})
    rising.emplace_back(text);
  for (const tz_version& left : rising)
    for (const tz_version& right : rising)
      EXPECT_TRUE((left > right) == (&left > &right) && (left == right) == (&left == &right));
  EXPECT_EQ(tz_version("02016a.01"), tz_version("2016a.1"));
}

}  // namespace
}  // namespace kelvane
