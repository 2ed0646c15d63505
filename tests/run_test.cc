// The program as a whole: its exit status, its warnings and what it leaves in the store.

#include "tests/world.h"

namespace kelvane {
namespace {

class run : public world {
 protected:
  // The links of a device on its system partition, and on a download.
  const std::string on_system = R"(
      /var/db/timezone/localtime -> /var/db/timezone/zoneinfo/Europe/Paris
      /var/db/timezone/zoneinfo -> /usr/share/zoneinfo.default
      )";
  static std::string on(const std::string& version) {
    return "/var/db/timezone/icutz -> /var/db/timezone/tz/" + version + "/icutz\n" +
           "/var/db/timezone/localtime -> /var/db/timezone/zoneinfo/Europe/Paris\n" +
           "/var/db/timezone/tz_latest -> /var/db/timezone/tz/2023c.1.0\n" +
           "/var/db/timezone/zoneinfo -> /var/db/timezone/tz/" + version + "/zoneinfo\n";
  }
  const std::string to_latest = "/var/db/timezone/tz_latest -> /var/db/timezone/tz/2023c.1.0\n";
};

TEST_F(run, a_newer_compatible_download_is_activated) {
  expect_run(system("2022a") + download("2023c.1.0") + on_system + to_latest,
             "/var/db/timezone/TZVersionDiffRecord = 2022a.1.0_2023c.1.0\n" + on("2023c.1.0"));
  // And the next run changes nothing.
  expect_run("", R"(
      New update not compatible or older version: 2023c.1.0 vs. 2023c.1.0: *
      /var/db/timezone/TZVersionDiffRecord = 2022a.1.0_2023c.1.0
      )" + on("2023c.1.0"));
}

TEST_F(run, a_healthy_device_is_left_alone_in_silence) {
  expect_run(system("2022a") + on_system, on_system);
}

TEST_F(run, a_fresh_device_gets_its_links) {
  expect_run(system("2022a") + "/var/db/timezone/tz/", R"(
      Bad zoneinfo link : *
      Invalid current symlinks; resetting to system partition: *
      localtime link invalid; resetting to America/Los_Angeles: *
      /var/db/timezone/localtime -> /var/db/timezone/zoneinfo/America/Los_Angeles
      /var/db/timezone/zoneinfo -> /usr/share/zoneinfo.default)");
}

TEST_F(run, without_a_store_every_stage_says_what_it_could_not_do) {
  expect_run(system("2022a"), R"(
      Bad zoneinfo link : *
      Invalid current symlinks; resetting to system partition: *
      create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default: No such file or directory
      Unable to locate data; resetting to system partition: No such file or directory
      create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default: No such file or directory
      Could not reset to system partition: No such file or directory
      localtime link invalid; resetting to America/Los_Angeles: *
      create_symlink: from /var/db/timezone/localtime to /var/db/timezone/zoneinfo/America/Los_Angeles: No such file or directory
      Could not reset localtime link: No such file or directory
      status 1)");
}

TEST_F(run, a_download_replaces_broken_links) {
  expect_run(system("2022a") + download("2023c.1.0") + to_latest + R"(
      /var/db/icutz -> /var/db/timezone/tz/2023c.1.0/icutz
      /var/db/timezone/localtime -> /var/db/timezone/zoneinfo/Europe/Paris
      /var/db/timezone/zoneinfo = not a link)", R"(
      read_symlink: /var/db/timezone/zoneinfo: Invalid argument
      Invalid current symlinks; resetting to system partition: Invalid argument
      /var/db/timezone/TZVersionDiffRecord = 2022a.1.0_2023c.1.0
      )" + on("2023c.1.0"));
}

TEST_F(run, a_rejected_data_set_is_what_an_update_is_compared_with) {
  expect_run(system("2024a") + download("2023b.1.0") + download("2023c.1.0") + on("2023b.1.0"), R"(
      Symlink points at data incompatible with installed system: *
      /var/db/timezone/TZVersionDiffRecord = 2024a.1.0_2023c.1.0
      )" + on("2023c.1.0"));
}

TEST_F(run, an_incompatible_data_set_gives_way_to_the_system_partition) {
  expect_run(system("2022a") + download("2024a", "44b") + download("2023c.1.0") + on("2024a"), R"(
      Symlink points at data incompatible with installed system: *
      New update not compatible or older version: 2023c.1.0 vs. 2024a: *
      )" + to_latest + on_system);
}

TEST_F(run, an_incompatible_update_is_not_activated) {
  expect_run(system("2022a", "45l") + download("2023c.1.0") + to_latest + on_system +
             "/var/db/timezone/TZVersionDiffRecord = earlier", R"(
      New update not compatible or older version: 2023c.1.0 vs. 2022a.1.0: *
      /var/db/timezone/TZVersionDiffRecord = earlier
      )" + to_latest + on_system);
}

TEST_F(run, a_data_set_as_old_as_the_system_partition_may_stay) {
  expect_run(system("2023c") + download("2023c.1.0") + on("2023c.1.0"),
             "New update not compatible or older version: 2023c.1.0 vs. 2023c.1.0: *\n" +
                 on("2023c.1.0"));
}

TEST_F(run, a_latest_link_that_names_no_download_resets_a_sound_device) {
  const std::string elsewhere = "/var/db/timezone/tz_latest -> /opt/2023d\n";
  expect_run(system("2022a") + on_system + elsewhere + "/var/db/timezone/icutz -> old", R"(
      orv_dataset::create_components: bad path /opt/2023d: *
      Unable to locate data; resetting to system partition: *
      )" + elsewhere + on_system);
}

TEST_F(run, a_latest_link_that_is_none_is_met_before_the_current_links_are_read) {
  expect_run(system("2022a") + "/var/db/timezone/tz_latest = no link", R"(
      read_symlink: /var/db/timezone/tz_latest: Invalid argument
      Unable to locate data; resetting to system partition: Invalid argument
      localtime link invalid; resetting to America/Los_Angeles: *
      /var/db/timezone/localtime -> /var/db/timezone/zoneinfo/America/Los_Angeles
      /var/db/timezone/tz_latest = no link
      /var/db/timezone/zoneinfo -> /usr/share/zoneinfo.default)");
}

TEST_F(run, a_version_number_too_large_resets_the_links) {
  expect_run(system("2022a") + download("99999999999a") + on("99999999999a"), R"(
      Unable to locate data; resetting to system partition: *
      )" + to_latest + on_system);
}

TEST_F(run, an_activation_that_stops_half_way_is_reset_and_not_recorded) {
  expect_run(system("2022a") + download("2023c.1.0") + to_latest + on_system +
             "/var/db/icutz -> /usr\n/var/db/timezone/icutz/below = x", R"(
      remove: could not remove /var/db/timezone/icutz: Is a directory
      unlink of ICU softlink failed: Is a directory
      create_symlink: from /var/db/timezone/icutz to /var/db/timezone/tz/2023c.1.0/icutz: File exists
      Unable to locate data; resetting to system partition: File exists
      remove: could not remove /var/db/timezone/icutz: Is a directory
      unlink of ICU softlink failed: Is a directory
      /var/db/timezone/icutz/below = x
      )" + to_latest + on_system);
}

TEST_F(run, a_record_that_cannot_be_written_stops_nothing) {
  expect_run(system("2022a") + download("2023c.1.0") + to_latest + on_system +
             "/var/db/timezone/TZVersionDiffRecord/",
             "/var/db/timezone/TZVersionDiffRecord/\n" + on("2023c.1.0"));
}

TEST_F(run, a_system_partition_without_a_version_is_older_than_any_download) {
  expect_run("/usr/share/icu/icutzformat.txt = 44l\n" + download("2023c.1.0") + on("2023c.1.0"), R"(
      Cannot parse version string .1.0, results.size() = 0: *
      Cannot parse version string .1.0: *
      New update not compatible or older version: 2023c.1.0 vs. 2023c.1.0: *
      )" + on("2023c.1.0"));
}

TEST_F(run, the_legacy_icu_link_is_carried_over) {
  const std::string update = on("2023c.1.0");
  const std::string message = "New update not compatible or older version: 2023c.1.0 vs. 2023c.1.0: *\n";
  const std::string others = update.substr(update.find('\n') + 1);
  expect_run(system("2022a") + download("2023c.1.0") + others + R"(
      /var/db/icutz -> timezone/tz/2023c.1.0/icutz
      /var/db/icu = obsolete)", message + "/var/db/timezone/icutz -> timezone/tz/2023c.1.0/icutz\n" + others);
  expect_run("/var/db/icutz -> /usr\n/var/db/icu/",
             message + "/var/db/timezone/icutz -> timezone/tz/2023c.1.0/icutz\n" + others);
}

TEST_F(run, a_legacy_icu_link_to_nothing_stays_until_an_activation) {
  expect_run(system("2022a") + on_system + "/var/db/icutz -> /missing\n/var/db/icu/full/", R"(
      /var/db/icu/full/
      /var/db/icutz -> /missing
      )" + on_system);
  expect_run(download("2023c.1.0") + to_latest, R"(
      /var/db/icu/full/
      /var/db/timezone/TZVersionDiffRecord = 2022a.1.0_2023c.1.0
      )" + on("2023c.1.0"));
}

TEST_F(run, a_directory_in_the_legacy_icu_links_place_stays) {
  expect_run(system("2022a") + on_system + "/var/db/icutz/below = x", R"(
      read_symlink: /var/db/icutz: Invalid argument
      Could not migrate /var/db/icutz to /var/db/timezone/icutz: Invalid argument
      remove: could not remove /var/db/icutz: Is a directory
      Could not remove /var/db/icutz: Is a directory
      /var/db/icutz/below = x
      )" + on_system);
}

TEST_F(run, the_localtime_link_leads_through_the_store) {
  const std::string rest = "\n/var/db/timezone/zoneinfo -> /usr/share/zoneinfo.default\n";
  const std::string link = "/var/db/timezone/localtime";
  const std::string invalid = "localtime link invalid; resetting to America/Los_Angeles: *\n" + link +
                              " -> /var/db/timezone/zoneinfo/America/Los_Angeles";
  const std::pair<std::string, std::string> table[] = {
      {" -> /var/db/timezone/zoneinfo/No/Zone", link + " -> /var/db/timezone/zoneinfo/No/Zone"},
      {" -> /var/db/timezone/zoneinfoX", link + " -> /var/db/timezone/zoneinfoX"},
      {" -> /usr/share/zoneinfo/Europe/Paris",
       "Correcting localtime link to /var/db/timezone/zoneinfo/Europe/Paris: *\n" + link +
           " -> /var/db/timezone/zoneinfo/Europe/Paris"},
      {" -> /usr/share/zoneinfo", "Correcting localtime link to /var/db/timezone/zoneinfo: *\n" +
                                      link + " -> /var/db/timezone/zoneinfo"},
      {" -> /usr/share/zoneinfo.default/Europe/Paris",
       "Correcting localtime link to /var/db/timezone/zoneinfo.default/Europe/Paris: *\n" + invalid},
      {" -> ../zoneinfo/Europe/Paris", invalid},
      {" -> /usr/share/zoneinf", invalid},
      {" -> /var/db/timezone/zoneinf", invalid},
      {"/", "read_symlink: " + link + ": Invalid argument\n" + invalid},
      {" = a file", "read_symlink: " + link + ": Invalid argument\n" + invalid},
  };
  build(system("2022a") + "/usr/share/zoneinfo.default/Europe/Paris = TZif" + rest);
  for (const auto& [before, after] : table) {
    expect_run(link + before, after + rest);
    EXPECT_EQ(::unlink(link.c_str()), 0);
  }
  expect_run(link + "/below = x", "read_symlink: " + link + R"(: Invalid argument
      localtime link invalid; resetting to America/Los_Angeles: Invalid argument
      create_symlink: from /var/db/timezone/localtime to /var/db/timezone/zoneinfo/America/Los_Angeles: File exists
      Could not reset localtime link: File exists
      status 1
      /var/db/timezone/localtime/below = x)" + rest);
}

}  // namespace
}  // namespace kelvane
