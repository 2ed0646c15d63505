// The program as a whole: its warnings, its exit status and what it leaves.

#include <sys/resource.h>

#include <algorithm>

#include "tests/device.h"

namespace kelvane {

// The system partition and the downloads, which no run changes. 2022z has another schema; neither
// icutzformat.txt nor +VERSION of 2023c.1.0 may count, and no other data set has a zone.
const std::string data = R"(
    /usr/share/zoneinfo.default/+VERSION = 2022a
    /usr/share/icu/icutzformat.txt = 44l and more
    ~/tz/2022z/icutz/icutz44b.dat = data
    ~/tz/2022b/icutz/icutz44l.dat = data
    ~/tz/2023c.1.0/icutz/icutz44l.dat = data
    ~/tz/2023c.1.0/icutz/icutzformat.txt = 9l
    ~/tz/2023c.1.0/zoneinfo/+VERSION = 2030a
    ~/tz/2023c.1.0/zoneinfo/Europe/Paris = TZif
)";
// Entries, then messages. What does not end in a newline wants the rest.
const std::string on_system = "~/zoneinfo -> /usr/share/zoneinfo.default\n";
static std::string on(const std::string& version) {
  return "~/zoneinfo -> ~/tz/" + version + "/zoneinfo\n~/icutz -> ~/tz/" + version + "/icutz\n";
}
static std::string record(const std::string& of) { return "~/TZVersionDiffRecord = " + of + "\n"; }
const std::string reset = on_system + "- ~/icutz\n- /var/db/icutz\n", opt = "~/zoneinfo -> /opt\n";
const std::string c = "2023c.1.0", newest = "~/tz_latest -> ~/tz/", latest = newest + c + "\n";
const std::string activated = on(c) + record("2022a.1.0_2023c.1.0");
const std::string version = "/usr/share/zoneinfo.default/+VERSION = ";
const std::string legacy = "/var/db/icutz -> ", zone = "~/localtime -> ";
const std::string paris = zone + "~/zoneinfo/Europe//Paris\n";
const std::string old_paris = zone + "/usr/share/zoneinfo/Europe//Paris\n";
const std::string pacific = zone + "~/zoneinfo/America/Los_Angeles\n";
const std::string usual = data + on_system + paris + record("longer than what is written now");

const std::string invalid = "Invalid current symlinks; resetting to system partition\n";
const std::string rejected = "Symlink points at data incompatible with installed system\n";
const std::string not_newer = "New update not compatible or older version: ";
const std::string unable = "Unable to locate data; resetting to system partition\n";
const std::string not_reset = "Could not reset to system partition\n";
const std::string no_zone = "localtime link invalid; resetting to America/Los_Angeles\n" + pacific;
const std::string corrected = "Correcting localtime link to ~/zoneinfo";
const std::string no_data = "No ICU schema found for ~/tz/";
const std::string kept = "remove: could not remove ", unread = "read_symlink: ";
const std::string no_link = "create_symlink: from ~/", bad_link = "Bad zoneinfo link ";
const std::string no_system = no_link + "zoneinfo to /usr/share/zoneinfo.default\n";
const std::string fails = kept + "~/zoneinfo\nUnlink of zoneinfo softlink failed\n" + no_system;
const std::string stuck = invalid + fails + unable + fails + not_reset + "status 1\n";
const std::string no_default = no_zone + no_link + "localtime to ~/zoneinfo/America/Los_Angeles\n" +
                               "Could not reset localtime link\nstatus 1\n- ~/localtime\n";

TEST_F(device, the_newest_usable_data_set_is_selected) {
  const std::string vs_c = " vs. 2023c.1.0\n";
  expect(usual + latest,
         {{"~/zoneinfo -> ~/tz/2022b/", on(c) + record("2022b_2023c.1.0")},
          {version + "02023c", not_newer + c + " vs. 02023c.1.0\n"},
          {version + "2023c\n" + on(c), not_newer + c + vs_c},
          {newest + "2022z", not_newer + "2022z vs. 2022a.1.0\n"},
          // A rejected data set is still what an update is compared with.
          {version + "02024b\n" + on("2022b"), rejected + on(c) + record("02024b.1.0_2023c.1.0")},
          {legacy + "/a\n" + version + "2024b\n" + on(c), rejected + not_newer + c + vs_c + reset},
          {on("2022z") + newest + "2022b", rejected + not_newer + "2022b vs. 2022z\n" + reset},
          {on("2022a.1.0") + newest + "9a", no_data + "2022a.1.0\n" + rejected + no_data + "9a\n" +
                                                not_newer + "9a vs. 2022a.1.0\n" + reset},
          // Names that are no version, and numbers too large.
          {on(c) + newest + "2022b/", no_version("2022b/") + not_newer + "2022b/" + vs_c},
          {version + "99999999999a\n~/tz_latest = file", unable + not_reset + "status 1\n"},
          {on("2022b") + newest + "2023c.99999999999", unable + reset},
          {on("99999999999a"), unable + reset}});
}

TEST_F(device, what_cannot_be_used_is_replaced_or_reported) {
  const std::string bad = no_version(".1.0"), again = bad + no_system, sub = no_version("9a.1.1.0");
  const std::string bad_path = "orv_dataset::create_components: bad path tz/2022b\n";
  const std::string bare = "- /usr/share/icu/icutzformat.txt\n/usr/share/icu/icutz44l.dat = \n";
  const std::string no_icu = no_link + "icutz to ~/tz/2023c.1.0/icutz\n";
  const std::string kept_icu = kept + "~/icutz\nunlink of ICU softlink failed\n";
  expect(usual,
         {{bare + newest + "2026a", no_data + "2026a\n" + on("2026a") + record("2022a.1.0_2026a")},
          {bare + on("x"), no_version("x") + no_data + "x\n" + rejected + reset},
          {version + "9a.1\n" + on("2022z"), sub + rejected + sub + reset},
          {on("2022b"), ""},
          {on("2022b") + "- ~/zoneinfo\n" + latest, bad_link + "\n" + invalid + activated},
          {version + "\n" + opt, bad + bad_link + "/opt\n" + invalid + bad + bad + on_system},
          {on("2022b") + "~/tz_latest -> tz/2022b", bad_path + unable + reset},
          // Nothing is said of the zoneinfo link, which is not even read.
          {"~/zoneinfo = x\n~/tz_latest = x", unread + "~/tz_latest\n" + unable + on_system},
          {latest + legacy + "/a\n~/icutz/", kept_icu + no_icu + unable + kept_icu},
          {latest + "~/TZVersionDiffRecord -> /var/r", on(c) + "/var/r = 2022a.1.0_2023c.1.0"},
          {"- ~/zoneinfo\n~/zoneinfo/\n~/icutz -> /a", unread + "~/zoneinfo\n" + stuck}});
  expect("", {{"/var/db/",
               bad + bad_link + "\n" + invalid + again + unable + again + not_reset + no_default}});
}

TEST_F(device, the_legacy_icu_link_is_carried_over_unless_there_is_a_new_one) {
  const std::string at = "/var/db/icutz\n", gone = "- " + at;
  const std::string failed = "Could not migrate /var/db/icutz to ~/icutz\n";
  expect(usual, {{legacy + "../../usr", gone + "~/icutz -> ../../usr"},
                 {"/var/db/icutz = file\n~/icutz -> /var\n/var/db/icu/", gone + "- /var/db/icu/"},
                 {legacy + "/usr\n~/icutz -> /a", no_link + "icutz to /usr\n" + failed + gone},
                 {"/var/db/icutz = file", unread + at + failed + gone},
                 {legacy + "/a\n/var/db/icu/full/", ""},
                 {"/var/db/icutz/", unread + at + failed + kept + at + "Could not remove " + at}});
}

TEST_F(device, the_localtime_link_is_made_to_lead_through_the_store) {
  expect(data + on_system, {{zone + "~/zoneinfo", ""},
                            {zone + "~/zoneinfoX/../No/Zone", ""},
                            {zone + "~/zoneinf", no_zone},
                            {zone + "zoneinfo/../../../..~/zoneinfo/usr/share/zoneinfo", no_zone},
                            {zone + "/usr/share/zoneinf", no_zone},
                            {zone + "/usr/share/zoneinfo", corrected + "\n" + zone + "~/zoneinfo"},
                            {zone + "/usr/share/zoneinfo.default/+VERSION",
                             corrected + ".default/+VERSION\n" + no_zone},
                            {"~/localtime/", unread + "~/localtime\n" + no_zone + "- ~/localtime/"},
                            {"~/localtime/full/", unread + "~/localtime\n" + no_default}});
}

static void limit(decltype(RLIMIT_AS) resource, rlim_t value) {
  const rlimit limits = {value, value};
  ::setrlimit(resource, &limits);
}

TEST_F(device, surroundings_change_nothing_else) {
  static constexpr char file[] = "/var/db/timezone/TZVersionDiffRecord";
  static constexpr char* no_arguments[] = {nullptr};
  // A sanitizer and an emulator have descriptors of their own.
  static const rlim_t files = KELVANE_SANITIZED || fs::exists("/sbin/emulator") ? 9 : 2;
  const std::string store = data + on_system + latest;
  const text_pairs loud = {{"", no_zone + activated}}, quiet = {{"", pacific + activated}};
  expect(store, quiet, {}, [] { ::close_range(0, 2, 0), limit(RLIMIT_NOFILE, files); });
  // No standard error, one without a reader, then one that may not grow, like the record.
  expect(store, quiet, {}, [] { ::close(2); });
  static int ends[2];
  expect(store, quiet, {}, [] { ::pipe(ends), ::close(ends[0]), ::dup2(ends[1], 2); });
  expect(store, {{"", pacific + activated + record("")}}, {}, [] { limit(RLIMIT_FSIZE, 0); });
  expect(store, loud, {}, [] { limit(RLIMIT_STACK, 256 << 10); });
  expect(store, loud, {}, [] { limit(RLIMIT_AS, KELVANE_SANITIZED ? RLIM_INFINITY : 8 << 20); });
  expect(store, loud, {}, [] { ::mkdir("/cwd", 0), fs::current_path("/cwd"), ::rmdir("/cwd"); });
  expect(store, {{"", no_zone + on(c) + file + " ?"}}, {}, [] { ::mkfifo(file, 0); });
  expect(store, loud, {}, [] { ::execv("/sbin/kelvane", no_arguments); });
  EXPECT_EQ(fs::status("/var/db/timezone").permissions(), fs::perms(0757));
  EXPECT_TRUE(fs::status(file).permissions() == fs::perms(0646) && content(file).back() == '0');
}

// Runs whose system calls are watched.
struct disturbed_run : device {
  void SetUp() override {
    device::SetUp();
    build(""), boot(note);
    if (states.empty()) GTEST_SKIP() << "the system calls of a run cannot be watched here";
  }

  std::string failed;  // The names of the calls that were made to fail, without a gap.
  int error = EIO;
  // Fails the call of this number of those whose names begin so; `onward`, all after it as well.
  watcher failing(const std::string& names, int number = 1, bool onward = false) {
    failed.clear();
    const std::regex begin("^(" + names + ")");
    return [=, this, left = number](const std::string& call) mutable {
      if (!std::regex_search(call, begin) || --left > 0 || (left < 0 && !onward)) return 0;
      failed += call;
      return error;
    };
  }

  // What the device held before each call, without repetition: a power cut leaves one of these.
  std::vector<std::string> states;
  const watcher note = [this](const std::string&) {
    const std::string now = listing();
    if (std::ranges::find(states, now) == states.end()) states.push_back(now);
    return 0;
  };
};

TEST_F(disturbed_run, says_what_failed_and_goes_on) {
  const std::string kept_legacy = kept + "/var/db/icutz\nunlink of ICU softlink failed\n";
  const std::string unlisted = no_data + c + "\n" + not_newer + c + " vs. 2022a.1.0\n";
  for (error = EINTR; error <= ELOOP; ++error) {  // ENOENT, absence, is below EINTR.
    expect(usual, {{latest, unread + "~/tz_latest\n" + unable}}, failing("readlink"));
    expect(usual, {{latest + legacy + "/a", kept_legacy + activated}}, failing("unlink", 4));
    expect(usual, {{latest, on(c) + record("")}}, failing("write"));
    expect(usual, {{legacy + "/usr", "- /var/db/icutz"}}, failing("access|faccess"));
    expect(usual, {{"", no_version(".1.0")}}, failing("open", 3));
    expect(usual, {{latest, activated}}, failing("read$", 2));
    expect(usual, {{latest, unlisted}}, failing("open", 9));
    expect(usual, {{latest, unlisted}}, failing("getdents"));
    expect(usual,
           {{on("2022z"), rejected + no_system + unable + reset},
            {latest, no_link + "zoneinfo to ~/tz/2023c.1.0/zoneinfo\n" + unable},
            {zone + "/usr/share/zoneinfo/No", corrected + "/No\n" + no_default},
            {on(c) + old_paris, corrected + "/Europe//Paris\n" + no_link +
                                    "localtime to ~/zoneinfo/Europe//Paris\n" + no_zone}},
           failing("symlink"));
    // A store that has become read-only.
    expect(usual, {{"~/zoneinfo = file", unread + "~/zoneinfo\n" + stuck}},
           failing("symlink|unlink|rmdir", 1, true));
  }
}

TEST_F(disturbed_run, says_each_line_at_once_and_changes_links_in_this_order) {
  std::string now = usual + on("2022z") + "- ~/icutz\n" + latest + old_paris + legacy +
                    "/usr\n/var/db/icu -> /no\n";
  build(now);
  std::vector<std::string> wanted = {text(now)}, history = wanted;
  const watcher observe = [&](const std::string&) {
    if (said() + listing() != history.back()) history.push_back(said() + listing());
    return 0;
  };
  boot(observe), observe("exit");
  for (const std::string& change : lines_of(
           "~/icutz -> /usr\n- /var/db/icutz\n- /var/db/icu\n" + rejected + "- ~/zoneinfo\n" +
           on_system + "- ~/icutz\n- ~/zoneinfo\n" + on(c) + record("") +
           record("2022a.1.0_2023c.1.0") + corrected + "/Europe//Paris\n- ~/localtime\n" + paris))
    wanted.push_back(text(now += change + "\n"));
  EXPECT_EQ(history, wanted);
}

TEST_F(disturbed_run, leaves_what_the_next_run_puts_right) {
  // Each device, and how many of its states end with another ICU link, or none: no run repairs it.
  const std::pair<std::string, int> table[] = {
      {"- ~/zoneinfo\n- ~/localtime\n" + latest, 2},
      {latest, 1},
      {on("2022b") + latest, 2},
      {on("2022z") + latest, 2},
      {on("2022z") + newest + "2022z\n", 1},
      {on(c) + "- ~/icutz\n" + legacy + "~/tz/2023c.1.0/icutz\n" + latest, 1},
      {latest + on(c) + old_paris + "/var/db/icu = file\n", 1},
      {opt + latest, 1}};
  const std::regex varies(".*Record .*\n|Europe//Paris|America/Los_Angeles"), icu(".*e/icutz .*\n");
  for (const auto& [before, unrepaired] : table) {
    states = {text(usual + before)};
    // Each call fails once, then it and all after it, but those by which it may end.
    for (int number = 2; number == 2 || failed != ""; ++number) {
      build(states[0]);
      const std::string got = boot(failing("(?!rt_|sig|gett|tgk)", number / 2, number % 2 == 1));
      // A run that is short of memory may end by a signal.
      const bool memory = std::regex_search(failed, std::regex("brk|mmap"));
      EXPECT_TRUE(memory || !std::regex_search(got, std::regex("status (?!1\n)"))) << got;
      note("exit");
    }
    std::vector<std::string> ends;
    for (std::size_t i = 0; i < states.size(); ++i) {
      build(states[i]);
      const auto first = boot(note), sound = listing(), again = boot(failing("symlink", 1, true));
      EXPECT_TRUE(listing() == sound && (first + again).find("status") == first.npos) << again;
      ends.push_back(std::regex_replace(sound, varies, ""));
      EXPECT_EQ(std::regex_replace(ends[i], icu, ""), std::regex_replace(ends[0], icu, ""));
    }
    EXPECT_EQ(std::ranges::count(ends, ends[0]) + unrepaired, states.size()) << before;
  }
}

}  // namespace kelvane
