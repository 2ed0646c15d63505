// What a start of a device says and changes; below, first_word() and the order of versions.

#include "foundation/first_word.h"
#include "foundation/tz_version.h"
#include "tests/device.h"

namespace kelvane {

// Expects what the start of a device says and, as entries instead of others, what it changes.
void expect(const std::string& device, const std::string& said, const std::string& changes) {
  build(device + changes);
  const std::string wanted = said + listing();
  build(device);
  const std::string told = start();
  EXPECT_EQ(told + listing(), wanted) << "on the device\n" << device;
}

// A row is a device: its system's release, counted as 2022a.1.0, what its links lead to, its newest
// download; then what its start gives. What they led to is "rejected"; the download is "refused" if
// it is not newer than that. 02022b is 2022b; 2022z and 2026z are unusable, of another schema.
TEST(a_start, selects_the_newest_data_set_that_the_system_can_use) {
  //  +VERSION  zoneinfo   tz_latest  said              in use     record (system's if rejected)
  std::istringstream rows(R"(
      2023c     2023c.1.0  -          -                 2023c.1.0  -
      2022b     02022b     -          rejected          system     -
      2022a     system     2023c.1.0  -                 2023c.1.0  2022a.1.0_2023c.1.0
      2022a     02022b     2023c.1.0  -                 2023c.1.0  02022b_2023c.1.0
      2022a     2023c.1.0  2023c.1.0  refused           2023c.1.0  -
      2024b     2023c.1.0  2023c.1.0  rejected,refused  system     -
      2024b     02022b     2023c.1.0  rejected          2023c.1.0  2024b.1.0_2023c.1.0
      2022a     2022z      02022b     rejected,refused  system     -
      2022a     2022z      2026z      rejected,refused  system     -
      2022a     2022z      2023c.1.0  rejected          2023c.1.0  2022a.1.0_2023c.1.0
  )");
  std::string system, current, latest, said, used, record;
  while (rows >> system >> current >> latest >> said >> used >> record) {
    std::string device = usual + "/usr/share/zoneinfo.default/+VERSION = " + system + "\n";
    device += links_to(current) + (latest == "-" ? "" : "~/tz_latest -> ~/tz/" + latest + "\n");
    std::string messages;
    if (said.starts_with("rejected")) {
      messages += "| Symlink points at data incompatible with installed system\n";
    }
    if (said.ends_with("refused")) {
      messages += "| New update not compatible or older version: " + latest + " vs. ";
      messages += (current == "system" ? system + ".1.0" : current) + "\n";
    }
    const std::string written = record == "-" ? "" : "~/TZVersionDiffRecord = " + record;
    expect(device, messages, links_to(used) + written);
  }
}

// The choices between the braces of an entry, "a" and "b" in "{a, b}"; "" if it has none.
std::vector<std::string> choices_in(const std::string& entry) {
  std::smatch braces;
  std::regex_search(entry, braces, std::regex("\\{(.*)\\}"));
  std::vector<std::string> choices;
  std::istringstream text(braces.str(1) + ",");
  for (std::string choice; std::getline(text >> std::ws, choice, ',');) choices.push_back(choice);
  return choices;
}

// Expects that stories, parted by blank lines, are so.
void expect_stories(const std::string& stories) {
  const std::size_t gap = stories.find("\n\n");
  if (gap != stories.npos) expect_stories(stories.substr(gap + 2));
  std::string entries, last, said, changes;
  std::istringstream lines(stories.substr(0, gap));
  for (std::string line; std::getline(lines >> std::ws, line);) {
    if (line[0] == '|') said += line + "\n";
    else if (line[0] == '-') changes += "no " + line.substr(2) + "\n";
    else if (line[0] == '+') changes += line.substr(2) + "\n";
    else {
      entries += last;
      last = line + "\n";
    }
  }
  for (const std::string& choice : choices_in(last)) {
    const auto chosen = [&](const std::string& text) {
      return std::regex_replace(text, std::regex("\\{.*\\}|\\*"), choice);
    };
    expect(usual + entries + chosen(last), chosen(said), chosen(changes));
  }
}

TEST(a_start, uses_no_data_that_is_missing_does_not_fit_or_has_too_large_a_number) {
  expect_stories(R"(
      no ~/zoneinfo
      no ~/localtime
      ~/icutz -> ~/tz/2023c.1.0/icutz
      ~/tz_latest -> ~/tz/2023c.1.0
      | Bad zoneinfo link
      | Invalid current symlinks; resetting to system partition
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/TZVersionDiffRecord = 2022a.1.0_2023c.1.0
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
      + ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo

      ~/icutz -> ~/tz/2022b/icutz
      /var/db/icutz -> /var/db/icutz
      ~/zoneinfo -> {zoneinfo, ~/tz/2022b, ~/tz//zoneinfo, /usr/share/zoneinfo.default/, %n}
      | Bad zoneinfo link *
      | Invalid current symlinks; resetting to system partition
      - ~/icutz
      - /var/db/icutz
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      ~/zoneinfo = file
      | read_symlink: ~/zoneinfo
      | Invalid current symlinks; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      ~/zoneinfo -> ~/tz/02022b/anything
      ~/tz_latest -> {tz/2023c.1.0, ~/tz/, ~/tzdata/2023c, /~/tz/2023c.1.0}
      | orv_dataset::create_components: bad path *
      | Unable to locate data; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      no /usr/share/icu/icutzformat.txt
      ~/tz_latest -> ~/tz/2023c.1.0
      | New update not compatible or older version: 2023c.1.0 vs. 2022a.1.0

      ~ = file
      | read_symlink: ~/tz_latest
      | Unable to locate data; resetting to system partition
      | remove: could not remove ~/zoneinfo
      | Unlink of zoneinfo softlink failed
      | create_symlink: from ~/zoneinfo to /usr/share/zoneinfo.default
      | Could not reset to system partition
      | read_symlink: ~/localtime
      | localtime link invalid; resetting to America/Los_Angeles
      | create_symlink: from ~/localtime to ~/zoneinfo/America/Los_Angeles
      | Could not reset localtime link
      | status 1

      ~/zoneinfo -> ~/tz//2023c.1.0/zoneinfo
      ~/tz_latest -> ~/tz//2023c.1.0/
      | Cannot parse version string /2023c.1.0, results.size() = 0
      | Cannot parse version string /2023c.1.0
      | Symlink points at data incompatible with installed system
      | Cannot parse version string /2023c.1.0/, results.size() = 0
      | Cannot parse version string /2023c.1.0/
      | New update not compatible or older version: /2023c.1.0/ vs. /2023c.1.0
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      ~/zoneinfo -> ~/tz/{2147483648a, 18446744073709553632a, 2016b.2147483648, 2016b.2.4294967297}/
      | Unable to locate data; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      ~/tz_latest -> ~/tz/{a, 2016, 2016A, 2016a., 2016a.1.2.3, 2016a.-1, 2016a/, tzdata2016a}
      | Cannot parse version string *, results.size() = 0
      | Cannot parse version string *
      | No ICU schema found for ~/tz/*
      | New update not compatible or older version: * vs. 2022a.1.0

      /usr/share/zoneinfo.default/+VERSION = {anything, 2022a.2.0}
      | Cannot parse version string *.1.0, results.size() = 0
      | Cannot parse version string *.1.0
      | Cannot parse version string *.1.0, results.size() = 0
      | Cannot parse version string *.1.0

      /usr/share/icu/icutzformat.txt = anything
      ~/tz_latest -> ~/tz/2026a
      ~/tz/2026a/icutz/below/icutz4l.dat = data
      ~/tz/2026a/icutz/icutz4l{.dat2 = -, xdat = -, .dat/, .dat -> /said, .dat = secret, .dat|}
      | No ICU schema found for ~/tz/2026a
      | New update not compatible or older version: 2026a vs. 2022a.1.0
  )");
}

TEST(a_start, makes_links_anew_and_carries_over_those_of_the_older_layout) {
  expect_stories(R"(
      /var/db/icutz -> /missing
      ~/icutz = file
      ~/TZVersionDiffRecord -> /var/record
      ~/tz_latest -> ~/tz/2023c.1.0
      - /var/db/icutz
      + /var/record = 2022a.1.0_2023c.1.0
      + ~/icutz -> ~/tz/2023c.1.0/icutz
      + ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo

      /var/db/icutz -> /kept
      ~/icutz/
      ~/tz_latest -> ~/tz/2023c.1.0
      | remove: could not remove ~/icutz
      | unlink of ICU softlink failed
      | create_symlink: from ~/icutz to ~/tz/2023c.1.0/icutz
      | Unable to locate data; resetting to system partition
      | remove: could not remove ~/icutz
      | unlink of ICU softlink failed

      /usr/share/icu/icutzformat.txt|
      ~/TZVersionDiffRecord|
      ~/tz_latest -> ~/tz/2026a
      ~/tz/2026a/icutz -> icutz
      | No ICU schema found for ~/tz/2026a
      + ~/icutz -> ~/tz/2026a/icutz
      + ~/zoneinfo -> ~/tz/2026a/zoneinfo

      /var/db/icu = goes last
      /var/db/icutz -> icu
      - /var/db/icu
      - /var/db/icutz
      + ~/icutz -> icu

      ~/icutz -> /usr
      /var/db/icutz = never read
      /var/db/{icu/, icu -> missing}
      - /var/db/icu
      - /var/db/icutz

      /var/db/icutz -> /usr
      ~/icutz -> /missing
      | create_symlink: from ~/icutz to /usr
      | Could not migrate /var/db/icutz to ~/icutz
      - /var/db/icutz

      /var/db/icu/full/
      /var/db/icutz/
      | read_symlink: /var/db/icutz
      | Could not migrate /var/db/icutz to ~/icutz
      | remove: could not remove /var/db/icutz
      | Could not remove /var/db/icutz
  )");
}

TEST(a_start, makes_the_local_time_link_lead_through_the_store) {
  expect_stories(R"(
      ~/tz|
      ~/localtime -> {~/zoneinfo, ~/zoneinfoX/No/Zone}

      no ~/tz
      ~/localtime -> {~/zoneinf, zoneinfo/+VERSION, /.~/zoneinfo, ../../../usr/share/zoneinfo}
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles

      ~/{localtime = file, localtime/}
      | read_symlink: ~/localtime
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles

      ~/localtime -> /usr/share/zoneinfo{, //+VERSION}
      | Correcting localtime link to ~/zoneinfo*
      + ~/localtime -> ~/zoneinfo*

      ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo
      ~/tz/2023c.1.0/zoneinfo/%n -> missing
      ~/localtime -> /usr/share/zoneinfo{/%n, /release, .default/+VERSION}
      | Correcting localtime link to ~/zoneinfo*
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
  )");
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
  std::vector<tz_version> versions(1);
  for (std::string text; rising >> text;) versions.emplace_back(text);
  for (const tz_version& left : versions) {
    for (const tz_version& right : versions) {
      EXPECT_EQ(left > right, &left > &right) << left.letters << " " << right.letters;
      EXPECT_EQ(left == right, &left == &right);
    }
  }
  const std::string many(100000, 'z');
  EXPECT_EQ(tz_version("02016" + many + ".010"), tz_version("2016" + many + ".10"));
}

}  // namespace kelvane
