// Runs that a power cut ends, or whose calls fail.

#include "tests/device.h"

namespace kelvane {

using devices = std::set<std::string>;

// What a device holds when the power is cut before one of the calls of its run, or at the end.
devices left_by_power_cuts(const std::string& device) {
  devices left;
  std::string told = "| status 99\n";
  for (int calls = 0; told.ends_with("| status 99\n"); ++calls) {
    build(device);
    told = start([=](const std::string&) mutable {
      if (calls-- == 0) ::_exit(99);
      return 0;
    });
    left.insert(listing());
  }
  return left;
}

// What a device holds when one of the calls of its run fails, or that one and all after it.
devices left_by_failing_calls(const std::string& device, int error) {
  constexpr int more_than_a_run_makes = 40;
  devices left;
  for (int first = 0; first < more_than_a_run_makes; ++first) {
    for (const int last : {first, more_than_a_run_makes}) {
      build(device);
      const std::string told = start([=, call = 0](const std::string&) mutable {
        const bool fails = first <= call && call <= last;
        ++call;
        return fails ? error : 0;
      });
      EXPECT_TRUE(told.find("status") == told.npos || told.ends_with("| status 1\n")) << told;
      left.insert(listing());
    }
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

// Whether a run makes no link.
bool has_nothing_to_do(const std::string& device) {
  build(device);
  const std::string told = start([](const std::string& call) {
    if (call.starts_with("symlink")) ::_exit(99);
    return 0;
  });
  return told.find("| status") == told.npos && listing() == device;
}

// Whether a device holds what is wanted, but for what the manual page has under CAVEATS: the
// record, the device's zone, and an ICU link that is missing, of another release, or left over.
bool is_sound_but_for_caveats(const std::string& device, const std::string& wanted) {
  const std::regex caveats(
      "~/(TZVersionDiffRecord = |icutz -> ~/tz/|localtime -> ~/zoneinfo/).*\n");
  return std::regex_replace(device, caveats, "") == std::regex_replace(wanted, caveats, "");
}

// Whether the example icu-link.conf makes the ICU link follow the zoneinfo link, and no link where
// that is so.
bool icu_link_can_follow(const std::string& device) {
  const bool downloaded = device.find("~/zoneinfo -> ~/tz/2023c.1.0/zoneinfo\n") != device.npos;
  build(device + links_to(downloaded ? "2023c.1.0" : "system"));
  const std::string wanted = listing();
  const fs::file_time_type untouched = fs::last_write_time("/var/db/timezone");
  const bool idle = std::system("sh /sbin/icu-link.sh") == 0 &&
                    fs::last_write_time("/var/db/timezone") == untouched;
  build(device);
  return idle && std::system("sh /sbin/icu-link.sh") == 0 && listing() == wanted;
}

TEST(a_disturbed_run, leaves_what_the_next_run_puts_right) {
  for (const std::string current : {"system", "2022b", "2022z", "2023c.1.0"}) {
    const std::string device = usual + links_to(current) + R"(
        ~/tz_latest -> ~/tz/2023c.1.0
        ~/localtime -> /usr/share/zoneinfo/Europe/Paris
        /var/db/icutz -> ~/tz/2022b/icutz
        /var/db/icu = file
    )";
    const std::string wanted = repaired(device);
    devices seen;
    devices found = left_by_failing_calls(device, EIO);
    found.merge(left_by_failing_calls(device, EROFS));
    while (!found.empty()) {
      const std::string left = *seen.insert(found.extract(found.begin())).position;
      const std::string sound = repaired(left);
      EXPECT_TRUE(is_sound_but_for_caveats(sound, wanted)) << left << "becomes\n" << sound;
      EXPECT_TRUE(has_nothing_to_do(sound)) << sound;
      EXPECT_TRUE(icu_link_can_follow(sound)) << sound;
      // The run that puts it right can be cut short as well.
      for (const std::string& further : left_by_power_cuts(left)) {
        if (!seen.contains(further)) found.insert(further);
      }
    }
  }
}

}  // namespace kelvane
