// Runs that a power cut ends, or whose calls fail.

#include "tests/device.h"
#include "tests/system_calls.h"

namespace kelvane {

using devices = std::set<std::string>;

// What a device holds when the power is cut before one of the calls of its run, or at the end.
devices left_by_power_cuts(const std::string& device) {
  devices left;
  std::string told = "| status 99\n";
  for (int calls = 0; told.ends_with("| status 99\n"); ++calls) {
    const auto cut = [before_it = calls](const std::string&) mutable {
      if (before_it == 0) ::_exit(99);
      --before_it;
      return 0;
    };
    build(device);
    told = start([&] { run_watched(cut); });
    left.insert(listing());
  }
  return left;
}

// What a device holds when one call of its run fails, which must not fail the run, or that one and
// all after it, as on a file system that has become read-only.
devices left_by_failing_calls(const std::string& device) {
  constexpr int more_than_a_run_makes = 25;
  devices left;
  for (int run = 0; run < 2 * more_than_a_run_makes; ++run) {
    const int first = run / 2;
    const bool alone = run % 2 == 0;
    const auto fail = [=, call = -1](const std::string&) mutable {
      ++call;
      if (alone) return call == first ? EIO : 0;
      return call >= first ? EROFS : 0;
    };
    build(device);
    const std::string told = start([&] { run_watched(fail); });
    const bool failed = told.find("| Could not reset") != told.npos;
    EXPECT_EQ(told.ends_with("| status 1\n"), failed) << told;
    EXPECT_FALSE(failed && alone) << told;
    left.insert(listing());
  }
  return left;
}

// What a device holds after an undisturbed run.
std::string repaired(const std::string& device) {
  build(device);
  const std::string told = start();
  EXPECT_EQ(told.find("| status"), told.npos) << told << device;
  return listing();
}

// Whether `act` changes nothing in the store, and makes no link anew.
bool has_nothing_to_do(const std::function<void()>& act, const std::string& device) {
  const fs::path store = "/var/db/timezone";
  build(device);
  const fs::file_time_type before = fs::last_write_time(store) - std::chrono::hours(1);
  fs::last_write_time(store, before);
  act();
  return listing() == device && fs::last_write_time(store) == before;
}

// Whether a device holds what is wanted, but for what the manual page has under CAVEATS: the
// record, the device's zone, and an ICU link that is missing, of another release, or left over.
bool is_sound_but_for_caveats(const std::string& device, const std::string& wanted) {
  const std::regex caveats("~/(TZVersionDiffRecord|icutz -> ~/tz|localtime -> ~/zoneinfo).*\n");
  return std::regex_replace(device, caveats, "") == std::regex_replace(wanted, caveats, "");
}

// Whether by the example icu-link.conf the ICU link comes to follow the zoneinfo link.
bool icu_link_can_follow(const std::string& device) {
  const auto follow = [] { EXPECT_EQ(std::system("PATH=/bin sh /sbin/icu-link.sh"), 0); };
  const bool downloaded = device.find("~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo\n") != device.npos;
  build(device + links_to(downloaded ? "2023c.1.0" : "system"));
  const std::string wanted = listing();
  build(device);
  follow();
  return listing() == wanted && has_nothing_to_do(follow, wanted);
}

// Expects that the next run puts each of these right, after which there is nothing to do.
void expect_repair(const devices& disturbed, const std::string& wanted) {
  devices sound;
  for (const std::string& left : disturbed) {
    const std::string becomes = repaired(left);
    EXPECT_TRUE(is_sound_but_for_caveats(becomes, wanted)) << left << "becomes\n" << becomes;
    sound.insert(becomes);
  }
  for (const std::string& device : sound) {
    EXPECT_TRUE(has_nothing_to_do([] { start(); }, device)) << device;
    EXPECT_TRUE(icu_link_can_follow(device)) << device;
  }
}

TEST(a_disturbed_run, leaves_what_the_next_run_puts_right) {
  for (const std::string& links :
       {std::string("no ~/zoneinfo\n"), links_to("2022b"), links_to("2022unfit"),
        links_to("2022unfit") + "no ~/tz_latest\n", links_to("2023c.1.0")}) {
    const std::string device = usual + "~/tz_latest -> ~/tz/2023c.1.0\n" + links + R"(
        ~/localtime -> /usr/share/zoneinfo/+VERSION
        /var/db/icutz -> ~/tz/2022b/icutz
        /var/db/icu = file
    )";
    const std::string wanted = repaired(device);
    devices disturbed = left_by_failing_calls(device);
    disturbed.merge(left_by_power_cuts(device));
    devices twice;  // The run that puts it right can be cut short as well.
    for (const std::string& left : disturbed) twice.merge(left_by_power_cuts(left));
    disturbed.merge(twice);
    expect_repair(disturbed, wanted);
  }
}

TEST(a_disturbed_run, says_that_a_link_stays_even_if_it_is_right) {
  build(usual + "~/tz_latest -> /opt\n no ~/localtime");
  const auto fail = [](const std::string& call) { return call == "unlink" ? EROFS : 0; };
  const std::string told = start([&] { run_watched(fail); });
  EXPECT_EQ(told,
            "| orv_dataset::create_components: bad path /opt\n"
            "| Unable to locate data; resetting to system partition\n"
            "| remove: could not remove ~/zoneinfo\n"
            "| Unlink of zoneinfo softlink failed\n"
            "| create_symlink: from ~/zoneinfo to /usr/share/zoneinfo.default\n"
            "| Could not reset to system partition\n"
            "| localtime link invalid; resetting to America/Los_Angeles\n"
            "| status 1\n");
}

}  // namespace kelvane
