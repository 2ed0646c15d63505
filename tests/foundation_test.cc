#include <cerrno>
#include <locale>

#include <sys/stat.h>

#include "foundation/file_system.h"
#include "foundation/first_word.h"
#include "foundation/tz_version.h"
#include "foundation/warning.h"
#include "tests/world.h"

namespace kelvane {
namespace {

class foundation : public world {};

TEST_F(foundation, what_stands_at_a_path_is_seen_through_links) {
  build("/file = \n/to_file -> /file\n/dangling -> /missing");
  for (const char* path : {"/file", "/to_file", "/"}) EXPECT_TRUE(exists(path)) << path;
  for (const char* path : {"/dangling", "/missing", "/file/below", ""}) {
    EXPECT_EQ(outcome([&] { EXPECT_FALSE(exists(path)) << path; }), "");
  }
}

TEST_F(foundation, removal_takes_links_and_files_but_no_directory) {
  build("/store/file = x\n/store/link -> /store/directory\n/store/directory/");
  build("/store/directory/file = y");
  for (const char* path : {"/store/link", "/store/file", "/store/missing"}) {
    EXPECT_EQ(outcome([&] { remove(path); }), "") << path;
  }
  EXPECT_EQ(outcome([] { remove("/store/directory"); }),
            "remove: could not remove /store/directory: Is a directory\nint 21\n");
  EXPECT_EQ(listing("/store"), "/store/directory/file = y\n");
}

TEST_F(foundation, a_target_is_read_as_it_is_and_up_to_1024_bytes) {
  const std::string longest(1024, 'x');
  build("/file = x\n/link -> ../not//normal/\n/longest -> " + longest + "\n/longer -> " + longest + "y");
  EXPECT_EQ(read_symlink("/link"), "../not//normal/");
  EXPECT_EQ(read_symlink("/longest"), longest);
  EXPECT_EQ(read_symlink("/longer"), longest);
  for (const char* path : {"/missing", "/missing/link"}) {
    EXPECT_EQ(outcome([&] { EXPECT_EQ(read_symlink(path), ""); }), "");
  }
  EXPECT_EQ(outcome([] { read_symlink("/file"); }),
            "read_symlink: /file: Invalid argument\nint 22\n");
}

TEST_F(foundation, a_link_is_created_only_where_nothing_stands) {
  build("/store/file = x");
  create_symlink("no/such//target", "/store/link");
  EXPECT_EQ(outcome([] { create_symlink("/target", "/store/file"); }),
            "create_symlink: from /store/file to /target: File exists\nint 17\n");
  EXPECT_EQ(listing("/store"), "/store/file = x\n/store/link -> no/such//target\n");
}

TEST_F(foundation, a_warning_keeps_the_error_number) {
  EXPECT_EQ(outcome([] {
              ASSERT_EQ(::close(STDERR_FILENO), 0);
              errno = EISDIR;
              warn("lost");
              EXPECT_EQ(errno, EISDIR);
            }), "");
}

TEST_F(foundation, the_first_word_ends_at_white_space_of_any_kind) {
  const std::string across_chunks(10000, 'w');
  for (const char* gap : {" ", "\t", "\n", "\v", "\f", "\r", "\n \n"}) {
    for (const std::string& word : {std::string("2023c"), std::string("a\xa0\x85"), across_chunks}) {
      build("/file = " + (gap + word) + gap + "next");
      EXPECT_EQ(first_word("/file"), word);
    }
  }
  build("/file = word\n/empty = \n/directory/");
  EXPECT_EQ(first_word("/file"), "word");
  ASSERT_EQ(::mkfifo("/pipe", 0600), 0);
  for (const char* path : {"/empty", "/directory", "/missing", "/pipe"}) {
    EXPECT_EQ(outcome([&] { EXPECT_EQ(first_word(path), "") << path; }), "");
  }
}

struct parsed {
  const char* text;
  int year;
  const char* letters;
  int major;
  int minor;
};

TEST_F(foundation, a_version_text_is_parsed) {
  const parsed table[] = {
      {"2016a.1.0", 2016, "a", 1, 0},   {"2016a", 2016, "a", -1, -1},
      {"2016ab.3", 2016, "ab", 3, -1},  {"02016az.007", 2016, "az", 7, -1},
      {"0z.0.10", 0, "z", 0, 10},       {"2147483647a.2147483647.2147483647", INT32_MAX, "a", INT32_MAX, INT32_MAX},
  };
  for (const auto& [text, year, letters, major, minor] : table) {
    const tz_version version{std::string(text)};
    EXPECT_EQ(version.year, year) << text;
    EXPECT_EQ(version.letters, letters) << text;
    EXPECT_EQ(version.major, major) << text;
    EXPECT_EQ(version.minor, minor) << text;
  }
}

TEST_F(foundation, a_text_of_another_shape_gives_the_unset_value) {
  for (const std::string text : {"", "2016", "2016A", "2016a.", "2016a.1.2.3", " 2016a", "2016a ",
                                 "a2016", "2016\xe9", "2016a.-1", "2016a1", "2016ax1", "2016a.1x0"}) {
    tz_version version("2016a.1.0");
    expect_text(outcome([&] { version.parse(text); }),
                "Cannot parse version string " + text + ", results.size() = 0: *\n" +
                "Cannot parse version string " + text + ": *\n");
    EXPECT_EQ(version, tz_version()) << text;
  }
}

TEST_F(foundation, a_number_too_large_stops_the_parse_where_it_is) {
  for (const std::string text : {"2147483648b", "2017b.2147483648", "2017b.2.2147483648"}) {
    EXPECT_EQ(outcome([&] { tz_version{text}; }), "out_of_range\n");
  }
  tz_version version("2016a.1.0");
  EXPECT_THROW(version.parse("2017b.2.99999999999"), std::out_of_range);
  EXPECT_TRUE(version.year == 2017 && version.letters == "b" && version.major == 2);
}

TEST_F(foundation, versions_are_ordered_field_by_field) {
  const tz_version rising[] = {
      tz_version(),           tz_version("0a"),       tz_version("2015z.9.9"), tz_version("2016a"),
      tz_version("2016a.0"),  tz_version("2016a.1"),  tz_version("2016a.1.0"), tz_version("2016a.1.9"),
      tz_version("2016a.2"),  tz_version("2016aa"),   tz_version("2016b"),     tz_version("2016z"),
      tz_version("2016za"),   tz_version("2017a"),    tz_version("10000a")};
  for (const tz_version& left : rising) {
    for (const tz_version& right : rising) {
      EXPECT_EQ(left > right, &left > &right);
      EXPECT_EQ(left == right, &left == &right);
    }
  }
}

// A locale in which digits and letters are anything but what they are.
struct strange_ctype : std::ctype<char> {
  strange_ctype() : std::ctype<char>(nothing()) {}
  static const mask* nothing() {
    static const mask table[table_size] = {};
    return table;
  }
  char do_narrow(char, char) const override { return '?'; }
};

TEST_F(foundation, no_locale_changes_what_is_read) {
  const std::locale before = std::locale::global(std::locale(std::locale(), new strange_ctype));
  build("/file =  2016a.1.0 x");
  EXPECT_EQ(outcome([] { EXPECT_EQ(tz_version(first_word("/file")).minor, 0); }), "");
  std::locale::global(before);
}

}  // namespace
}  // namespace kelvane
