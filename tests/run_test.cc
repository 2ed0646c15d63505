// What a start of a device says and changes; below, first_word() and the order of versions.

#include <sys/socket.h>

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

// A row is a device: its system's release, what its links lead to, its newest download; then what
// its start says of the latter two, what is in use afterwards, and the record that is written.
TEST(a_start, selects_the_newest_data_set_that_the_system_can_use) {
  //  system     links to   tz_latest  said              in use     record
  const std::string table = R"(
    # The links lead to usable data. A download is "refused" if it is not newer than that.
      2022a.1.0  system     2023c.1.0  -                 2023c.1.0  2022a.1.0_2023c.1.0
      2022a.1.0  2022b      2023c.1.0  -                 2023c.1.0  2022b_2023c.1.0
      2022a.1.0  2023c.1.0  2023c.1.0  refused           2023c.1.0  -
    # They lead to data older than the system's: "rejected". A download newer than it is taken.
      2022b.1.0  2022b      -          rejected          system     -
      2024b.1.0  2022b      2023c.1.0  rejected          2023c.1.0  2024b.1.0_2023c.1.0
      2024b.1.0  2023c.1.0  2023c.1.0  rejected,refused  system     -
    # Releases called "unfit" have another schema than the system.
      2022a.1.0  2022unfit  2023c.1.0  rejected          2023c.1.0  2022a.1.0_2023c.1.0
      2022a.1.0  2022unfit  2026unfit  rejected,refused  system     -
  )";
  std::istringstream rows(std::regex_replace(table, std::regex("#.*"), ""));
  std::string system, current, latest, said, used, record;
  while (rows >> system >> current >> latest >> said >> used >> record) {
    std::string device = usual + links_to(current) + "/usr/share/zoneinfo.default/+VERSION = ";
    device += system.substr(0, system.find('.')) + "\n";
    if (latest != "-") device += "~/tz_latest -> ~/tz/" + latest + "\n";
    const std::string rejected = "| Symlink points at data incompatible with installed system\n";
    const std::string& measure = current == "system" ? system : current;
    const std::string refused =
        "| New update not compatible or older version: " + latest + " vs. " + measure + "\n";
    std::string messages;
    if (said.starts_with("rejected")) messages += rejected;
    if (said.ends_with("refused")) messages += refused;
    const std::string written = record == "-" ? "" : "~/TZVersionDiffRecord = " + record;
    expect(device, messages, links_to(used) + written);
  }
}

// Expects that stories are so, each of which follows its title.
void expect_stories(const std::string& stories) {
  const std::size_t begin = stories.rfind('#');
  if (begin == stories.npos) return;
  expect_stories(stories.substr(0, begin));
  const std::string story = stories.substr(begin);
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

TEST(a_start, resets_links_to_data_that_is_missing_or_cannot_be_named) {
  expect_stories(R"(
    # The first start of a device, with a download: it has neither a link nor a zone.
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
    # The link names nothing below a directory in ~/tz. The ICU links go too, even one to itself.
      ~/icutz -> ~/tz/2022b/icutz
      /var/db/icutz -> /var/db/icutz
      ~/zoneinfo -> {zoneinfo, ~/tz/2022b, ~/tz//zoneinfo, /usr/share/zoneinfo.default/, %n}
      | Bad zoneinfo link *
      | Invalid current symlinks; resetting to system partition
      - ~/icutz
      - /var/db/icutz
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # A file stands in the link's place.
      ~/zoneinfo = file
      | read_symlink: ~/zoneinfo
      | Invalid current symlinks; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # The download is no directory below ~/tz/: even a usable data set is given up.
      ~/zoneinfo -> ~/tz/2022b/anything
      ~/tz_latest -> {tz/2023c.1.0, ~/tz/, ~/tzdata/2023c, /var//db/timezone/tz/2023c.1.0}
      | orv_dataset::create_components: bad path *
      | Unable to locate data; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # A number is above 2147483647: by one, or so that it would wrap to 2016 or to 1.
      ~/zoneinfo -> ~/tz/{2147483648a, 18446744073709553632a, 2016b.2147483648, 2016b.2.4294967297}/
      | Unable to locate data; resetting to system partition
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # A file stands in the store's place, where nothing can be read, removed or made.
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
  )");
}

TEST(a_start, takes_no_data_of_which_version_or_schema_are_unknown) {
  expect_stories(R"(
    # The data in use has a name that is no version, because of its doubled slash.
      ~/zoneinfo -> ~/tz//2023c.1.0/zoneinfo
      | Cannot parse version string /2023c.1.0, results.size() = 0
      | Cannot parse version string /2023c.1.0
      | Symlink points at data incompatible with installed system
      + ~/zoneinfo -> /usr/share/zoneinfo.default
    # The download's name is no version.
      ~/tz_latest -> ~/tz/{a, 2016, 2016A, 2016a., 2016a.1.2.3, 2016a.-1, 2016a/, /2016a, tz2016a}
      | Cannot parse version string *, results.size() = 0
      | Cannot parse version string *
      | No ICU schema found for ~/tz/*
      | New update not compatible or older version: * vs. 2022a.1.0
    # The system's release with .1.0 behind it is no version. It is read twice, as it is in use.
      /usr/share/zoneinfo.default/+VERSION = {anything, 2022a.2.0}
      | Cannot parse version string *.1.0, results.size() = 0
      | Cannot parse version string *.1.0
      | Cannot parse version string *.1.0, results.size() = 0
      | Cannot parse version string *.1.0
    # The system partition has no schema, the download has one.
      no /usr/share/icu/icutzformat.txt
      ~/tz_latest -> ~/tz/2023c.1.0
      | New update not compatible or older version: 2023c.1.0 vs. 2022a.1.0
    # The download's data has another name or place, is no file, or others may not read it.
      /usr/share/icu/icutzformat.txt = 4l
      ~/tz_latest -> ~/tz/2026a
      ~/tz/2026a/icutz/below/icutz4l.dat = data
      ~/tz/2026a/icutz/icutz4l{.dat2 = -, xdat = -, .dat/, .dat -> /said, .dat = secret, .dat|}
      | No ICU schema found for ~/tz/2026a
      | New update not compatible or older version: 2026a vs. 2022a.1.0
    # Neither the system nor the download has a schema: they match. No pipe is waited for.
      /usr/share/icu/icutzformat.txt|
      ~/TZVersionDiffRecord|
      ~/tz_latest -> ~/tz/2026a
      | No ICU schema found for ~/tz/2026a
      + ~/icutz -> ~/tz/2026a/icutz
      + ~/zoneinfo -> ~/tz/2026a/zoneinfo
  )");
}

TEST(a_start, mends_the_icu_link_and_the_local_time_link) {
  expect_stories(R"(
    # An activation replaces a file, and removes the older link though that leads nowhere.
      /var/db/icutz -> /missing
      ~/icutz = file
      ~/TZVersionDiffRecord -> /var/record
      ~/tz_latest -> ~/tz/2023c.1.0
      - /var/db/icutz
      + /var/record = 2022a.1.0_2023c.1.0
      + ~/icutz -> ~/tz/2023c.1.0/icutz
      + ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo
    # A directory in the ICU link's place fails the activation, and keeps the older link as well.
      /var/db/icutz -> /kept
      ~/icutz/
      ~/tz_latest -> ~/tz/2023c.1.0
      | remove: could not remove ~/icutz
      | unlink of ICU softlink failed
      | create_symlink: from ~/icutz to ~/tz/2023c.1.0/icutz
      | Unable to locate data; resetting to system partition
      | remove: could not remove ~/icutz
      | unlink of ICU softlink failed
    # The older layout's link leads to something, and is carried over before that is removed.
      /var/db/icu = goes last
      /var/db/icutz -> icu
      - /var/db/icu
      - /var/db/icutz
      + ~/icutz -> icu
    # The ICU link leads to something: what stands in the older one's place goes, unread.
      ~/icutz -> /usr
      /var/db/icutz = never read
      /var/db/{icu/, icu -> missing}
      - /var/db/icu
      - /var/db/icutz
    # The ICU link leads nowhere, but is in the way.
      /var/db/icutz -> /usr
      ~/icutz -> /missing
      | create_symlink: from ~/icutz to /usr
      | Could not migrate /var/db/icutz to ~/icutz
      - /var/db/icutz
    # Directories stand in the places of the older layout.
      /var/db/icu/full/
      /var/db/icutz/
      | read_symlink: /var/db/icutz
      | Could not migrate /var/db/icutz to ~/icutz
      | remove: could not remove /var/db/icutz
      | Could not remove /var/db/icutz
    # The local-time link begins with the zoneinfo link's path. (Nobody waits for the pipe.)
      ~/tz|
      ~/localtime -> {~/zoneinfo, ~/zoneinfoX/No/Zone}
    # The local-time link begins otherwise, wherever it leads. (Downloads need not exist.)
      no ~/tz
      ~/localtime -> {~/zoneinf, zoneinfo/, /var//db/timezone/zoneinfo, ../../../usr/share/zoneinfo}
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
    # A file or a directory stands in the local-time link's place.
      ~/{localtime = file, localtime/}
      | read_symlink: ~/localtime
      | localtime link invalid; resetting to America/Los_Angeles
      + ~/localtime -> ~/zoneinfo/America/Los_Angeles
    # The local-time link names the system partition, and the data in use has the same zone.
      ~/localtime -> /usr/share/zoneinfo{, /+VERSION}
      | Correcting localtime link to ~/zoneinfo*
      + ~/localtime -> ~/zoneinfo*
    # The local-time link names a zone that the data in use lacks, or has as a link to nowhere.
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

TEST(a_start, goes_on_when_nobody_reads_what_it_says) {
  build(usual + "no ~/zoneinfo");
  const auto unconnected = [] { ::dup2(::socket(AF_INET, SOCK_STREAM, 0), STDERR_FILENO); };
  EXPECT_EQ(start(unconnected), "");
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
  const std::string many(100000, 'z');
  EXPECT_EQ(tz_version("02016" + many + ".010"), tz_version("2016" + many + ".10"));
}

}  // namespace kelvane
