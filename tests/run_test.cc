// The program as a whole: its warnings, its exit status and what it leaves in the store.

#include <sys/stat.h>

#include <cerrno>

#include "tests/device.h"

namespace kelvane {
namespace {

class run : public device {
 protected:
  const std::string on_system = "~/zoneinfo -> /usr/share/zoneinfo.default\n";
  const std::string paris = "~/localtime -> ~/zoneinfo/Europe/Paris\n";
  const std::string los_angeles = "~/localtime -> ~/zoneinfo/America/Los_Angeles\n";
  const std::string latest = "~/tz_latest -> ~/tz/2023c.1.0\n";
  const std::string record = "~/TZVersionDiffRecord = ";
  const std::string activated = on("2023c.1.0") + record + "2022a.1.0_2023c.1.0\n";
  const std::string no_link = "Bad zoneinfo link \n";
  const std::string invalid = "Invalid current symlinks; resetting to system partition\n";
  const std::string rejected = "Symlink points at data incompatible with installed system\n";
  const std::string unable = "Unable to locate data; resetting to system partition\n";
  const std::string no_reset = "Could not reset to system partition\n";
  const std::string no_zone = "localtime link invalid; resetting to America/Los_Angeles\n";
  const std::string not_migrated = "Could not migrate /var/db/icutz to ~/icutz\n";
  const std::string kept_zoneinfo =
      "remove: could not remove ~/zoneinfo\nUnlink of zoneinfo softlink failed\n";

  static std::string not_newer(const std::string& update, const std::string& current) {
    return "New update not compatible or older version: " + update + " vs. " + current + "\n";
  }
  static std::string no_version(const std::string& text) {
    return "Cannot parse version string " + text + ", results.size() = 0\n" +
           "Cannot parse version string " + text + "\n";
  }
  static std::string not_created(const std::string& link, const std::string& target) {
    return "create_symlink: from " + link + " to " + target + "\n";
  }

  void SetUp() override {
    device::SetUp();
    build(system("2022a") + download("2022z", "44b") + download("2023b") + download("2023c.1.0") +
          download("2024a") + download("2025a", "44b") + "~/tz/2026a/icutz/");
  }

  struct situation {
    std::string before, says, after;
    // The first, the second... call whose name begins so fails.
    const char* failing = "";
    int number = 0;
  };

  void expect(const std::initializer_list<situation>& table) {
    for (const auto& [before, says, after, failing, number] : table) {
      const auto fails = [&, left = number](const std::string& call) mutable {
        return call.starts_with(failing) && --left == 0 ? EIO : 0;
      };
      build_store(before);
      EXPECT_EQ(boot(number == 0 ? watcher() : fails), text(says + after)) << before;
    }
  }
};

TEST_F(run, the_newest_usable_data_set_is_selected) {
  const std::string c = "2023c.1.0", system_2022a = system("2022a"), system_2024b = system("2024b");
  const struct {
    std::string system, links, latest, says, after;
  } table[] = {
      {system_2022a, on_system, "~/tz/" + c, "", activated},
      {system_2022a, on("2023b"), "~/tz/" + c, "", on(c) + record + "2023b_2023c.1.0"},
      {system("2023c"), on(c), "~/tz/" + c, not_newer(c, c), on(c)},
      {system_2022a, on("2024a"), "~/tz/" + c, not_newer(c, "2024a"), on("2024a")},
      {system_2022a, on_system, "~/tz/2025a", not_newer("2025a", "2022a.1.0"), on_system},
      // A rejected data set is still what an update is compared with.
      {system_2024b, on("2023b"), "~/tz/" + c, rejected, on(c) + record + "2024b.1.0_2023c.1.0"},
      {system_2022a, on("2022z"), "~/tz/" + c, rejected, activated},
      {system_2024b, on(c), "~/tz/" + c, rejected + not_newer(c, c), on_system},
      {system_2022a, on("2025a"), "~/tz/" + c, rejected + not_newer(c, "2025a"), on_system},
      {system_2022a, "~/zoneinfo -> /opt\n", "~/tz/" + c, "Bad zoneinfo link /opt\n" + invalid,
       activated},
      // Data that is missing, in part or as a whole.
      {system_2022a, on("2026a"), "~/tz/" + c,
       "No ICU schema found for ~/tz/2026a\n" + rejected + not_newer(c, "2026a"), on_system},
      {system_2022a, on("2023b"), "~/tz/x",
       no_version("x") + "No ICU schema found for ~/tz/x\n" + not_newer("x", "2023b"), on("2023b")},
      {system("2022a", ""), on_system, "~/tz/2026a", "No ICU schema found for ~/tz/2026a\n",
       on("2026a") + record + "2022a.1.0_2026a"},
      {system(""), on_system, "~/tz/" + c, no_version(".1.0") + no_version(".1.0"),
       on(c) + record + ".1.0_2023c.1.0"},
      // Names that are no version, numbers too large, and a directory elsewhere.
      {system_2022a, on("2023b"), "~/tz/2023c.1.0/",
       no_version("2023c.1.0/") + not_newer("2023c.1.0/", "2023b"), on("2023b")},
      {system_2022a, on("99999999999a"), "~/tz/" + c, unable, on_system},
      {system_2022a, on("2023b"), "~/tz/2023c.99999999999", unable, on_system},
      {system_2022a, on("2023b"), "/opt/2023d",
       "orv_dataset::create_components: bad path /opt/2023d\n" + unable, on_system}};
  for (const auto& [installed, links, target, says, after] : table) {
    const std::string kept = paris + "~/tz_latest -> " + target + "\n";
    build(installed);
    build_store(links + kept);
    EXPECT_EQ(boot(), text(says + kept + after)) << links + target;
  }
}

TEST_F(run, a_record_is_replaced_by_an_activation_alone) {
  const std::string after = activated + latest + paris;
  expect({{on_system + record + "longer than what is written now\n" + latest + paris, "", after}});
  struct stat status = {};
  ASSERT_EQ(::stat("/var/db/timezone/TZVersionDiffRecord", &status), 0);
  EXPECT_EQ(status.st_mode, S_IFREG | 0644u);
  EXPECT_EQ(boot(), text(not_newer("2023c.1.0", "2023c.1.0") + after));
}

TEST_F(run, what_stands_in_a_links_place_is_replaced_or_reported) {
  const std::string system_link = "/usr/share/zoneinfo.default", links = on_system + latest + paris;
  const std::string no_system_link = kept_zoneinfo + not_created("~/zoneinfo", system_link);
  const std::string kept_icu = "remove: could not remove ~/icutz\nunlink of ICU softlink failed\n";
  expect({
      {"", no_link + invalid + no_zone, on_system + los_angeles},
      {"~/zoneinfo = file\n" + paris, "read_symlink: ~/zoneinfo\n" + invalid, on_system + paris},
      {"~/zoneinfo/\n",
       "read_symlink: ~/zoneinfo\n" + invalid + no_system_link + unable + no_system_link +
           no_reset + no_zone + "status 1\n",
       "~/zoneinfo/\n" + los_angeles},
      // Nothing is said of the zoneinfo link, which is not even read.
      {"~/zoneinfo -> /opt\n~/tz_latest = file\n" + paris, "read_symlink: ~/tz_latest\n" + unable,
       "~/tz_latest = file\n" + on_system + paris},
      {"~/icutz/\n/var/db/icutz -> /missing\n" + links,
       kept_icu + not_created("~/icutz", "~/tz/2023c.1.0/icutz") + unable + kept_icu,
       "~/icutz/\n/var/db/icutz -> /missing\n" + links},
      {"~/TZVersionDiffRecord/\n" + links, "",
       "~/TZVersionDiffRecord/\n" + on("2023c.1.0") + latest + paris},
  });
}

TEST_F(run, the_legacy_icu_link_is_carried_over_unless_there_is_a_new_one) {
  const std::string old = "/var/db/icutz", kept = on_system + paris;
  expect({
      {old + " -> ../../usr\n/var/db/icu = file\n" + kept, "", kept + "~/icutz -> ../../usr"},
      {old + " -> /usr\n~/icutz -> /var\n/var/db/icu/\n" + kept, "", kept + "~/icutz -> /var"},
      {old + " -> /usr\n~/icutz -> /missing\n" + kept,
       not_created("~/icutz", "/usr") + not_migrated, kept + "~/icutz -> /missing"},
      {old + " -> /missing\n/var/db/icu/full/\n" + kept, "",
       old + " -> /missing\n/var/db/icu/full/\n" + kept},
      {old + " = file\n" + kept, "read_symlink: " + old + "\n" + not_migrated, kept},
      {old + "/\n" + kept,
       "read_symlink: " + old + "\n" + not_migrated + "remove: could not remove " + old +
           "\nCould not remove /var/db/icutz\n",
       old + "/\n" + kept},
  });
}

TEST_F(run, the_localtime_link_is_made_to_lead_through_the_store) {
  const std::string link = "~/localtime", correcting = "Correcting localtime link to ~/zoneinfo";
  const std::string unread = "read_symlink: ~/localtime\n";
  const situation table[] = {
      {" -> ~/zoneinfo/No/Zone\n", "", link + " -> ~/zoneinfo/No/Zone\n"},
      {" -> ~/zoneinfoX\n", "", link + " -> ~/zoneinfoX\n"},
      {" -> ~/zoneinf\n", no_zone, los_angeles},
      {" -> ../zoneinfo/Europe/Paris\n", no_zone, los_angeles},
      {" -> /usr/share/zoneinfo/Europe/Paris\n", correcting + "/Europe/Paris\n", paris},
      {" -> /usr/share/zoneinfo/No/Zone\n", correcting + "/No/Zone\n" + no_zone, los_angeles},
      {" -> /usr/share/zoneinfo\n", correcting + "\n", link + " -> ~/zoneinfo\n"},
      {" -> /usr/share/zoneinf\n", no_zone, los_angeles},
      {" = file\n", unread + no_zone, los_angeles},
      {"/\n", unread + no_zone, los_angeles},
      {"/below/\n",
       unread + no_zone + not_created(link, "~/zoneinfo/America/Los_Angeles") +
           "Could not reset localtime link\nstatus 1\n",
       link + "/below/\n"}};
  for (const auto& [before, says, after, failing, number] : table)
    expect({{on_system + link + before, says, on_system + after}});
}

TEST_F(run, a_missing_store_is_not_made) { ASSERT_EQ(std::rename("/var/db", "/elsewhere"), 0); }

class watched_run : public run {
 protected:
};

TEST_F(watched_run, what_a_failed_call_prevents_is_said_and_done_otherwise) {
  const std::string system_link = "/usr/share/zoneinfo.default", links = on_system + latest + paris;
  const std::string update = "~/tz/2023c.1.0", old = "/var/db/icutz";
  expect({
      {"~/zoneinfo -> /opt\n" + paris,
       "Bad zoneinfo link /opt\n" + invalid + not_created("~/zoneinfo", system_link) + unable,
       on_system + paris, "symlink", 1},
      {on("2022z") + paris, rejected + not_created("~/zoneinfo", system_link) + unable,
       on_system + paris, "symlink", 1},
      {links, not_created("~/zoneinfo", update + "/zoneinfo") + unable, links, "symlink", 1},
      {links, not_created("~/icutz", update + "/icutz") + unable, links, "symlink", 2},
      {links, kept_zoneinfo + not_created("~/zoneinfo", update + "/zoneinfo") + unable, links,
       "unlink", 2},
      {links + old + " -> /missing\n",
       "remove: could not remove " + old + "\nunlink of ICU softlink failed\n",
       activated + latest + paris + old + " -> /missing\n", "unlink", 4},
      {links + record + "older\n", "", on("2023c.1.0") + record + "\n" + latest + paris, "write",
       1},
      {old + " -> /usr\n" + on_system + paris, not_created("~/icutz", "/usr") + not_migrated,
       on_system + paris, "symlink", 1},
      {on_system + "~/localtime -> /usr/share/zoneinfo/Europe/Paris\n",
       "Correcting localtime link to ~/zoneinfo/Europe/Paris\n" +
           not_created("~/localtime", "~/zoneinfo/Europe/Paris") + no_zone,
       on_system + los_angeles, "symlink", 1},
  });
}

}  // namespace
}  // namespace kelvane
