// The program as a whole: its warnings, its exit status and what it leaves.

#include <sys/mount.h>
#include <sys/resource.h>

#include <algorithm>
#include <cerrno>

#include "tests/device.h"

namespace kelvane {
namespace {

// The system partition and the downloads, which no run changes.
const std::string data = R"(
    /usr/share/zoneinfo.default/+VERSION = 2022a
    /usr/share/zoneinfo.default/Europe/Paris = TZif
    /usr/share/icu/icutzformat.txt = 44l
    ~/tz/2022z/icutz/icutz44b.dat = data
    ~/tz/2022b/icutz/icutz44l.dat = data
    ~/tz/2023c.1.0/icutz/icutz44l.dat = data
    ~/tz/2023c.1.0/icutz/icutzformat.txt = 9l
    ~/tz/2023c.1.0/zoneinfo/+VERSION = 2030a
    ~/tz/2023c.1.0/zoneinfo/Europe/Paris = TZif
)";
const std::string on_system = "~/zoneinfo -> /usr/share/zoneinfo.default\n";
const std::string reset = on_system + "- ~/icutz\n", opt = "~/zoneinfo -> /opt\n";
std::string on(const std::string& version) {
  return "~/zoneinfo -> ~/tz/" + version + "/zoneinfo\n~/icutz -> ~/tz/" + version + "/icutz\n";
}
const std::string newest = "~/tz_latest -> ~/tz/", latest = newest + "2023c.1.0\n";
const std::string updatable = on_system + latest, legacy_icu = "/var/db/icutz -> ";
std::string record(const std::string& text) { return "~/TZVersionDiffRecord = " + text + "\n"; }
const std::string activated = on("2023c.1.0") + record("2022a.1.0_2023c.1.0");
const std::string old_zone = "~/localtime -> /usr/share/zoneinfo/Europe/Paris\n";
const std::string paris = "~/localtime -> ~/zoneinfo/Europe/Paris\n";
const std::string los_angeles = "~/localtime -> ~/zoneinfo/America/Los_Angeles\n";

// What is said.
const std::string invalid = "Invalid current symlinks; resetting to system partition\n";
const std::string rejected = "Symlink points at data incompatible with installed system\n";
const std::string not_newer = "New update not compatible or older version: ";
const std::string unable = "Unable to locate data; resetting to system partition\n";
const std::string no_zone = "localtime link invalid; resetting to America/Los_Angeles\n";
const std::string no_schema = "No ICU schema found for ~/tz/";
const std::string no_system = "create_symlink: from ~/zoneinfo to /usr/share/zoneinfo.default\n";
const std::string no_icu_link = "create_symlink: from ~/icutz to ~/tz/2023c.1.0/icutz\n";
const std::string icu_fails = "unlink of ICU softlink failed\n";
const std::string kept_icu = "remove: could not remove ~/icutz\n" + icu_fails;
const std::string kept_old = "remove: could not remove /var/db/icutz\n";
const std::string bad_opt = "Bad zoneinfo link /opt\n";
const std::string no_reset = "Could not reset to system partition\n";
const std::string no_default =
    no_zone + "create_symlink: from ~/localtime to ~/zoneinfo/America/Los_Angeles\n" +
    "Could not reset localtime link\nstatus 1\n";

void limit(decltype(RLIMIT_AS) resource, rlim_t value) {
  const rlimit limits = {value, value};
  ::setrlimit(resource, &limits);
}

struct run : device {
  struct situation {
    std::string before, after;  // What is said, then what changes.
    watcher watch = {};
    action prepare = {};
  };

  static void expect(const std::string& base, const std::vector<situation>& table) {
    for (const situation& row : table) {
      const std::string before = data + base + row.before;
      build(before);
      EXPECT_EQ(boot(row.watch, row.prepare), text(before + "\n" + row.after))
          << "in row " << &row - table.data();
    }
  }
};

TEST_F(run, the_newest_usable_data_set_is_selected) {
  const std::string c = "2023c.1.0", version = "/usr/share/zoneinfo.default/+VERSION = ";
  const std::string than_c = " vs. 2023c.1.0\n", bad = no_version(".1.0");
  expect(latest + paris + record("longer than what is written now"),
         {{on_system, activated},
          {on("2022b"), on(c) + record("2022b_2023c.1.0")},
          {version + "02023c\n" + on(c), not_newer + c + than_c},
          {on(c) + newest + "2022b", not_newer + "2022b" + than_c},
          {on_system + newest + "2022z", not_newer + "2022z vs. 2022a.1.0\n"},
          // A rejected data set is still what an update is compared with.
          {version + "2024b\n" + on("2022b"), rejected + on(c) + record("2024b.1.0_2023c.1.0")},
          {on("2022z"), rejected + activated},
          {version + "2024b\n" + on(c), rejected + not_newer + c + than_c + reset},
          {on("2022z") + newest + "2022b", rejected + not_newer + "2022b vs. 2022z\n" + reset},
          // Names that are no version, and numbers too large.
          {version + "\n" + on_system, bad + bad + on(c) + record(".1.0_2023c.1.0")},
          {on(c) + newest + "2022b/", no_version("2022b/") + not_newer + "2022b/" + than_c},
          {on(c) + newest + "x", no_version("x") + no_schema + "x\n" + not_newer + "x" + than_c},
          {on("99999999999a"), unable + reset},
          {version + "99999999999a\n" + on(c), unable + no_reset + "status 1\n"},
          {on("2022b") + newest + "2023c.99999999999", unable + reset}});
}

TEST_F(run, what_stands_in_a_links_place_is_replaced_or_reported) {
  const std::string bad_path = "orv_dataset::create_components: bad path tz/2022b\n";
  const std::string bare =
      "/usr/share/icu/icutzformat.txt = \n/usr/share/icu/icutz44l.dat = \n" + newest + "2026a";
  expect(paris,
         {{"", "Bad zoneinfo link \n" + invalid + on_system},
          {opt + latest, bad_opt + invalid + activated},
          {"~/zoneinfo = file", "read_symlink: ~/zoneinfo\n" + invalid + on_system},
          {on("2022z") + "~/tz_latest -> tz/2022b", rejected + bad_path + unable + reset},
          // Nothing is said of the zoneinfo link, which is not even read.
          {opt + "~/tz_latest = file", "read_symlink: ~/tz_latest\n" + unable + on_system},
          {updatable + legacy_icu + "/a\n~/icutz/", kept_icu + no_icu_link + unable + kept_icu},
          {updatable + "~/TZVersionDiffRecord/", on("2023c.1.0")},
          {updatable + "~/TZVersionDiffRecord -> /s/r\n/s/",
           on("2023c.1.0") + "- /s/\n/s/r = 2022a.1.0_2023c.1.0"},
          {on_system + bare, no_schema + "2026a\n" + on("2026a") + record("2022a.1.0_2026a")}});
}

TEST_F(run, what_fails_for_good_is_said_and_the_rest_goes_on) {
  const std::string bad = no_version(".1.0"), kept = "remove: could not remove ~/zoneinfo\n";
  const std::string fails = kept + "Unlink of zoneinfo softlink failed\n" + no_system;
  const std::string twice = invalid + fails + unable + fails + no_reset + no_zone + "status 1\n";
  expect("", {{"~/zoneinfo/\n~/icutz -> /a", "read_symlink: ~/zoneinfo\n" + twice + los_angeles}});
  build("");
  EXPECT_EQ(boot(), text(bad + "Bad zoneinfo link \n" + invalid + bad + no_system + unable + bad +
                         no_system + no_reset + no_default + "/var/db/"));
}

TEST_F(run, the_legacy_icu_link_is_carried_over_unless_there_is_a_new_one) {
  const std::string gone = "- /var/db/icutz\n", not_read = "read_symlink: /var/db/icutz\n";
  const std::string failed = "Could not migrate /var/db/icutz to ~/icutz\n";
  const std::string no_usr = "create_symlink: from ~/icutz to /usr\n";
  expect(on_system + paris,
         {{legacy_icu + "../../usr", gone + "~/icutz -> ../../usr"},
          {"/var/db/icu = file", "- /var/db/icu"},
          {legacy_icu + "/usr\n~/icutz -> /var\n/var/db/icu/", gone + "- /var/db/icu/"},
          {legacy_icu + "/usr\n~/icutz -> /a", no_usr + failed + gone},
          {legacy_icu + "/a\n/var/db/icu/full/", ""},
          {"/var/db/icutz = file", not_read + failed + gone},
          {"/var/db/icutz/", not_read + failed + kept_old + "Could not remove /var/db/icutz\n"}});
}

TEST_F(run, the_localtime_link_is_made_to_lead_through_the_store) {
  const std::string link = "~/localtime -> ", not_read = "read_symlink: ~/localtime\n";
  const std::string corrected = "Correcting localtime link to ~/zoneinfo";
  expect(on_system, {{"", no_zone + los_angeles},
                     {link + "~/zoneinfo", ""},
                     {link + "~/zoneinfo/../No/Zone", ""},
                     {link + "~/zoneinfoX", ""},
                     {link + "~/zoneinf", no_zone + los_angeles},
                     {link + "../../..~/zoneinfo/Europe/Paris", no_zone + los_angeles},
                     {link + "/usr/share/zoneinf", no_zone + los_angeles},
                     {link + "/usr/share/zoneinfo", corrected + "\n" + link + "~/zoneinfo"},
                     {link + "/usr/share/zoneinfo.default/Europe/Paris",
                      corrected + ".default/Europe/Paris\n" + no_zone + los_angeles},
                     {old_zone, corrected + "/Europe/Paris\n" + paris},
                     {"~/localtime = file", not_read + no_zone + los_angeles},
                     {"~/localtime/", not_read + no_zone + los_angeles + "- ~/localtime/"},
                     {"~/localtime/full/", not_read + no_default}});
}

TEST_F(run, surroundings_change_nothing_else) {
  char* const no_arguments[] = {nullptr};
  int ends[2];
  ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
  ::close(ends[0]);
  const action pipe = [] { ::mkfifo("/var/db/timezone/TZVersionDiffRecord", 0); };
  const std::string after = los_angeles + activated, said = no_zone + after;
  expect(updatable,
         {{"", after, {}, [] { ::close(0), ::close(1), ::close(2); }},
          {"", after, {}, [] { ::close(2); }},
          // Standard error without a reader, then one that may not grow, like the record.
          {"", after, {}, [&] { ::dup2(ends[1], 2); }},
          {"", after + record(""), {}, [] { limit(RLIMIT_FSIZE, 0); }},
          // One descriptor more; ctest leaves its log open as 3.
          {"",
           said,
           {},
           [] { ::close(3), limit(RLIMIT_NOFILE, fs::exists("/sbin/emulator") ? 9 : 4); }},
          {"", said + "- ~/TZVersionDiffRecord", {}, pipe},
          {"", said, {}, [] { limit(RLIMIT_STACK, 256 << 10); }},
#ifndef __SANITIZE_ADDRESS__
          {"", said, {}, [] { limit(RLIMIT_AS, 8 << 20); }},
#endif
          {"", said, {}, [] { ::umask(0777); }},
          {"", said, {}, [] { ::mkdir("/s", 0), fs::current_path("/s"), ::rmdir("/s"); }},
          {"", said, {}, [&] { ::execv("/sbin/kelvane", no_arguments); }}});
  const fs::path written = "/var/db/timezone/TZVersionDiffRecord";
  EXPECT_EQ(static_cast<int>(fs::status(written).permissions()), 0646);
  EXPECT_EQ(fs::file_size(written), 19u);
}

TEST_F(run, a_read_only_store_stays_as_it_is) {
  build(data + updatable);
  const std::string got = boot({}, [] {
    if (::unshare(CLONE_NEWNS) != 0 || ::mount("/var", "/var", "", MS_BIND, nullptr) != 0 ||
        ::mount("", "/var", "", MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr) != 0)
      ::_exit(100);
  });
  if (got.starts_with("status 100")) GTEST_SKIP() << "no right to mount";
  EXPECT_TRUE(got.ends_with(text(no_default + data + updatable))) << got;
}

// Runs whose system calls are watched.
struct disturbed_run : run {
  void SetUp() override {
    run::SetUp();
#ifdef SCMP_ACT_NOTIFY
    if (seccomp_api_get() >= 5) return;
#endif
    GTEST_SKIP() << "the kernel hands no system calls of this program over";
  }

  // Lets the call of this number fail, of those whose names begin so.
  static watcher failing(const std::string& name, int number = 1) {
    return [=, left = number](const std::string& call) mutable {
      return call.starts_with(name) && --left == 0 ? EIO : 0;
    };
  }

  // What the device held before each call, without repetition: all that a power cut can leave.
  std::vector<std::string> states;
  int writes = 0, writes_until_last_link = 0;
  const watcher note = [this](const std::string& call) {
    const std::string now = listing();
    if (std::ranges::find(states, now) == states.end()) states.push_back(now);
    writes += call == "write";
    if (call.starts_with("symlink")) writes_until_last_link = writes;
    return 0;
  };

  // Adds what is left of the first state where each call fails, once and from then on.
  void let_each_call_fail() {
    for (int disturbed = 2, calls = 1; disturbed / 2 <= calls; ++disturbed) {
      bool memory = false;
      build(states[0]);
      calls = 0;
      const std::string got = boot([&](const std::string& call) {
        ++calls;
        const bool fails = disturbed % 2 == 0 ? calls == disturbed / 2 : calls >= disturbed / 2;
        memory |= fails && (call == "brk" || call.starts_with("mmap"));
        return fails ? EIO : 0;
      });
      // A run that is short of memory may end by a signal.
      EXPECT_TRUE(memory || !std::regex_search(got, std::regex("signal|status [^1]"))) << got;
      note("exit");
    }
  }
};

TEST_F(disturbed_run, says_what_failed_and_goes_on) {
  const std::string corrects = "Correcting localtime link to ~/zoneinfo/Europe/Paris\n";
  const std::string no_paris = "create_symlink: from ~/localtime to ~/zoneinfo/Europe/Paris\n";
  expect(paris + record("old"),
         {{opt + latest, "read_symlink: ~/tz_latest\n" + unable + on_system, failing("readlink")},
          {opt, bad_opt + invalid + no_system + unable + on_system, failing("symlink")},
          {on("2022z"), rejected + no_system + unable + reset, failing("symlink")},
          {updatable, no_icu_link + unable, failing("symlink", 2)},
          {updatable + legacy_icu + "/a", kept_old + icu_fails + activated, failing("unlink", 4)},
          {updatable, on("2023c.1.0") + record(""), failing("write")},
          {on_system + old_zone, corrects + no_paris + no_zone + los_angeles, failing("symlink")}});
}

TEST_F(disturbed_run, changes_links_in_an_order_and_writes_each_line_at_once) {
  std::string holds = data + legacy_icu + "/usr\n/var/db/icu = file\n" + on("2022z") +
                      "- ~/icutz\n" + latest + old_zone + record("old");
  build(holds);
  boot(note);
  note("exit");
  std::vector<std::string> wanted = {text(holds)};
  for (const std::string& change :
       lines_of("~/icutz -> /usr\n- /var/db/icutz\n- /var/db/icu\n- ~/zoneinfo\n" + on_system +
                "- ~/icutz\n- ~/zoneinfo\n" + on("2023c.1.0") + record("") +
                record("2022a.1.0_2023c.1.0") + "- ~/localtime\n" + paris))
    wanted.push_back(text(holds += change + "\n"));
  EXPECT_EQ(states, wanted);
  EXPECT_EQ(writes_until_last_link, 3);
}

// A power cut leaves what the device holds before a call: nothing need be killed to see it.
TEST_F(disturbed_run, leaves_what_the_next_run_puts_right) {
  // With the number of states in which the ICU link is left behind: no run reads it.
  const std::pair<std::string, int> table[] = {
      {latest, 2},
      {updatable + paris + record("old"), 1},
      {on("2022b") + latest + paris, 2},
      {on("2022z") + latest + paris, 2},
      {on("2022z") + newest + "2022z\n" + paris, 1},
      {on("2023c.1.0") + "- ~/icutz\n" + legacy_icu + "~/tz/2023c.1.0/icutz\n" + latest + paris, 1},
      {on_system + old_zone + "/var/db/icu = file\n", 0},
      {opt + latest + paris, 1}};
  const std::regex varies("[^\n]*Record = .*\n|Europe/Paris|America/Los_Angeles");
  const std::regex icu("[^\n]*zone/icutz .*\n"), ended("signal|status");
  for (const auto& [before, left_behind] : table) {
    states = {text(data + before)};
    let_each_call_fail();
    std::string wanted;
    int behind = 0;
    for (std::size_t i = 0; i < states.size(); ++i) {
      build(states[i]);
      EXPECT_FALSE(std::regex_search(boot(note), ended)) << states[i];
      const std::string mended = listing(), links = std::regex_replace(mended, varies, "");
      EXPECT_EQ(std::regex_replace(boot(), std::regex("^[^/]*"), ""), mended);
      if (i == 0) wanted = links;
      behind += links != wanted;
      EXPECT_EQ(std::regex_replace(links, icu, ""), std::regex_replace(wanted, icu, ""));
    }
    EXPECT_EQ(behind, left_behind) << before << states.size();
  }
}

}  // namespace
}  // namespace kelvane
