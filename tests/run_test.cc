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
  const std::string c = "2023c.1.0", installed = "/usr/share/zoneinfo.default/+VERSION = ";
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
    expect(installed + system + "\n" + paris + to_latest("~/tz/" + target),
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
  const std::string no_icu_link = no_link("icutz", "~/tz/2023c.1.0/icutz");
  const std::string bad_path = "orv_dataset::create_components: bad path /opt/a\n";
  const std::string no_schemas = "/usr/share/icu/icutzformat.txt = \n" + to_latest("~/tz/2026a");
  expect(paris, {{"", bad + "\n" + invalid, on_system},
                 {latest + bad_link, bad + "/opt\n" + invalid, activated},
                 {"~/zoneinfo = file", unread + "~/zoneinfo\n" + invalid, on_system},
                 {on("2023b") + to_latest("/opt/a"), bad_path + unable, reset},
                 // Nothing is said of the zoneinfo link, which is not even read.
                 {bad_link + "~/tz_latest = file", unread + "~/tz_latest\n" + unable, on_system},
                 {updatable + "~/icutz/\n" + legacy("/missing"),
                  kept_icu + no_icu_link + unable + kept_icu, ""},
                 {updatable + "~/TZVersionDiffRecord/", "", on("2023c.1.0")},
                 {on_system + no_schemas, no_schema + "2026a\n",
                  on("2026a") + record("2022a.1.0_2026a")}});
}

TEST_F(run, what_fails_for_good_is_said_and_the_rest_goes_on) {
  const std::string no_system = kept_zoneinfo + no_system_link;
  expect("", {{"~/zoneinfo/",
               unread + "~/zoneinfo\n" + invalid + no_system + unable + no_system + no_reset +
                   no_zone + "status 1\n",
               los_angeles}});
  build("");
  EXPECT_EQ(boot(), no_version(".1.0") +
                        text(bad + "\n" + invalid + no_system_link + unable + no_system_link +
                             no_reset + no_default_zone + "status 1\n/var/db/"));
}

TEST_F(run, the_legacy_icu_link_is_carried_over_unless_there_is_a_new_one) {
  const std::string not_read = unread + "/var/db/icutz\n" + not_migrated,
                    gone = "- /var/db/icutz\n";
  expect(on_system + paris,
         {{legacy("../../usr") + "/var/db/icu = file", "",
           gone + "~/icutz -> ../../usr\n- /var/db/icu"},
          {legacy("/usr") + "~/icutz -> /var\n/var/db/icu/", "", gone + "- /var/db/icu/"},
          {legacy("/usr") + "~/icutz -> /missing", no_link("icutz", "/usr") + not_migrated, gone},
          {legacy("/missing") + "/var/db/icu/full/", "", ""},
          {"/var/db/icutz = file", not_read, gone},
          {"/var/db/icutz/", not_read + kept + "/var/db/icutz\nCould not remove /var/db/icutz\n",
           ""}});
}

TEST_F(run, the_localtime_link_is_made_to_lead_through_the_store) {
  const std::string link = "~/localtime -> ", not_read = unread + "~/localtime\n";
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
  const std::string no_record = "- ~/TZVersionDiffRecord\n";
  const struct {
    const char* name;
    action prepare;
    std::string changes = "";
  } table[] = {{"closed descriptors", [] { ::close_range(0, 2, 0); }},
               {"closed warnings", [] { ::close(STDERR_FILENO); }},
               {"warnings without a reader", [&] { ::dup2(ends[1], STDERR_FILENO); }},
               {"room for one descriptor", [] { limit(RLIMIT_NOFILE, 4); }},
               {"room for no file", [] { limit(RLIMIT_FSIZE, 0); }, record("")},
               {"a pipe for a record", [] { ::mkfifo("/var/db/timezone/TZVersionDiffRecord", 0); },
                no_record},
               {"a small stack", [] { limit(RLIMIT_STACK, 256 << 10); }},
               {"an umask", [] { ::umask(0777); }},
               {"no working directory",
                [] { fs::create_directory("/s"), fs::current_path("/s"), fs::remove("/s"); }},
               {"no name", [&] { ::execv("/sbin/kelvane", no_arguments); }}};
  for (const auto& [name, prepare, changes] : table) {
    build(data + updatable);
    const std::string got = boot({}, prepare),
                      after = data + latest + los_angeles + activated + changes;
    EXPECT_TRUE(got == text(no_zone + after) || got == text(after)) << name << got;
  }
}

TEST_F(run, a_word_that_memory_does_not_hold_leaves_the_links_as_they_are) {
  const std::string before = data + on("2023b") + latest + paris;
  const std::string word = "/usr/share/zoneinfo.default/+VERSION = " + std::string(20 << 20, 'a');
  build(before + word);
  boot({}, [] { limit(RLIMIT_AS, 24 << 20); });
  EXPECT_TRUE(listing() == text(before + word));
}

TEST_F(run, a_read_only_store_stays_as_it_is) {
  build(bad_link);
  const std::string got = boot({}, [] {
    if (::unshare(CLONE_NEWNS) != 0 || ::mount("/var", "/var", "", MS_BIND, nullptr) != 0 ||
        ::mount("", "/var", "", MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr) != 0)
      ::_exit(100);
  });
  if (got.starts_with("status 100")) GTEST_SKIP() << "no right to mount";
  EXPECT_TRUE(got.ends_with(no_default_zone + "status 1\n" + text(bad_link))) << got;
}

class disturbed_run : public run {
 protected:
  void SetUp() override {
    run::SetUp();
    if (seccomp_api_get() < 5) GTEST_SKIP() << "the kernel hands no system calls over here";
  }
};

TEST_F(disturbed_run, says_what_failed_and_goes_on) {
  const std::string no_zoneinfo_link = no_link("zoneinfo", "~/tz/2023c.1.0/zoneinfo");
  const std::string no_icu_link = no_link("icutz", "~/tz/2023c.1.0/icutz");
  const std::string kept_legacy = kept + "/var/db/icutz\nunlink of ICU softlink failed\n";
  const std::string no_paris = no_link("localtime", "~/zoneinfo/Europe/Paris") + no_zone;
  expect(paris, {{bad_link, bad + "/opt\n" + invalid + no_system_link + unable, on_system,
                  failing("symlink")},
                 {on("2022z"), rejected + no_system_link + unable, reset, failing("symlink")},
                 {updatable, no_zoneinfo_link + unable, "", failing("symlink")},
                 {updatable, no_icu_link + unable, "", failing("symlink", 2)},
                 {updatable, kept_zoneinfo + no_zoneinfo_link + unable, "", failing("unlink", 2)},
                 {updatable + legacy("/missing"), kept_legacy, activated, failing("unlink", 4)},
                 {updatable, "", on("2023c.1.0") + record(""), failing("write")},
                 {on_system + old_zone,
                  "Correcting localtime link to ~/zoneinfo/Europe/Paris\n" + no_paris, los_angeles,
                  failing("symlink")}});
}

TEST_F(disturbed_run, changes_links_in_an_order_and_writes_a_line_at_once) {
  build(data + legacy("/usr") + "/var/db/icu = file\n~/zoneinfo -> ~/tz/2022z/zoneinfo\n" + latest +
        old_zone + record("old"));
  std::string history, before = listing();
  int writes = 0;
  const auto note = [&](const std::string& call) {
    const std::string now = listing();
    for (const auto& [lines, others, sign] :
         {std::tuple(before, now, "less "), {now, before, "more "}})
      for (const std::string& line : lines_of(lines))
        if (others.find(line + "\n") == std::string::npos) history += sign + line + "\n";
    before = now;
    writes += call == "write";
    return 0;
  };
  boot(note);
  note("exit");
  EXPECT_EQ(history, text(R"(
      more ~/icutz -> /usr
      less /var/db/icutz -> /usr
      less /var/db/icu = file
      less ~/zoneinfo -> ~/tz/2022z/zoneinfo
      more ~/zoneinfo -> /usr/share/zoneinfo.default
      less ~/icutz -> /usr
      less ~/zoneinfo -> /usr/share/zoneinfo.default
      more ~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo
      more ~/icutz -> ~/tz/2023c.1.0/icutz
      less ~/TZVersionDiffRecord = old
      more ~/TZVersionDiffRecord = )"
                          "\n"
                          R"(
      less ~/TZVersionDiffRecord = )"
                          "\n"
                          R"(
      more ~/TZVersionDiffRecord = 2022a.1.0_2023c.1.0
      less ~/localtime -> /usr/share/zoneinfo/Europe/Paris
      more ~/localtime -> ~/zoneinfo/Europe/Paris)"));
  EXPECT_EQ(writes, 3);
}

// A power cut leaves what the store holds before a call: nothing need be killed to see it.
TEST_F(disturbed_run, leaves_what_the_next_run_puts_right) {
  const auto without = [](const std::string& text, const char* pattern) {
    return std::regex_replace(text, std::regex(pattern), "");
  };
  // With the number of states in which the ICU link is left behind: no run reads it.
  const std::pair<std::string, int> table[] = {
      {latest, 0},
      {updatable + paris + record("old"), 0},
      {on("2023b") + latest + paris, 0},
      {on("2022z") + latest + paris, 0},
      {on("2025a") + to_latest("~/tz/2025a") + paris, 0},
      {"~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo\n" + legacy("~/tz/2023c.1.0/icutz") + latest + paris,
       0},
      {on_system + old_zone + "/var/db/icu = file\n", 0},
      {bad_link + latest + paris, 0}};
  for (const auto& [before, left_behind] : table) {
    std::vector<std::string> left = {text(data + before)};
    const auto add = [&](const std::string& state) {
      if (std::find(left.begin(), left.end(), state) == left.end()) left.push_back(state);
      return 0;
    };
    // Each call fails, once and from then on.
    for (int number = 1, calls = 1; calls >= number; ++number) {
      for (const bool once : {true, false}) {
        bool memory = false;
        build(left[0]);
        calls = 0;
        const std::string said = boot([&](const std::string& call) {
          const bool fails = ++calls == number || (calls > number && !once);
          memory |= fails && (call == "brk" || call.starts_with("mmap"));
          return fails ? EIO : 0;
        });
        EXPECT_TRUE(memory || !std::regex_search(said, std::regex("signal|status [^1]"))) << said;
        add(listing());
      }
    }
    std::string wanted;
    int behind = 0;
    for (std::size_t i = 0; i < left.size(); ++i) {
      build(left[i]);
      const std::string said = boot([&](const std::string&) { return add(listing()); }),
                        mended = listing();
      EXPECT_FALSE(std::regex_search(said, std::regex("status|signal"))) << left[i] << said;
      EXPECT_EQ(without(boot(), "^[^/]*"), mended);
      const std::string links =
          without(mended, "[^\n]*Record = .*\n|localtime.*(Europe/Paris|America/Los_Angeles)");
      if (i == 0) wanted = links;
      behind += links != wanted;
      EXPECT_EQ(without(links, "[^\n]*zone/icutz .*\n"), without(wanted, "[^\n]*zone/icutz .*\n"))
          << left[i];
    }
    EXPECT_EQ(behind, left_behind) << before << left.size();
  }
}

}  // namespace
}  // namespace kelvane
