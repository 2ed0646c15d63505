// What a start of a device says and changes.

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

// A row is a device: the release of its system partition, to what its links lead, and its newest
// download; then what its start gives. What the links led to can be "rejected", and the download
// "refused", which has to be newer than that even where it was rejected.
TEST(a_start, selects_the_newest_data_set_that_the_system_can_use) {
  std::istringstream rows(R"(
  //  +VERSION  zoneinfo   tz_latest  said              in use     record
      2023c     2023c.1.0  -          -                 2023c.1.0  -
      2022b     2022b      -          rejected          system     -
      2022a     system     2023c.1.0  -                 2023c.1.0  2022a.1.0_2023c.1.0
      2022a     2022b      2023c.1.0  -                 2023c.1.0  2022b_2023c.1.0
      2022a     2023c.1.0  2023c.1.0  refused           2023c.1.0  -
      2022a     system     2022z      refused           system     -
      02023c    system     2023c.1.0  refused           system     -
      2024b     2023c.1.0  2023c.1.0  rejected,refused  system     -
      2024b     2022b      2023c.1.0  rejected          2023c.1.0  2024b.1.0_2023c.1.0
      2022a     2022z      2022b      rejected,refused  system     -
      2022a     2022z      2026z      rejected,refused  system     -
      2022a     2022z      2023c.1.0  rejected          2023c.1.0  2022a.1.0_2023c.1.0
  )");
  std::string system, current, latest, said, used, record;
  std::getline(rows.ignore(), record);
  while (rows >> system >> current >> latest >> said >> used >> record) {
    std::string device = usual + "/usr/share/zoneinfo.default/+VERSION = " + system + "\n";
    device += links_to(current);
    if (latest != "-") device += "~/tz_latest -> ~/tz/" + latest + "\n";
    std::string messages;
    if (said.starts_with("rejected")) {
      messages += "| Symlink points at data incompatible with installed system\n";
    }
    if (said.ends_with("refused")) {
      messages += "| New update not compatible or older version: " + latest + " vs. ";
      messages += (current == "system" ? system + ".1.0" : current) + "\n";
    }
    std::string changes = links_to(used);
    if (record != "-") changes += "~/TZVersionDiffRecord = " + record;
    expect(device, messages, changes);
  }
}

// The choices between the braces of an entry, "a" and "b" in "{a, b}"; "" if it has none.
std::vector<std::string> choices_in(const std::string& entry) {
  std::smatch braces;
  if (!std::regex_search(entry, braces, std::regex("\\{(.*)\\}"))) return {""};
  std::vector<std::string> choices;
  std::istringstream text(braces.str(1));
  for (std::string choice; std::getline(text >> std::ws, choice, ',');) choices.push_back(choice);
  return choices;
}

// Expects that stories are so, with a blank line between them: what a device has besides the usual,
// what a start says, the paths that go ("-") and what comes or changes ("+"). Choices in the last
// entry of the device are a device each; "*" is the choice.
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
    const std::string entry = std::regex_replace(last, std::regex("\\{.*\\}"), choice);
    expect(usual + entries + entry, std::regex_replace(said, std::regex("\\*"), choice), changes);
  }
}

TEST(a_start, uses_no_data_that_it_cannot_find_or_that_do_not_fit) {
  expect_stories(R"(
      no ~/zoneinfo
      no ~/localtime
      ~/tz_latest -> ~/tz/2023c.1.0
      | Bad zoneinfo link
      | Invalid current symlinks; resetting to system partition
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/TZVersionDiffRecord = 2022a.1.0_2023c.1.0
      + ~/icutz -> ~/tz/2023c.1.0/icutz
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
      + ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo

      ~/icutz -> ~/tz/2022b/icutz
      /var/db/icutz -> icutz
      ~/zoneinfo -> {tz/2022b/zoneinfo, ~/tz/2022b, ~/tz//zoneinfo, /usr/share/zoneinfo, %n}
      | Bad zoneinfo link *
      | Invalid current symlinks; resetting to system partition
      - ~/icutz
      - /var/db/icutz
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      ~/icutz -> /missing
      ~/zoneinfo/
      | read_symlink: ~/zoneinfo
      | Invalid current symlinks; resetting to system partition
      | remove: could not remove ~/zoneinfo
      | Unlink of zoneinfo softlink failed
      | create_symlink: from ~/zoneinfo to /usr/share/zoneinfo.default
      | Unable to locate data; resetting to system partition
      | remove: could not remove ~/zoneinfo
      | Unlink of zoneinfo softlink failed
      | create_symlink: from ~/zoneinfo to /usr/share/zoneinfo.default
      | Could not reset to system partition
      | status 1

      ~/icutz -> ~/tz/2022b/icutz
      ~/zoneinfo -> ~/tz/2022b/anything
      ~/tz_latest -> {tz/2023c.1.0, ~/tz/, ~/tzdata/2023c, /~/tz/2023c.1.0}
      | orv_dataset::create_components: bad path *
      | Unable to locate data; resetting to system partition
      - ~/icutz
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      ~/zoneinfo = file
      ~/tz_latest = file
      | read_symlink: ~/tz_latest
      | Unable to locate data; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      ~/zoneinfo -> ~/tz//2023c.1.0/zoneinfo
      ~/tz_latest -> ~/tz//2023c.1.0/
      | Cannot parse version string /2023c.1.0, results.size() = 0
      | Cannot parse version string /2023c.1.0
      | Symlink points at data incompatible with installed system
      | Cannot parse version string /2023c.1.0/, results.size() = 0
      | Cannot parse version string /2023c.1.0/
      | New update not compatible or older version: /2023c.1.0/ vs. /2023c.1.0
      + ~/zoneinfo -> /usr/share/zoneinfo.default

      ~/tz_latest -> ~/tz/2026a
      ~/tz/2026a/icutz/icutz44l{.dat.bak = -, xdat = -, .dat/x = -, .dat -> /usr, .dat = not for others}
      | No ICU schema found for ~/tz/2026a
      | New update not compatible or older version: 2026a vs. 2022a.1.0

      no /usr/share/icu/icutzformat.txt
      ~/TZVersionDiffRecord/
      ~/tz_latest -> ~/tz/2026a
      ~/tz/2026a/icutz -> icutz
      | No ICU schema found for ~/tz/2026a
      + ~/icutz -> ~/tz/2026a/icutz
      + ~/zoneinfo -> ~/tz/2026a/zoneinfo
  )");
}

TEST(a_start, makes_links_anew_and_carries_over_those_of_the_older_layout) {
  expect_stories(R"(
      /var/db/icutz -> /missing
      ~/icutz = file
      ~/TZVersionDiffRecord -> /var/record
      ~/localtime -> /usr/share/zoneinfo/Europe//Paris
      ~/tz_latest -> ~/tz/2023c.1.0
      | Correcting localtime link to ~/zoneinfo/Europe//Paris
      - /var/db/icutz
      + /var/record = 2022a.1.0_2023c.1.0
      + ~/icutz -> ~/tz/2023c.1.0/icutz
      + ~/localtime -> ~/zoneinfo/Europe//Paris
      + ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo

      /var/db/icutz -> icutz
      ~/icutz/
      ~/tz_latest -> ~/tz/2023c.1.0
      | remove: could not remove ~/icutz
      | unlink of ICU softlink failed
      | create_symlink: from ~/icutz to ~/tz/2023c.1.0/icutz
      | Unable to locate data; resetting to system partition
      | remove: could not remove ~/icutz
      | unlink of ICU softlink failed

      /var/db/icu = file
      /var/db/icutz -> icu
      - /var/db/icu
      - /var/db/icutz
      + ~/icutz -> icu

      ~/icutz -> /usr
      /var/db/icutz = file
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
      ~/localtime -> {~/zoneinfo, ~/zoneinfoX/No/Zone}

      ~/localtime -> {~/zoneinf, zoneinfo/+VERSION, /var/db/./timezone/zoneinfo/+VERSION}
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles

      ~/{localtime = file, localtime/}
      | read_symlink: ~/localtime
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles

      /usr/share/zoneinfo.default/%n -> missing
      ~/localtime -> /usr/share/zoneinfo{/%n, .default/+VERSION}
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
  build(usual + "/var/db/icu/full/\n ~/tz_latest -> ~/tz/2023c.1.0\n no ~/zoneinfo");
  fs::create_symlink("new\nline", "/var/db/timezone/zoneinfo");
  start();
  EXPECT_TRUE(content("/said").starts_with(
      "kelvane: Bad zoneinfo link new\nline: Directory not empty\n"
      "kelvane: Invalid current symlinks; resetting to system partition: Directory not empty\n"));
}

TEST(a_start, is_the_same_where_nobody_reads_what_it_says) {
  build(usual + "no ~/localtime");
  int ends[2];
  ASSERT_EQ(::pipe(ends), 0);
  ::close(ends[0]);
  EXPECT_EQ(start([&] { ::dup2(ends[1], STDERR_FILENO); }), "");
}

}  // namespace kelvane
