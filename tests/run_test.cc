// The program as a whole: its warnings, its exit status and what it leaves.

#include <sys/mount.h>
#include <sys/resource.h>

#include <algorithm>
#include <cerrno>
#include <regex>

#include "tests/device.h"

namespace kelvane {
namespace {

// The system partition and the downloads, which no run changes.
const std::string data = R"(
    /usr/share/zoneinfo.default/+VERSION = 2022a
    /usr/share/zoneinfo.default/Europe/Paris = TZif
    /usr/share/icu/icutzformat.txt = 44l
    ~/tz/2022z/icutz/icutz44b.dat = data
    ~/tz/2023b/icutz/icutz44l.dat = data
    ~/tz/2023c.1.0/icutz/icutz44l.dat = data
    ~/tz/2023c.1.0/zoneinfo/Europe/Paris = TZif
    ~/tz/2024a/icutz/icutz44l.dat = data
    ~/tz/2025a/icutz/icutz44b.dat = data
    ~/tz/2026a/icutz/)"
                         "\n";
const std::string on_system = "~/zoneinfo -> /usr/share/zoneinfo.default\n";
const std::string reset = "- ~/icutz\n" + on_system,
                  old_zone = "~/localtime -> /usr/share/zoneinfo/Europe/Paris\n";
const std::string latest = "~/tz_latest -> ~/tz/2023c.1.0\n", updatable = on_system + latest;
const std::string opt = "~/zoneinfo -> /opt\n";
const std::string paris = "~/localtime -> ~/zoneinfo/Europe/Paris\n";
const std::string los_angeles = "~/localtime -> ~/zoneinfo/America/Los_Angeles\n";
std::string on(const std::string& version) {
  return "~/zoneinfo -> ~/tz/" + version + "/zoneinfo\n~/icutz -> ~/tz/" + version + "/icutz\n";
}
std::string record(const std::string& text) { return "~/TZVersionDiffRecord = " + text + "\n"; }
const std::string activated = on("2023c.1.0") + record("2022a.1.0_2023c.1.0");

// What is said.
const std::string invalid = "Invalid current symlinks; resetting to system partition\n";
const std::string rejected = "Symlink points at data incompatible with installed system\n";
const std::string unable = "Unable to locate data; resetting to system partition\n";
const std::string no_zone = "localtime link invalid; resetting to America/Los_Angeles\n";
const std::string not_migrated = "Could not migrate /var/db/icutz to ~/icutz\n";
const std::string no_schema = "No ICU schema found for ~/tz/";
std::string bad_link(const std::string& target) { return "Bad zoneinfo link " + target + "\n"; }
std::string unread(const std::string& link) { return "read_symlink: " + link + "\n"; }
std::string kept(const std::string& link) { return "remove: could not remove " + link + "\n"; }
std::string no_link(const std::string& name, const std::string& target) {
  return "create_symlink: from ~/" + name + " to " + target + "\n";
}
std::string not_newer(const std::string& update, const std::string& current) {
  return "New update not compatible or older version: " + update + " vs. " + current + "\n";
}
std::string no_version(const std::string& text) {
  const std::string warning = "Cannot parse version string " + text;
  return warning + ", results.size() = 0\n" + warning + "\n";
}
const std::string no_system_link = no_link("zoneinfo", "/usr/share/zoneinfo.default");
const std::string no_zoneinfo_link = no_link("zoneinfo", "~/tz/2023c.1.0/zoneinfo");
const std::string no_icu_link = no_link("icutz", "~/tz/2023c.1.0/icutz");
const std::string no_paris_link = no_link("localtime", "~/zoneinfo/Europe/Paris");
const std::string kept_zoneinfo = kept("~/zoneinfo") + "Unlink of zoneinfo softlink failed\n";
const std::string kept_icu = kept("~/icutz") + "unlink of ICU softlink failed\n";
const std::string no_reset = "Could not reset to system partition\n";
const std::string no_default_zone = no_zone +
                                    no_link("localtime", "~/zoneinfo/America/Los_Angeles") +
                                    "Could not reset localtime link\n";

// Lets the call of this number fail, of those whose names begin so.
watcher failing(const std::string& name, int number = 1) {
  return [=, left = number](const std::string& call) mutable {
    return call.starts_with(name) && --left == 0 ? EIO : 0;
  };
}

void limit(decltype(RLIMIT_AS) resource, rlim_t value) {
  const rlimit limits = {value, value};
  ::setrlimit(resource, &limits);
}

class run : public device {
 protected:
  struct situation {
    std::string before, says, changes;
    watcher watch = {};
  };

  // With `base` in each device.
  static void expect(const std::string& base, const std::vector<situation>& table) {
    for (const auto& [before, says, changes, watch] : table) {
      build(data + base + before);
      EXPECT_EQ(boot(watch), text(data + base + before + "\n" + says + changes));
    }
  }
};

TEST_F(run, the_newest_usable_data_set_is_selected) {
  const std::string c = "2023c.1.0", version = "/usr/share/zoneinfo.default/+VERSION = ";
  const struct {
    std::string system, links, latest, says, changes;
  } table[] = {
      {"2022a", on_system, c, "", activated},
      {"2022a", on("2023b"), c, "", on(c) + record("2023b_2023c.1.0")},
      {"2023c", on(c), c, not_newer(c, c), ""},
      {"2022a", on("2024a"), c, not_newer(c, "2024a"), ""},
      {"2022a", on_system, "2025a", not_newer("2025a", "2022a.1.0"), ""},
      // A rejected data set is still what an update is compared with.
      {"2024b", on("2023b"), c, rejected, on(c) + record("2024b.1.0_2023c.1.0")},
      {"2022a", on("2022z"), c, rejected, activated},
      {"2024b", on(c), c, rejected + not_newer(c, c), reset},
      {"2022a", on("2025a"), c, rejected + not_newer(c, "2025a"), reset},
      {"2022a", on("2026a"), c, no_schema + "2026a\n" + rejected + not_newer(c, "2026a"), reset},
      // Names that are no version, and numbers too large.
      {"", on_system, c, no_version(".1.0") + no_version(".1.0"), on(c) + record(".1.0_2023c.1.0")},
      {"2022a", on("2023b"), c + "/", no_version(c + "/") + not_newer(c + "/", "2023b"), ""},
      {"2022a", on(c), "x", no_version("x") + no_schema + "x\n" + not_newer("x", c), ""},
      {"2022a", on("99999999999a"), c, unable, reset},
      {"2022a", on("2023b"), "2023c.99999999999", unable, reset}};
  for (const auto& [system, links, target, says, changes] : table)
    expect(version + system + "\n" + paris + "~/tz_latest -> ~/tz/" + target + "\n",
           {{links, says, changes}});
}

TEST_F(run, a_record_is_replaced_by_an_activation_alone) {
  expect(latest + paris, {{on_system + record("longer than what is written now"), "", activated},
                          {activated, not_newer("2023c.1.0", "2023c.1.0"), ""}});
  struct stat status = {};
  ASSERT_EQ(::stat("/var/db/timezone/TZVersionDiffRecord", &status), 0);
  EXPECT_TRUE(status.st_mode == (S_IFREG | 0644) && status.st_size == 19);
}

TEST_F(run, what_stands_in_a_links_place_is_replaced_or_reported) {
  const std::string bad_path = "orv_dataset::create_components: bad path /opt/a\n";
  const std::string no_schemas = "/usr/share/icu/icutzformat.txt = \n~/tz_latest -> ~/tz/2026a";
  expect(paris, {{"", bad_link("") + invalid, on_system},
                 {opt + latest, bad_link("/opt") + invalid, activated},
                 {"~/zoneinfo = file", unread("~/zoneinfo") + invalid, on_system},
                 {on("2023b") + "~/tz_latest -> /opt/a", bad_path + unable, reset},
                 // Nothing is said of the zoneinfo link, which is not even read.
                 {opt + "~/tz_latest = file", unread("~/tz_latest") + unable, on_system},
                 {updatable + "/var/db/icutz -> /a\n~/icutz/",
                  kept_icu + no_icu_link + unable + kept_icu, ""},
                 {updatable + "~/TZVersionDiffRecord/", "", on("2023c.1.0")},
                 {on_system + no_schemas, no_schema + "2026a\n",
                  on("2026a") + record("2022a.1.0_2026a")}});
}

TEST_F(run, what_fails_for_good_is_said_and_the_rest_goes_on) {
  const std::string fails = kept_zoneinfo + no_system_link,
                    no_store = no_version(".1.0") + no_system_link;
  expect("", {{"~/zoneinfo/",
               unread("~/zoneinfo") + invalid + fails + unable + fails + no_reset + no_zone +
                   "status 1\n",
               los_angeles}});
  build("");
  EXPECT_EQ(boot(), text(no_version(".1.0") + bad_link("") + invalid + no_store + unable +
                         no_store + no_reset + no_default_zone + "status 1\n/var/db/"));
}

TEST_F(run, the_legacy_icu_link_is_carried_over_unless_there_is_a_new_one) {
  const std::string old = "/var/db/icutz -> ", gone = "- /var/db/icutz\n";
  const std::string not_read = unread("/var/db/icutz") + not_migrated;
  expect(on_system + paris,
         {{old + "../../usr\n/var/db/icu = file", "", gone + "- /var/db/icu\n~/icutz -> ../../usr"},
          {old + "/usr\n~/icutz -> /var\n/var/db/icu/", "", gone + "- /var/db/icu/"},
          {old + "/usr\n~/icutz -> /a", no_link("icutz", "/usr") + not_migrated, gone},
          {old + "/a\n/var/db/icu/full/", "", ""},
          {"/var/db/icutz = file", not_read, gone},
          {"/var/db/icutz/", not_read + kept("/var/db/icutz") + "Could not remove /var/db/icutz\n",
           ""}});
}

TEST_F(run, the_localtime_link_is_made_to_lead_through_the_store) {
  const std::string link = "~/localtime -> ", not_read = unread("~/localtime");
  const std::string corrected = "Correcting localtime link to ~/zoneinfo";
  expect(on_system,
         {{"", no_zone, los_angeles},
          {link + "~/zoneinfo/No/Zone", "", ""},
          {link + "~/zoneinfoX", "", ""},
          {link + "~/zoneinf", no_zone, los_angeles},
          {link + "../zoneinfo/Europe/Paris", no_zone, los_angeles},
          {link + "/usr/share/zoneinf", no_zone, los_angeles},
          {link + "/usr/share/zoneinfo", corrected + "\n", link + "~/zoneinfo"},
          {link + "/usr/share/zoneinfo/No/Zone", corrected + "/No/Zone\n" + no_zone, los_angeles},
          {old_zone, corrected + "/Europe/Paris\n", paris},
          {"~/localtime = file", not_read + no_zone, los_angeles},
          {"~/localtime/", not_read + no_zone, los_angeles + "- ~/localtime/"},
          {"~/localtime/full/", not_read + no_default_zone + "status 1\n", ""}});
}

TEST_F(run, surroundings_change_nothing_else) {
  char* const no_arguments[] = {nullptr};
  int ends[2];
  ASSERT_EQ(::pipe2(ends, O_CLOEXEC), 0);
  ::close(ends[0]);
  const struct {
    const char* name;
    action prepare;
    std::string changes = "";
  } table[] = {
      {"nothing open", [] { ::close(0), ::close(1), ::close(2); }},
      {"warnings closed", [] { ::close(2); }},
      {"warnings without a reader", [&] { ::dup2(ends[1], 2); }},
      // An emulator has open files of its own.
      {"one descriptor more",
       [] {
         ::close_range(3, ~0U, 0),
             limit(RLIMIT_NOFILE, ::access("/sbin/emulator", F_OK) == 0 ? 9 : 4);
       }},
      {"no file may grow", [] { limit(RLIMIT_FSIZE, 0); }, record("")},
      {"a pipe for a record", [] { ::mkfifo("/var/db/timezone/TZVersionDiffRecord", 0); },
       "- ~/TZVersionDiffRecord"},
      {"a small stack", [] { limit(RLIMIT_STACK, 256 << 10); }},
#ifndef __SANITIZE_ADDRESS__
      {"little memory", [] { limit(RLIMIT_AS, 8 << 20); }},
#endif
      {"an umask", [] { ::umask(0777); }},
      {"no working directory", [] { ::mkdir("/s", 0), fs::current_path("/s"), ::rmdir("/s"); }},
      {"no name", [&] { ::execv("/sbin/kelvane", no_arguments); }}};
  for (const auto& [name, prepare, changes] : table) {
    build(data + updatable);
    const std::string got = boot({}, prepare),
                      after = data + latest + los_angeles + activated + changes;
    EXPECT_TRUE(got == text(no_zone + after) || got == text(after)) << name << got;
  }
}

TEST_F(run, a_read_only_store_stays_as_it_is) {
  build(data + updatable);
  const std::string got = boot({}, [] {
    if (::unshare(CLONE_NEWNS) != 0 || ::mount("/var", "/var", "", MS_BIND, nullptr) != 0 ||
        ::mount("", "/var", "", MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr) != 0)
      ::_exit(100);
  });
  if (got.starts_with("status 100")) GTEST_SKIP() << "no right to mount";
  EXPECT_TRUE(got.ends_with(text(no_default_zone + "status 1\n" + data + updatable))) << got;
}

class disturbed_run : public run {
 protected:
  void SetUp() override {
    run::SetUp();
#ifdef SCMP_ACT_NOTIFY
    if (seccomp_api_get() >= 5) return;
#endif
    GTEST_SKIP() << "the kernel hands no system calls of this program over";
  }
};

TEST_F(disturbed_run, says_what_failed_and_goes_on) {
  const std::string kept_legacy = kept("/var/db/icutz") + "unlink of ICU softlink failed\n";
  const std::string correcting = "Correcting localtime link to ~/zoneinfo/Europe/Paris\n";
  expect(paris, {{opt, bad_link("/opt") + invalid + no_system_link + unable, on_system,
                  failing("symlink")},
                 {on("2022z"), rejected + no_system_link + unable, reset, failing("symlink")},
                 {updatable, no_zoneinfo_link + unable, "", failing("symlink")},
                 {updatable, no_icu_link + unable, "", failing("symlink", 2)},
                 {updatable, kept_zoneinfo + no_zoneinfo_link + unable, "", failing("unlink", 2)},
                 {updatable + "/var/db/icutz -> /a", kept_legacy, activated, failing("unlink", 4)},
                 {updatable, "", on("2023c.1.0") + record(""), failing("write")},
                 {on_system + old_zone, correcting + no_paris_link + no_zone, los_angeles,
                  failing("symlink")}});
}

TEST_F(disturbed_run, changes_links_in_an_order_and_writes_each_line_at_once) {
  build(data + "/var/db/icutz -> /usr\n/var/db/icu = file\n~/zoneinfo -> ~/tz/2022z/zoneinfo\n" +
        latest + old_zone + record("old"));
  std::string history, before = listing();
  int writes = 0;
  const auto note = [&](const std::string& call) {
    const std::string now = listing();
    for (const auto& [lines, others, sign] : {std::tuple(before, now, "-"), {now, before, "+"}})
      for (const std::string& line : lines_of(lines))
        if (others.find(line + "\n") == std::string::npos)
          history += sign + fs::path(line.substr(0, line.find(' '))).filename().string() + " ";
    before = now;
    writes += call == "write";
    return 0;
  };
  boot(note);
  note("exit");
  EXPECT_EQ(history,
            "+icutz -icutz -icu -zoneinfo +zoneinfo -icutz -zoneinfo +zoneinfo +icutz "
            "-TZVersionDiffRecord +TZVersionDiffRecord -TZVersionDiffRecord +TZVersionDiffRecord "
            "-localtime +localtime ");
  EXPECT_EQ(writes, 3);
}

// A power cut leaves what the device holds before a call: nothing need be killed to see it.
TEST_F(disturbed_run, leaves_what_the_next_run_puts_right) {
  // With the number of states in which the ICU link is left behind: no run reads it.
  const std::pair<std::string, int> table[] = {
      {latest, 2},
      {updatable + paris + record("old"), 1},
      {on("2023b") + latest + paris, 2},
      {on("2022z") + latest + paris, 2},
      {on("2025a") + "~/tz_latest -> ~/tz/2025a\n" + paris, 1},
      {"~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo\n/var/db/icutz -> ~/tz/2023c.1.0/icutz\n" + latest +
           paris,
       1},
      {on_system + old_zone + "/var/db/icu = file\n", 0},
      {opt + latest + paris, 1}};
  const std::regex varies("[^\n]*Record = .*\n|localtime.*"), icu("[^\n]*zone/icutz .*\n");
  for (const auto& [before, left_behind] : table) {
    std::vector<std::string> left = {text(data + before)};
    const auto add_left = [&left](const std::string&) {
      const std::string now = listing();
      if (std::find(left.begin(), left.end(), now) == left.end()) left.push_back(now);
      return 0;
    };
    // Each call fails, once and from then on.
    for (int number = 1, calls = 1; calls >= number; ++number) {
      for (const bool once : {true, false}) {
        bool memory = false;
        build(left[0]);
        calls = 0;
        const std::string got = boot([&](const std::string& call) {
          const bool fails = ++calls == number || (calls > number && !once);
          memory |= fails && (call == "brk" || call.starts_with("mmap"));
          return fails ? EIO : 0;
        });
        EXPECT_TRUE(memory || !std::regex_search(got, std::regex("signal|status [^1]"))) << got;
        add_left("exit");
      }
    }
    std::string wanted;
    int behind = 0;
    for (std::size_t i = 0; i < left.size(); ++i) {
      build(left[i]);
      EXPECT_FALSE(std::regex_search(boot(add_left), std::regex("status|signal"))) << left[i];
      const std::string mended = listing(), links = std::regex_replace(mended, varies, "");
      EXPECT_EQ(std::regex_replace(boot(), std::regex("^[^/]*"), ""), mended);
      if (i == 0) wanted = links;
      behind += links != wanted;
      EXPECT_EQ(std::regex_replace(links, icu, ""), std::regex_replace(wanted, icu, "")) << left[i];
      EXPECT_TRUE(std::regex_search(
          mended, std::regex("localtime -> .*zone/zoneinfo/(Europe/Paris|America/Los_Angeles)\n")))
          << mended;
    }
    EXPECT_EQ(behind, left_behind) << before << left.size();
  }
}

}  // namespace
}  // namespace kelvane
