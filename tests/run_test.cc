// What a start of a device says and changes; below, first_word() and the order of versions.

#include <sys/resource.h>
#include <sys/socket.h>

#include "foundation/first_word.h"
#include "foundation/tz_version.h"
#include "tests/device.h"

namespace kelvane {

// Expects what the start of a device says, and that it makes these changes and no others.
void expect(const std::string& device, const std::string& said, const std::string& changes) {
  build(device + changes);
  const std::string wanted = said + listing();
  build(device);
  const std::string told = start();
  EXPECT_EQ(told + listing(), wanted) << "on the device\n" << device;
}

// A row: the system's version, what the links lead to, the newest download; then which of these two
// is complained of, what is in use, the record. What is "unfit" has another schema.
TEST(a_start, uses_a_download_that_fits_and_is_newer_than_what_the_links_lead_to) {
  //  system     links to   download   complains of  in use     record
  const std::string table = R"(
    # Links to usable data: a newer download (2023 is above 999) is used, any other complained of.
      2022a.1.0  2022b      2023c.1.0  nothing       2023c.1.0  2022b_2023c.1.0
      999z.1.0   system     2023c.1.0  nothing       2023c.1.0  999z.1.0_2023c.1.0
      2022a.1.0  2023c.1.0  2023c.1.0  download      2023c.1.0  kept
    # Links to older data than the system's are reset; 2022b is older than 2022b.1.0.
      2022b.1.0  2022b      none       links         system     kept
    # Then a download newer than what they led to is used, even if older than the system's data.
      2024b.1.0  2022b      2023c.1.0  links         2023c.1.0  2024b.1.0_2023c.1.0
    # Data of another schema are complained of and not used, be they linked to or a newer download.
      2022a.1.0  2022unfit  2026unfit  both          system     kept
  )";
  std::istringstream rows(std::regex_replace(table, std::regex("#.*"), ""));
  std::string system, current, latest, complaint, used, record;
  while (rows >> system >> current >> latest >> complaint >> used >> record) {
    std::string device = usual + links_to(current) + "/usr/share/version = ";
    device += system.substr(0, system.find('.')) + "\n";
    if (latest != "none") device += "~/tz_latest -> ~/tz/" + latest + "\n";
    const std::string of_links = "| Symlink points at data incompatible with installed system\n";
    const std::string of_download =
        "| New update not compatible or older version: " + latest + " vs. " + current + "\n";
    std::string said;
    if (complaint == "links" || complaint == "both") said += of_links;
    if (complaint == "download" || complaint == "both") said += of_download;
    const std::string written = record == "kept" ? "" : "~/TZVersionDiffRecord = " + record;
    expect(device, said, links_to(used) + written);
  }
}

// Expects that each story is so. It begins with its title, at a #, and ends before the next #.
void expect_stories(const std::string& stories) {
  if (stories.find_first_not_of(" \n") == stories.npos) return;
  const std::size_t begin = stories.rfind('#');
  const std::string story = stories.substr(begin);  // Throws if there is no title.
  expect_stories(stories.substr(0, begin));
  std::smatch braces;
  std::regex_search(story, braces, std::regex("\\{(.*)\\}"));
  std::istringstream choices(braces.str(1) + ",");  // One empty choice where there are no braces.
  for (std::string choice; std::getline(choices >> std::ws, choice, ',');) {
    std::istringstream lines(std::regex_replace(story, std::regex("\\{.*\\}|\\*"), choice));
    std::string device = usual, said, changes;
    for (std::string line; std::getline(lines >> std::ws, line);) {
      if (line[0] == '|') said += line + "\n";
      else if (line[0] == '-') changes += "no " + line.substr(2) + "\n";
      else if (line[0] == '+') changes += line.substr(2) + "\n";
      else device += line + "\n";
    }
    expect(device, said, changes);
  }
}

// The usual device uses the system's data, 2022a.1.0; its downloads 2022b and 2023c.1.0 fit. It has
// no tz_latest and no ~/icutz. A version that does not parse makes two lines. %n is plain text.
TEST(a_start, changes_what_its_story_says_and_nothing_else) {
  expect_stories(R"(
    # A missing zoneinfo is reset, and in the same start a download is used.
      no ~/zoneinfo
      ~/tz_latest -> ~/tz/2023c.1.0
      | Bad zoneinfo link
      | Invalid current symlinks; resetting to system partition
      + ~/TZVersionDiffRecord = 2022a.1.0_2023c.1.0
      + ~/icutz -> ~/tz/2023c.1.0/icutz
      + ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo
    # A zoneinfo not spelled ~/tz/VERSION/ANY or as the system's is reset; the ICU link is removed.
      ~/icutz -> ~/tz/2022b/icutz
      ~/zoneinfo -> {tz/%n/zoneinfo, ~/tz/2022b, ~/tz//zoneinfo, /usr/share/zoneinfo.default/}
      | Bad zoneinfo link *
      | Invalid current symlinks; resetting to system partition
      - ~/icutz
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # A file at zoneinfo is replaced by the link to the system's data.
      ~/zoneinfo = data
      | read_symlink: ~/zoneinfo
      | Invalid current symlinks; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # If tz_latest is not ~/tz/ and a name after it, even a zoneinfo to usable data is reset.
      ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo
      ~/tz_latest -> {tz/2023c.1.0, ~/tz/, ~/tzdata/%n, /var//db/timezone/tz/2023c.1.0}
      | orv_dataset::create_components: bad path *
      | Unable to locate data; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # A zoneinfo to data that fit, but with a number above 2147483647 in their version, is reset.
      ~/zoneinfo -> ~/tz/{2147483648a, 2022b.2147483648, 2022b.1.18446744073709551617}/zoneinfo
      ~/tz/*/icutz/icutz44l.dat = data
      | Unable to locate data; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # A zoneinfo to a release whose name does not parse, here 2023c.1.0/, is reset.
      ~/zoneinfo -> ~/tz/2023c.1.0//
      | Cannot parse version string 2023c.1.0/, results.size() = 0
      | Cannot parse version string 2023c.1.0/
      | Symlink points at data incompatible with installed system
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # A download whose name is no version is not used, though its data fit.
      ~/tz_latest -> ~/tz/{a, 2026, 2026A, 2026a., 2026a-1, 2026a.1.2.3, 2026a/, %n2026a}
      ~/tz/*/icutz/icutz44l.dat = data
      | Cannot parse version string *, results.size() = 0
      | Cannot parse version string *
      | New update not compatible or older version: * vs. 2022a.1.0
    # A system version that is empty or does not parse is older than all: a download in use stays.
      /usr/share/version = {unknown, }
      ~/zoneinfo -> ~/tz/2022b/zoneinfo
      | Cannot parse version string *.1.0, results.size() = 0
      | Cannot parse version string *.1.0
    # A pipe as icutzformat.txt is no schema: a download with any schema is not used.
      /usr/share/icu/icutzformat.txt|
      ~/tz_latest -> ~/tz/2026a
      ~/tz/2026a/icutz/icutz{44l, 44b, 44e, 9l}.dat = data
      | New update not compatible or older version: 2026a vs. 2022a.1.0
    # A download without a schema is used if the system has none. A record that is a pipe stays.
      no /usr/share/icu/icutzformat.txt
      ~/TZVersionDiffRecord|
      ~/tz_latest -> ~/tz/2026a
      | No ICU schema found for ~/tz/2026a
      + ~/icutz -> ~/tz/2026a/icutz
      + ~/zoneinfo -> ~/tz/2026a/zoneinfo
    # A download is not used if its data file is named or placed otherwise than icutz/icutz44l.dat.
      ~/tz_latest -> ~/tz/2026a
      ~/tz/2026a/icutz/{xicutz44l.dat, icutz44l.dat2, icutz44l-dat, below/icutz44l.dat} = data
      | No ICU schema found for ~/tz/2026a
      | New update not compatible or older version: 2026a vs. 2022a.1.0
    # A download is not used if its data file is a directory, a link, or unreadable by others.
      ~/tz_latest -> ~/tz/2026a
      ~/tz/2026a/icutz/{icutz44l.dat/, icutz44l.dat -> /bin/sh, icutz44l.dat = secret}
      | No ICU schema found for ~/tz/2026a
      | New update not compatible or older version: 2026a vs. 2022a.1.0
    # When a download is taken, a file at ~/icutz is replaced, and a dangling /var/db/icutz goes.
      /var/db/icutz -> /missing
      ~/icutz = data
      ~/tz_latest -> ~/tz/2023c.1.0
      - /var/db/icutz
      + ~/TZVersionDiffRecord = 2022a.1.0_2023c.1.0
      + ~/icutz -> ~/tz/2023c.1.0/icutz
      + ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo
    # A directory at ~/icutz makes an activation fail: a reset. A dangling /var/db/icutz stays.
      /var/db/icutz -> /missing
      ~/icutz/
      ~/tz_latest -> ~/tz/2023c.1.0
      | remove: could not remove ~/icutz
      | unlink of ICU softlink failed
      | create_symlink: from ~/icutz to ~/tz/2023c.1.0/icutz
      | Unable to locate data; resetting to system partition
      | remove: could not remove ~/icutz
      | unlink of ICU softlink failed
    # /var/db/icutz moves to ~/icutz, its text kept even if it then dangles. /var/db/icu goes.
      /var/db/icu/
      /var/db/icutz -> icu
      - /var/db/icu
      - /var/db/icutz
      + ~/icutz -> icu
    # If ~/icutz leads to something, a file at /var/db/icutz goes. A dangling /var/db/icu goes too.
      ~/icutz -> /usr
      /var/db/icutz = data
      /var/db/icu -> /missing
      - /var/db/icu
      - /var/db/icutz
    # /var/db/icutz is removed even if a dangling ~/icutz, which stays, keeps it from moving there.
      ~/icutz -> /missing
      /var/db/icutz -> /usr
      | create_symlink: from ~/icutz to /usr
      | Could not migrate /var/db/icutz to ~/icutz
      - /var/db/icutz
    # A directory at /var/db/icutz stays. So does a non-empty one at /var/db/icu, without a word.
      /var/db/icutz/
      /var/db/icu/below/
      | read_symlink: /var/db/icutz
      | Could not migrate /var/db/icutz to ~/icutz
      | remove: could not remove /var/db/icutz
      | Could not remove /var/db/icutz
    # A missing localtime becomes Los Angeles, even if there never was a download.
      no ~/localtime
      no ~/tz
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
    # A localtime that begins with ~/zoneinfo silently stays.
      ~/localtime -> {~/zoneinfo, ~/zoneinfoX/No/Zone}
    # A localtime that begins with neither ~/zoneinfo nor /usr/share/zoneinfo becomes Los Angeles.
      ~/localtime -> {~/zoneinf, zoneinfo, /x/var/db/timezone/zoneinfo, /var//db/timezone/zoneinfo}
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
    # A file or an empty directory at localtime is replaced by the link to Los Angeles.
      ~/{localtime = data, localtime/}
      | read_symlink: ~/localtime
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
    # A localtime that begins with /usr/share/zoneinfo gets ~/zoneinfo instead, its rest kept.
      ~/localtime -> /usr/share/{zoneinfo/Europe/../Europe/Paris, zoneinfo}
      | Correcting localtime link to ~/*
      + ~/localtime -> ~/*
    # A localtime that begins with /usr/share/zoneinfo becomes Los Angeles if ~ lacks the place.
      /usr/share/zoneinfo.default/UTC -> /missing
      ~/localtime -> /usr/share/{zoneinfo/UTC, zoneinfo/+VERSION/a, zoneinfo.default/Europe/Paris}
      | Correcting localtime link to ~/*
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
  )");
}

TEST(a_start, fails_at_directories_in_the_place_of_links_but_keeps_them) {
  build(usual + "~/zoneinfo/\n no ~/localtime\n ~/localtime/below/\n ~/icutz -> /usr\n" +
        "~/tz_latest = data");
  const std::string before = listing();
  const std::string told = start();
  EXPECT_TRUE(told.starts_with("| read_symlink: ~/tz_latest\n| Unable to locate data;")) << told;
  EXPECT_TRUE(told.ends_with("| Could not reset localtime link\n| status 1\n")) << told;
  EXPECT_EQ(listing(), before);
}

TEST(a_start, cuts_the_target_of_a_link_after_1024_bytes) {
  build(usual);
  fs::create_symlink("/var/db/timezone/tz/" + std::string(2000, '1'), "/var/db/timezone/tz_latest");
  EXPECT_NE(start().find(": " + std::string(1004, '1') + " vs. 2022a.1.0\n"), std::string::npos);
}

TEST(a_start, ends_each_line_with_the_last_error) {
  build(usual + links_to("2023c.1.0") + "~/tz_latest -> ~/tz/2023c.1.0");
  start();
  EXPECT_EQ(content("/said"),
            "kelvane: New update not compatible or older version: 2023c.1.0 vs. 2023c.1.0: "
            "No such file or directory\n");
  // The last call to fail is the removal of /var/db/icu; a missing tz_latest would be a later one.
  build(usual + "/var/db/icu/full/\n ~/tz_latest -> ~/tz/2023c.1.0\n no ~/zoneinfo");
  fs::create_symlink("new\nline", "/var/db/timezone/zoneinfo");
  start();
  EXPECT_TRUE(content("/said").starts_with(
      "kelvane: Bad zoneinfo link new\nline: Directory not empty\n"
      "kelvane: Invalid current symlinks; resetting to system partition: Directory not empty\n"));
}

TEST(a_start, goes_on_where_what_it_writes_is_lost) {
  build(usual + "~/tz_latest -> ~/tz/2023c.1.0\n no ~/zoneinfo");
  const auto prepare = [] {
    ::dup2(::socket(AF_INET, SOCK_STREAM, 0), STDERR_FILENO);  // Unconnected: raises SIGPIPE.
    const rlimit no_bytes = {};
    ::setrlimit(RLIMIT_FSIZE, &no_bytes);  // The record raises SIGXFSZ.
  };
  EXPECT_EQ(start(prepare), "");
}

TEST(first_word, lies_between_white_space_of_any_kind) {
  const std::string blanks(5000, ' '), pages(8192, 'w'), bytes("#\xa0\0\x85", 4);
  const std::pair<std::string, std::string> words[] = {
      {pages + "\f2023d", pages}, {blanks + "\t\n\v\f\r" + bytes + "\v2023d", bytes}, {" \n", ""}};
  for (const auto& [text, word] : words) {
    std::ofstream("/file") << text;
    EXPECT_EQ(first_word("/file"), word) << text;
  }
}

TEST(versions, are_ordered_by_the_first_field_that_differs) {
  std::istringstream rising(R"(
      0a  2015z.9.9  2016a  2016a.0  2016a.1  2016a.1.0  2016a.1.9  2016a.2  2016a.10
      2016aa  2016b  2016z  2016za  2017a  10000a  2147483647a
  )");
  std::vector<tz_version> versions = {tz_version("2016a.1.2")};
  versions[0].parse("no version");  // Unset from then on, and older than all.
  for (std::string text; rising >> text;) versions.emplace_back(text);
  for (const tz_version& left : versions) {
    for (const tz_version& right : versions) {
      EXPECT_EQ(left > right, &left > &right) << left.letters << " " << right.letters;
      EXPECT_EQ(left == right, &left == &right);
    }
  }
  const std::string many(100000, 'z');  // So many must not overflow the stack.
  EXPECT_EQ(tz_version("02016" + many + ".010"), tz_version("2016" + many + ".10"));
}

}  // namespace kelvane
