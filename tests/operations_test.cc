// The operations that the program is made of, each by itself.

#include "dataset/orv_dataset.h"
#include "dataset/orv_icu.h"
#include "dataset/orv_zoneinfo.h"
#include "dataset/store_links.h"
#include "foundation/file_system.h"
#include "foundation/first_word.h"
#include "tests/device.h"

namespace kelvane {
namespace {

using operations = device;

TEST_F(operations, file_operations_change_nothing_where_they_fail) {
  const std::string held = "/s/dead -> /missing\n/s/dir/f = x\n/s/link -> no//\n/s/loop -> loop\n";
  build(held);
  const std::pair<action, std::string> table[] = {
      {[] { remove("/s/dir/f/x"); }, "remove: could not remove /s/dir/f/x\nint 20\n"},
      {[] { read_symlink("/s/dir/f/x"); }, "read_symlink: /s/dir/f/x\nint 20\n"},
      {[] { remove("/s/loop/x"); }, "remove: could not remove /s/loop/x\nint 40\n"},
      {[] { read_symlink("/s/loop/x"); }, "read_symlink: /s/loop/x\nint 40\n"},
      {[] { create_symlink("no//", "/s/link"); }, "create_symlink: from /s/link to no//\nint 17\n"},
      {[] { discard("/s/dir"), create_symlink("..//x/", "/s/new"); }, ""}};
  for (const auto& [operation, wanted] : table) EXPECT_EQ(outcome(operation), wanted);
  EXPECT_EQ(listing(), text(held + "/s/new -> ..//x/\n/var/db/"));
  const std::string longest(1024, 'x');
  fs::create_symlink(longest + "y", "/s/long");
  EXPECT_EQ(outcome([&] { EXPECT_EQ(read_symlink("/s/long"), longest); }), "");
  EXPECT_EQ(read_symlink("/s/missing/x"), "");
  EXPECT_TRUE(exists("/s/dir") && !exists("/s/dead") && !exists("/s/dir/f/x"));
}

TEST_F(operations, a_warning_ends_in_the_error_and_is_lost_where_it_cannot_be_written) {
  EXPECT_EQ(outcome([] { errno = EISDIR, warn("seen %d", 1); }), "seen 1\n");
  EXPECT_EQ(content("/stderr"), "kelvane: seen 1: Is a directory\n");
  int after = 0;
  EXPECT_EQ(outcome([&] { ::close(2), errno = EISDIR, warn("lost"), after = errno; }), "");
  EXPECT_EQ(after, EISDIR);
}

TEST_F(operations, the_first_word_lies_between_white_space_of_any_kind) {
  const std::string gap = " \t\n\v\f\r", high = std::string("#2016a,\0\xa0\x85", 10),
                    pages(8192, 'w');
  const std::pair<std::string, std::string> table[] = {
      {"x", "x"}, {gap + "2023c", "2023c"}, {std::string(9000, ' ') + high + "\rx", high},
      {gap, ""},  {"a\v2023d" + gap, "a"},  {pages + "\t" + pages, pages}};
  for (const auto& [content, word] : table) {
    std::ofstream("/file") << content;
    EXPECT_EQ(first_word("/file"), word);
  }
  build("/s/link -> /file");
  EXPECT_EQ(first_word("/s/link"), pages);
  ASSERT_EQ(::mkfifo("/s/pipe", 0600), 0);
  for (const char* path : {"/s", "/s/missing", "/s/pipe"}) EXPECT_EQ(first_word(path), "");
}

TEST_F(operations, a_version_text_is_parsed_up_to_a_number_too_large) {
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
  for (const char* text : {"", "2016", "2016A", "2016a.", "2016a.1.2.3", " 2016a", "2016a ",
                           "a2016", "2016\xe9", "2016a.-1", "2016a1", "2016ax1", "2016a.1x0"})
    table.emplace_back(text, no_version(text) + "-1  -1 -1");
  for (const auto& [text, fields] : table) {
    tz_version version("1x.1.1");
    std::ostringstream result;
    result << outcome([&, &input = text] { version.parse(input); }) << version.year << " "
           << version.letters << " " << version.major << " " << version.minor;
    EXPECT_EQ(result.str(), fields);
  }
}

TEST_F(operations, versions_are_ordered_by_the_first_field_that_differs) {
  std::vector<tz_version> rising = {tz_version()};
  for (const char* text :
       {"0a", "2015z.9.9", "2016a", "2016a.0", "2016a.1", "2016a.1.0", "2016a.1.9", "2016a.2",
        "2016aa", "2016b", "2016z", "2016za", "2017a", "10000a"})
    rising.emplace_back(text);
  for (const tz_version& left : rising)
    for (const tz_version& right : rising)
      EXPECT_TRUE((left > right) == (&left > &right) && (left == right) == (&left == &right));
  EXPECT_EQ(tz_version("02016a.01"), tz_version("2016a.1"));
}

const std::string tz = "/var/db/timezone/tz/";

TEST_F(operations, a_link_target_names_a_data_set_or_is_bad) {
  for (const std::string& path : {tz + "a", tz + "2022b.1.1", tz + "a/zoneinfo"})
    for (const char* last : {"/zoneinfo", "/"})
      EXPECT_EQ(dataset_path_from_link(path + last), path);
  EXPECT_EQ(dataset_path_from_link("/usr/share/zoneinfo.default"), "");
  for (const std::string target :
       {"", "/var/db/timezone/tz/", "/var/db/timezone/tz/2022b", "/var/db/timezone/tz//zoneinfo",
        "/var/db/timezone/tzs/a/zoneinfo", "/usr/share/zoneinfo", "/usr/share/zoneinfo.default/"})
    EXPECT_EQ(outcome([&] { dataset_path_from_link(target); }),
              "Bad zoneinfo link " + target + "\nint -1\n");
}

TEST_F(operations, a_data_set_is_named_by_its_directory) {
  build("/usr/share/zoneinfo.default/+VERSION = 2022a\n~/tz/2022a.1.0/icutz/icutz44l.dat = data");
  const orv_dataset system, download(tz + "2022a.1.0");
  EXPECT_EQ(system.get_version_string(), download.get_version_string());
  EXPECT_TRUE(system.same_path(orv_dataset("")) && !download.same_path(system));
  outcome([&] { EXPECT_FALSE(download.same_path(orv_dataset(tz + "2022a.1.0/"))); });
  for (const std::string text : {"02022b.01", "x/../y"})
    outcome([&] { EXPECT_EQ(orv_dataset(tz + text).get_version_string(), text); });
  EXPECT_EQ(orv_zoneinfo().get_version(), "2022a");
  const std::string bad = "orv_dataset::create_components: bad path ";
  for (const std::string path : {"/var/db/timezone/tz/", "//var/db/timezone/tz/a", "tz/2022b",
                                 "/var/db/timezone/TZ/a", "/usr/share/zoneinfo.default"})
    EXPECT_EQ(outcome([&] { orv_dataset{path}; }), bad + path + "\nSt16invalid_argument badpath\n");
}

TEST_F(operations, the_schema_is_in_the_name_of_a_readable_file_directly_in_the_directory) {
  static constexpr char icu[] = "/var/db/timezone/tz/1a/icutz";
  static constexpr char data[] = "/var/db/timezone/tz/1a/icutz/icutz44l.dat";
  // Where sizes and times have 32 bits, large files and late times could not be looked at.
  static constexpr timespec times[] = {{2208988800, 0}, {2208988800, 0}};
  const auto same = [] { return orv_icu(tz + "1a").compatible_schema(orv_icu()); };
  const auto expect = [&](const std::string& schema, const std::string& entry, const action& edit) {
    build("/usr/share/icu/icutzformat.txt = " + schema + "\n~/tz/1a/icutz/" + entry);
    edit();
    EXPECT_EQ(outcome([&] { EXPECT_TRUE(same()) << entry; }),
              schema != "" ? "" : "No ICU schema found for " + tz + "1a\n");
  };
  expect("007e", "icutz007e.dat = ", [] {});
  expect("1b", "icutz1b.dat = ", [] {});
  expect("44l", "icutz44l.dat = ", [] { ASSERT_EQ(::truncate(data, 3LL << 30), 0); });
  expect("44l", "icutz44l.dat = ", [] { ASSERT_EQ(::utimensat(0, data, times, 0), 0); });
  expect("44l", "icutz44l.dat = ", [] { ASSERT_EQ(::utimensat(0, icu, times, 0), 0); });
  expect("44l", "icutz44l.dat = ", [] { fs::rename(icu, "/s"), fs::create_symlink("/s", icu); });
  for (const std::string other : {"044l", "44l0", "44", "44L", ""}) {
    build("/usr/share/icu/icutzformat.txt = " + other + "\n~/tz/1a/icutz/icutz44l.dat = ");
    EXPECT_FALSE(same());
  }
  const std::string deep(70000, 'x');
  EXPECT_EQ(outcome([&] { orv_icu{deep}; }), "tz_icu::initialize: fts_open of " + deep +
                                                 "/icutz failed, File name too long\nint 36\n");
  expect("", "icutz44l.dat = ", [] { ASSERT_EQ(::chmod(data, 0662), 0); });
  expect("", "icutz44l.dat = ", [] { ASSERT_EQ(::unlink(data) + ::mkfifo(data, 0644), 0); });
  expect("", "icutz44l.dat = ", [] { fs::remove_all(icu); });
  for (const char* entry :
       {"icutz44l.dat -> /usr/share/icu/icutzformat.txt", "icutz44l.dat/below = ",
        "below/icutz44l.dat = ", "icutz44l.dat.bak = ", "xicutz44l.dat = ", "icutz44L.dat = ",
        "icutz44a.dat = ", "icutzl.dat = ", "icutz44lxdat = ", "icutz44.dat = ", "icudt44l.dat = "})
    expect("", entry, [] {});
  EXPECT_TRUE(orv_zoneinfo().compatible_schema(orv_icu()));
  EXPECT_EQ(outcome([] { EXPECT_FALSE(orv_icu().compatible_schema(orv_zoneinfo())); }),
            "orv_icu::compatible_schema: could not dynamic_cast other component\n");
}

}  // namespace
}  // namespace kelvane
