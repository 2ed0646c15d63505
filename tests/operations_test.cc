// The operations that the program is made of, each by itself.

#include <stdio_ext.h>

#include "dataset/orv_dataset.h"
#include "dataset/orv_icu.h"
#include "dataset/orv_zoneinfo.h"
#include "dataset/store_links.h"
#include "foundation/file_system.h"
#include "foundation/first_word.h"
#include "tests/device.h"

namespace kelvane {

TEST_F(device, what_fails_warns_throws_and_changes_nothing) {
  const std::string old = "/var/dead -> /no\n/var/dir/f = \n/var/link -> no//\n/var/loop -> loop\n";
  build(old);
  for (const auto& [path, error] : text_pairs{{"/var/dir/f/", "20"}, {"/var/loop/x", "40"}}) {
    const std::string thrown = path + "\nint " + error + "\n";
    EXPECT_EQ(outcome([&at = path] { remove(at); }), "remove: could not remove " + thrown);
    EXPECT_EQ(outcome([&at = path] { read_symlink(at); }), "read_symlink: " + thrown);
    EXPECT_EQ(outcome([&at = path] { create_symlink(at, at + "x"); }),
              "create_symlink: from " + path + "x to " + thrown);
    EXPECT_FALSE(exists(path));
  }
  for (const auto& [path, error] : text_pairs{{"/var/new/", "2"}, {"/var/link", "17"}})
    EXPECT_EQ(outcome([&at = path] { create_symlink("no//", at); }),
              "create_symlink: from " + path + " to no//\nint " + error + "\n");
  EXPECT_TRUE(content("/said").ends_with("\nkelvane: int 17: File exists\n"));
  EXPECT_EQ(outcome([] { ::close(2), errno = EIO, warn("lost"), ::_exit(errno); }), "status 5\n");
  EXPECT_TRUE(::__flbf(stderr) == 0 && ::__fbufsize(stderr) == BUFSIZ);
  EXPECT_EQ(outcome([] { discard("/var/dir/f/"), create_symlink("..//x/", "/var/new"); }), "");
  EXPECT_EQ(listing(), text(old + "/var/new -> ..//x/\n/var/db/"));
  const std::string longest(1024, 'x');
  fs::create_symlink(longest + "y", "/var/long");
  EXPECT_EQ(read_symlink("/var/long"), longest);
  EXPECT_TRUE(read_symlink("/var/no/x").empty() && exists("/var/dir") && !exists("/var/dead"));
}

TEST_F(device, the_first_word_lies_between_white_space_of_any_kind) {
  const std::string gap = " \t\n\v\f\r", high("\xef\xbb\xbf,\0\xa0\x85", 7), pages(8192, 'w');
  const text_pairs table = {
      {high, high}, {gap + "2023c", "2023c"}, {std::string(9000, ' ') + high + "\rx", high},
      {gap, ""},    {"#\v2023d" + gap, "#"},  {pages + "\t" + pages, pages}};
  for (const auto& [held, word] : table) {
    std::ofstream("/file") << held;
    EXPECT_EQ(first_word("/file"), word);
  }
  build("/var/link -> /file");
  EXPECT_EQ(first_word("/var/link"), pages);
  ASSERT_EQ(::mkfifo("/var/pipe", 0600), 0);
  for (const char* path : {"/var", "/var/missing", "/var/pipe"}) EXPECT_EQ(first_word(path), "");
}

struct shown_version : tz_version {  // Says at its end what it holds, so also after parse() threw.
  using tz_version::tz_version;
  ~shown_version() { warn("%d %s %d %d", year, letters.c_str(), major, minor); }
};

TEST_F(device, a_version_text_is_parsed_up_to_a_number_too_large) {
  const std::string many(100000, 'z'), too_large = "\nSt12out_of_range stoi";
  text_pairs table = {{"2016a.1.0", "2016 a 1 0"},
                      {"02016ab.3", "2016 ab 3 -1"},
                      {"2147483647z.2147483647.02147483647", "2147483647 z 2147483647 2147483647"},
                      {"1" + many, "1 " + many + " -1 -1"},
                      {"2147483648b", "1 x 1 1" + too_large},
                      {"2017b.2147483648", "2017 b 1 1" + too_large},
                      {"2017b.2.2147483648", "2017 b 2 1" + too_large}};
  for (const char* text : {"", "a", "2016", "2016A", "2016a.", "2016a.1.2.3", " 2016a", "2016a ",
                           "a2016", "2016\xe9", "2016a.-1", "2016a1", "2016ax1", "2016a.1x0"})
    table.emplace_back(text, no_version(text) + "-1  -1 -1");
  for (const auto& [text, shown] : table)
    EXPECT_EQ(outcome([&input = text] { shown_version("1x.1.1").parse(input); }), shown + "\n");
}

TEST_F(device, versions_are_ordered_by_the_first_field_that_differs) {
  std::vector<tz_version> rising = {tz_version("2016a\n")};
  for (const char* text : {"0a", "2015z.9.9", "2016a", "2016a.0", "2016a.1", "2016a.1.0",
                           "2016a.1.9", "2016a.2", "2016aa", "2016b", "2016z", "2017a", "10000a"})
    rising.emplace_back(text);
  for (const tz_version& left : rising)
    for (const tz_version& right : rising)
      EXPECT_TRUE((left > right) == (&left > &right) && (left == right) == (&left == &right));
  EXPECT_TRUE(tz_version("02016a.01") == tz_version("2016a.1"));
}

const std::string tz = "/var/db/timezone/tz/";

TEST_F(device, a_path_below_the_downloads_names_a_data_set) {
  build("/usr/share/zoneinfo.default/+VERSION = 2022a x\n~/tz/a/zoneinfo/+VERSION = x");
  const orv_dataset system, download(tz + "2022a.1.0");
  EXPECT_EQ(system.get_version_string(), download.get_version_string());
  EXPECT_TRUE(system.same_path(orv_dataset("")) && !download.same_path(system));
  EXPECT_FALSE(download.same_path(orv_dataset(tz + "2022a.1.0/")));
  EXPECT_EQ(orv_zoneinfo().get_version() + orv_zoneinfo(tz + "a").get_version(), "2022ax");
  for (const std::string text : {"a", "02022b.01", "x/../y", "a/zoneinfo", "a/"}) {
    EXPECT_EQ(orv_dataset(tz + text).get_version_string(), text);
    orv_dataset(tz + text).activate();
    for (const auto& at : {read_symlink(icu_link), read_symlink(zoneinfo_link), tz + text + "/"})
      EXPECT_EQ(dataset_path_from_link(at), tz + text);
  }
  for (const std::string path : {"/var/db/timezone/tz/", "//var/db/timezone/tz/a", "tz/2022b",
                                 "/var/db/timezone/TZ/a", "/usr/share/zoneinfo.default"})
    EXPECT_EQ(outcome([&] { orv_dataset{path}; }), "orv_dataset::create_components: bad path " +
                                                       path + "\nSt16invalid_argument badpath\n");
  for (const std::string path :
       {"", "/var/db/timezone/tz/", "/var/db/timezone/tz/2022b", "/var/db/timezone/tz//zoneinfo",
        "/var/db/timezone/tzs/a/zoneinfo", "/usr/share/zoneinfo", "/usr/share/zoneinfo.default/"})
    EXPECT_EQ(outcome([&] { dataset_path_from_link(path); }),
              "Bad zoneinfo link " + path + "\nint -1\n");
}

TEST_F(device, the_schema_is_in_the_name_of_a_readable_file_directly_in_the_directory) {
  static constexpr char data[] = "/var/db/timezone/tz/1a/icutz/icutz44l.dat";
  // With this schema on the system, and this entry in a download: what is said, then the answer.
  const auto matches = [](const std::string& wanted, const std::string& schema,
                          const std::string& entry, const action& edit = {}) {
    build("/usr/share/icu/icutzformat.txt = " + schema + "\n~/tz/1a/icutz" + entry);
    if (edit) edit();
    const action compare = [] { warn("%d", orv_icu(tz + "1a").compatible_schema(orv_icu())); };
    EXPECT_EQ(outcome(compare), wanted) << entry;
  };
  const std::string none = "No ICU schema found for " + tz + "1a\n1\n", file = "/icutz44l.dat = ";
  matches("1\n", "007e", "/icutz007e.dat = ");
  // Of several the first in the directory's own order; with so many, that is hardly by name.
  std::string many = "/icutz0b.dat = ";
  for (int i = 1; i < 50; ++i) many += "\n~/tz/1a/icutz/icutz" + std::to_string(i) + "e.dat = ";
  build("~/tz/1a/icutz" + many);
  matches("1\n", fs::directory_iterator(tz + "1a/icutz")->path().stem().string().substr(5), many);
  matches("1\n", "44l", " -> /var/icu\n/var/icu" + file, [] { ::chmod(data, 0115); });
  for (const char* other : {"044l", "44l0", "44", "44L", ""}) matches("0\n", other, file);
  matches(none, "", file, [] { ::chmod(data, 0662); });
  matches(none, "", file, [] { ::unlink(data), ::mkfifo(data, 0644); });
  for (const char* entry :
       {"44l.dat = ", "/icutz44l.dat -> /usr/share/icu/icutzformat.txt",
        "/icutz44l.dat/below = ", "/below/icutz44l.dat = ", "/icutz44l.dat.bak = ",
        "/xicutz44l.dat = ", "/icutz44L.dat = ", "/icutz44a.dat = ", "/icutzl.dat = ",
        "/icutz44lxdat = ", "/icutz44.dat = ", "/icudt44l.dat = "})
    matches(none, "", entry);
  const std::string deep(70000, 'x');
  EXPECT_EQ(outcome([&] { orv_icu{deep}; }), "tz_icu::initialize: fts_open of " + deep +
                                                 "/icutz failed, File name too long\nint 36\n");
  EXPECT_TRUE(orv_zoneinfo().compatible_schema(orv_icu()));
  EXPECT_EQ(outcome([] { warn("%d", orv_icu().compatible_schema(orv_zoneinfo())); }),
            "orv_icu::compatible_schema: could not dynamic_cast other component\n0\n");
}

}  // namespace kelvane
