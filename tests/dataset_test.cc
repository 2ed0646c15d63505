#include "dataset/orv_dataset.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <filesystem>

#include "dataset/orv_icu.h"
#include "dataset/orv_zoneinfo.h"
#include "dataset/store_links.h"
#include "tests/device.h"

namespace kelvane {
namespace {

const std::string tz = "/var/db/timezone/tz/";

class dataset : public device {
 protected:
  // What is said of the ICU data in `directory` when it is compared with the system partition's.
  static std::string compared(const std::string& directory) {
    bool compatible = false;
    const std::string said =
        outcome([&] { compatible = orv_icu(directory).compatible_schema(orv_icu()); });
    return said + (compatible ? "same" : "other");
  }
};

TEST_F(dataset, a_link_target_names_a_data_set_or_is_bad) {
  const std::pair<std::string, std::string> good[] = {
      {"/usr/share/zoneinfo.default", ""},
      {tz + "2022b.1.1/icutz", tz + "2022b.1.1"},
      {tz + "2022b.1.1/zoneinfo/", tz + "2022b.1.1/zoneinfo"},
      {tz + "a/", tz + "a"}};
  for (const auto& [target, path] : good) EXPECT_EQ(dataset_path_from_link(target), path);
  for (const std::string target :
       {"", "/var/db/timezone/tz/", "/var/db/timezone/tz/2022b", "/var/db/timezone/tz//zoneinfo",
        "/var/db/timezone/tzs/a/zoneinfo", "zoneinfo.default", "/usr/share/zoneinfo.default/"}) {
    EXPECT_EQ(outcome([&] { dataset_path_from_link(target); }),
              "Bad zoneinfo link " + target + "\nint -1\n");
  }
}

TEST_F(dataset, a_version_text_is_the_directory_name_or_made_from_the_system_partition) {
  build(system("2022a") + download("2022b.1.1"));
  const orv_dataset system, update(tz + "2022b.1.1");
  EXPECT_EQ(system.get_version_string(), "2022a.1.0");
  EXPECT_EQ(update.get_version_string(), "2022b.1.1");
  EXPECT_TRUE(update.is_newer_than(system) && !update.is_newer_than(update));
  EXPECT_TRUE(system.same_path(orv_dataset("")) && !update.same_path(system));
  for (const std::string path : {"/var/db/timezone/tz/", "//var/db/timezone/tz/a", "tz/2022b",
                                 "/var/db/timezone/TZ/a", "/usr/share/zoneinfo.default"}) {
    EXPECT_EQ(outcome([&] { orv_dataset{path}; }),
              "orv_dataset::create_components: bad path " + path + "\ninvalid_argument badpath\n");
  }
}

TEST_F(dataset, the_schema_is_in_the_name_of_a_readable_file_directly_in_the_directory) {
  const std::pair<std::string, std::string> table[] = {
      {"icutz44l.dat = ", "44l"},   {"icutz007e.dat = ", "007e"},  {"icutz1b.dat = ", "1b"},
      {"icutz44l.dat.bak = ", ""},  {"xicutz44l.dat = ", ""},      {"icutz44L.dat = ", ""},
      {"icutz44a.dat = ", ""},      {"icutz.dat = ", ""},          {"icutz44lxdat = ", ""},
      {"icutz44l.dat -> ../f", ""}, {"icutz44l.dat/below = ", ""}, {"below/icutz44l.dat = ", ""}};
  int number = 0;
  for (const auto& [entry, schema] : table) {
    const std::string directory = tz + std::to_string(number++);
    build(directory + "/f = \n" + directory + "/icutz/" + entry);
    build("/usr/share/icu/icutzformat.txt = " + schema);
    EXPECT_EQ(compared(directory),
              schema.empty() ? "No ICU schema found for " + directory + "\nsame" : "same")
        << entry;
  }
}

TEST_F(dataset, schemas_are_compared_as_texts_and_with_icu_data_only) {
  build(system("2022a") + download("1a", "044l") + download("2a", "44b") + download("3a") +
        download("4a") + "~/tz/5a/icutz -> ../4a/icutz\n~/tz/6a/icutz/below/");
  ASSERT_EQ(::chmod((tz + "3a/icutz/icutz44l.dat").c_str(), 0660), 0);
  ASSERT_EQ(::mkfifo((tz + "6a/icutz/icutz44l.dat").c_str(), 0644), 0);
  const std::string none = "No ICU schema found for " + tz;
  const std::pair<std::string, std::string> table[] = {{"1a", "other"},
                                                       {"2a", "other"},
                                                       {"3a", none + "3a\nother"},
                                                       {"4a", "same"},
                                                       {"5a", "same"},
                                                       {"6a", none + "6a\nother"},
                                                       {"7a", none + "7a\nother"}};
  for (const auto& [version, wanted] : table) EXPECT_EQ(compared(tz + version), wanted);
  EXPECT_TRUE(orv_zoneinfo().compatible_schema(orv_icu()));
  EXPECT_EQ(outcome([] { EXPECT_FALSE(orv_icu().compatible_schema(orv_zoneinfo())); }),
            "orv_icu::compatible_schema: could not dynamic_cast other component\n");
}

// Where sizes and times have 32 bits, none of these could be looked at.
TEST_F(dataset, large_files_and_times_after_2038_supply_their_schema) {
  build(system("2022a") + download("1a") + download("2a") + download("3a"));
  const timespec year_2040 = {2208988800, 0}, times[] = {year_2040, year_2040};
  ASSERT_EQ(::truncate((tz + "1a/icutz/icutz44l.dat").c_str(), 3LL << 30), 0);
  for (const char* path : {"2a/icutz/icutz44l.dat", "3a/icutz"})
    ASSERT_EQ(::utimensat(AT_FDCWD, (tz + path).c_str(), times, 0), 0);
  for (const char* version : {"1a", "2a", "3a"}) EXPECT_EQ(compared(tz + version), "same");
}

}  // namespace
}  // namespace kelvane
