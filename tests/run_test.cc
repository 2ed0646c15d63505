// The program as a whole: its warnings, its exit status and what it leaves in the store.

#include <unistd.h>

#include <cstdio>

#include "tests/world.h"

namespace kelvane {
namespace {

class run : public world {
 protected:
  const std::string on_system = "/var/db/timezone/zoneinfo -> /usr/share/zoneinfo.default\n";
  const std::string zone = "/var/db/timezone/localtime -> /var/db/timezone/zoneinfo/Europe/Paris\n";
  const std::string default_zone =
      "/var/db/timezone/localtime -> /var/db/timezone/zoneinfo/America/Los_Angeles\n";
  const std::string record = "/var/db/timezone/TZVersionDiffRecord = ";
  // Links that no run changes on a device whose newest download is 2023c.1.0.
  const std::string kept = zone + "/var/db/timezone/tz_latest -> /var/db/timezone/tz/2023c.1.0\n";
  const std::string device = system("2022a") + download("2023c.1.0") + kept;
  const std::string nothing_new =
      "New update not compatible or older version: 2023c.1.0 vs. 2023c.1.0: *\n";

  static std::string on(const std::string& version) {
    return "/var/db/timezone/zoneinfo -> /var/db/timezone/tz/" + version + "/zoneinfo\n" +
           "/var/db/timezone/icutz -> /var/db/timezone/tz/" + version + "/icutz\n";
  }
};

TEST_F(run, a_newer_compatible_download_is_activated_once) {
  const std::string after = kept + on("2023c.1.0") + record + "2022a.1.0_2023c.1.0";
  expect_run(device + on_system + record + "longer than what is written now", after);
  expect_run("", nothing_new + after);
}

TEST_F(run, a_fresh_device_gets_its_links) {
  expect_run(system("2022a") + "/var/db/timezone/tz/", R"(
      Bad zoneinfo link : *
      Invalid current symlinks; resetting to system partition: *
      localtime link invalid; resetting to America/Los_Angeles: *
      )" + default_zone + on_system);
}

TEST_F(run, a_directory_in_the_zoneinfo_links_place_stays) {
  const std::string reset_fails = R"(
      remove: could not remove /var/db/timezone/zoneinfo: Is a directory
      Unlink of zoneinfo softlink failed: Is a directory
      create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default: File exists
      )";
  const std::string first = R"(
      read_symlink: /var/db/timezone/zoneinfo: Invalid argument
      Invalid current symlinks; resetting to system partition: Invalid argument)";
  const std::string then = "Unable to locate data; resetting to system partition: File exists";
  const std::string last = "Could not reset to system partition: File exists\nstatus 1\n";
  const std::string directory = "/var/db/timezone/zoneinfo/\n";
  expect_run(device + directory,
             first + reset_fails + then + reset_fails + last + directory + kept);
}

TEST_F(run, a_rejected_data_set_is_still_what_an_update_is_compared_with) {
  expect_run(device + system("2024a") + download("2023b") + on("2023b"), R"(
      Symlink points at data incompatible with installed system: *
      )" + kept + on("2023c.1.0") + record + "2024a.1.0_2023c.1.0");
}

TEST_F(run, an_incompatible_data_set_is_rejected) {
  expect_run(device + download("2025a", "44b") + on("2025a"), R"(
      Symlink points at data incompatible with installed system: *
      New update not compatible or older version: 2023c.1.0 vs. 2025a: *
      )" + kept + on_system);
}

TEST_F(run, an_incompatible_update_is_not_activated) {
  expect_run(device + system("2022a", "45l") + on_system + record + "earlier", R"(
      New update not compatible or older version: 2023c.1.0 vs. 2022a.1.0: *
      )" + kept + on_system + record + "earlier");
}

TEST_F(run, a_data_set_that_is_as_old_as_the_system_partition_stays) {
  expect_run(device + system("2023c") + on("2023c.1.0"), nothing_new + kept + on("2023c.1.0"));
}

TEST_F(run, a_data_set_that_cannot_be_built_resets_the_links) {
  expect_run(device + on("99999999999a"),
             "Unable to locate data; resetting to system partition: *\n" + kept + on_system);
  const std::string elsewhere = "/var/db/timezone/tz_latest -> /opt/2023d\n";
  expect_run(system("2022a") + download("2023b") + zone + on("2023b") + elsewhere, R"(
      orv_dataset::create_components: bad path /opt/2023d: *
      Unable to locate data; resetting to system partition: *
      )" + elsewhere + zone + on_system);
}

TEST_F(run, an_activation_that_stops_half_way_is_reset_and_not_recorded) {
  expect_run(device + on_system + "/var/db/icutz -> /missing\n/var/db/timezone/icutz/", R"(
      remove: could not remove /var/db/timezone/icutz: Is a directory
      unlink of ICU softlink failed: Is a directory
      create_symlink: from /var/db/timezone/icutz to /var/db/timezone/tz/2023c.1.0/icutz: File exists
      Unable to locate data; resetting to system partition: File exists
      remove: could not remove /var/db/timezone/icutz: Is a directory
      unlink of ICU softlink failed: Is a directory
      /var/db/icutz -> /missing
      /var/db/timezone/icutz/
      )" + kept + on_system);
}

TEST_F(run, a_record_that_cannot_be_written_stops_nothing) {
  expect_run(device + on_system + "/var/db/timezone/TZVersionDiffRecord/",
             "/var/db/timezone/TZVersionDiffRecord/\n" + kept + on("2023c.1.0"));
}

TEST_F(run, the_legacy_icu_link_is_carried_over_unless_there_is_a_new_one) {
  build(device + on("2023c.1.0"));
  ASSERT_EQ(::rename("/var/db/timezone/icutz", "/var/db/icutz"), 0);
  expect_run("/var/db/icu = obsolete", nothing_new + kept + on("2023c.1.0"));
  expect_run("/var/db/icutz -> /usr\n/var/db/icu/", nothing_new + kept + on("2023c.1.0"));
}

TEST_F(run, a_legacy_icu_link_to_nothing_stays_until_an_activation) {
  const std::string full = "/var/db/icu/full/\n", stays = full + "/var/db/icutz -> /missing\n";
  expect_run(system("2022a") + zone + on_system + stays, zone + on_system + stays);
  expect_run(device, kept + on("2023c.1.0") + full + record + "2022a.1.0_2023c.1.0");
}

TEST_F(run, a_directory_in_the_legacy_icu_links_place_stays) {
  expect_run(system("2022a") + zone + on_system + "/var/db/icutz/", R"(
      read_symlink: /var/db/icutz: Invalid argument
      Could not migrate /var/db/icutz to /var/db/timezone/icutz: Invalid argument
      remove: could not remove /var/db/icutz: Is a directory
      Could not remove /var/db/icutz: Is a directory
      /var/db/icutz/
      )" + zone + on_system);
}

TEST_F(run, the_localtime_link_is_made_to_lead_through_the_store) {
  const std::string link = "/var/db/timezone/localtime", store = " -> /var/db/timezone/zoneinfo";
  const std::string invalid = "localtime link invalid; resetting to America/Los_Angeles: *\n";
  const std::string correcting = "Correcting localtime link to /var/db/timezone/zoneinfo";
  const std::string unreadable = "read_symlink: " + link + ": Invalid argument\n" + invalid;
  const std::pair<std::string, std::string> table[] = {
      {store + "/No/Zone", link + store + "/No/Zone\n"},
      {store + "X", link + store + "X\n"},
      {" -> /usr/share/zoneinfo/Europe/Paris", correcting + "/Europe/Paris: *\n" + zone},
      {" -> /usr/share/zoneinfo", correcting + ": *\n" + link + store + "\n"},
      {" -> /usr/share/zoneinfo.default/Europe/Paris",
       correcting + ".default/Europe/Paris: *\n" + invalid + default_zone},
      {" -> /usr/share/zoneinf", invalid + default_zone},
      {"/", unreadable + default_zone},
      {"/below/", unreadable + "create_symlink: from " + link +
                      " to /var/db/timezone/zoneinfo/America/Los_Angeles: File exists\n" +
                      "Could not reset localtime link: File exists\nstatus 1\n" + link +
                      "/below/\n"}};
  build(system("2022a") + on_system);
  for (const auto& [before, after] : table) {
    expect_run(link + before, after + on_system);
    ::unlink(link.c_str());
  }
}

}  // namespace
}  // namespace kelvane
