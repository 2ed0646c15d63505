#include "dataset/orv_dataset.h"

#include "dataset/orv_icu.h"
#include "dataset/orv_zoneinfo.h"
#include "dataset/store_links.h"
#include "tests/world.h"

namespace kelvane {
namespace {

const std::string tz = "/var/db/timezone/tz/";

class dataset : public world {};

TEST_F(dataset, a_link_target_names_a_data_set_or_is_bad) {
  const std::pair<std::string, std::string> good[] = {
      {"/usr/share/zoneinfo.default", ""},
      {tz + "2022b.1.1/zoneinfo", tz + "2022b.1.1"},
      {tz + "2022b.1.1/icutz", tz + "2022b.1.1"},
      {tz + "2022b.1.1/zoneinfo/", tz + "2022b.1.1/zoneinfo"},
      {tz + "a/b/zoneinfo", tz + "a/b"},
      {tz + "a/", tz + "a"}};
  for (const auto& [target, path] : good) EXPECT_EQ(dataset_path_from_link(target), path);
  for (const std::string& target : {std::string(), std::string("zoneinfo.default"), tz, tz + "2022b",
                                    tz + "/zoneinfo", std::string("/var/db/timezone/tz2/a/zoneinfo"),
                                    std::string("/usr/share/zoneinfo.default/"),
                                    std::string("/usr/share/zoneinfo")}) {
    expect_text(outcome([&] { dataset_path_from_link(target); }),
                "Bad zoneinfo link " + target + ": *\nint -1");
  }
}

TEST_F(dataset, a_version_text_comes_from_the_directory_or_the_system_partition) {
  build(system("2022a") + download("2022b.1.1"));
  EXPECT_EQ(orv_dataset().get_version_string(), "2022a.1.0");
  EXPECT_TRUE(orv_dataset().same_path(orv_dataset(std::string())));
  const orv_dataset update(tz + "2022b.1.1");
  EXPECT_EQ(update.get_version_string(), "2022b.1.1");
  EXPECT_TRUE(update.is_newer_than(orv_dataset()));
  EXPECT_FALSE(update.is_newer_than(update));
  EXPECT_FALSE(update.same_path(orv_dataset()));
  for (const std::string name : {"x", "2022b.1.1/"}) {
    expect_text(outcome([&] { EXPECT_EQ(orv_dataset(tz + name).get_version_string(), name); }),
                "Cannot parse version string " + name + ", results.size() = 0: *\n" +
                "Cannot parse version string " + name + ": *" +
                (name == "x" ? "\nNo ICU schema found for " + tz + "x: *" : ""));
  }
}

TEST_F(dataset, a_directory_elsewhere_is_a_bad_path) {
  for (const std::string& path : {tz, std::string("/var/db/timezone/tzdata/2022b"), "/" + tz + "a",
                                  std::string("/usr/share/zoneinfo.default"),
                                  std::string("tz/2022b"), std::string("/var/db/timezone/TZ/a")}) {
    expect_text(outcome([&] { orv_dataset data{path}; }),
                "orv_dataset::create_components: bad path " + path + ": *\ninvalid_argument badpath");
  }
  EXPECT_EQ(outcome([] { orv_dataset data{tz + "99999999999a"}; }), "out_of_range\n");
}

TEST_F(dataset, the_schema_is_in_the_name_of_a_readable_file_directly_in_the_directory) {
  const std::pair<std::string, std::string> table[] = {
      {"icutz44l.dat = ", "44l"},         {"icutz007e.dat = ", "007e"}, {"icutz1b.dat = ", "1b"},
      {"icutz44l.dat.bak = ", ""},        {"xicutz44l.dat = ", ""},     {"icutz44L.dat = ", ""},
      {"icutz44a.dat = ", ""},            {"icutz.dat = ", ""},         {"icutz44lxdat = ", ""},
      {"icutz44l.dat -> ../file", ""},    {"icutz44l.dat/", ""},        {"below/icutz44l.dat = ", ""},
      {"a/b = \nicutz9l.dat = ", "9l"},   {"icutz٣l.dat = ", ""}};
  for (const auto& [entry, schema] : table) {
    const std::string directory = tz + std::to_string(&entry - &table[0].first);
    build(directory + "/file = \n" + directory + "/icutz/" + entry);
    build("/usr/share/icu/icutzformat.txt = " + schema + " other words");
    expect_text(outcome([&] {
                  EXPECT_TRUE(orv_icu(directory).compatible_schema(orv_icu())) << entry;
                }), schema.empty() ? "No ICU schema found for " + directory + ": *" : "");
  }
}

TEST_F(dataset, schemas_are_compared_as_texts_and_kinds_only_by_icu) {
  build(system("2022a", "44l") + download("1a", "044l") + download("2a", "44b") + download("3a"));
  ASSERT_EQ(::chmod((tz + "3a/icutz/icutz44l.dat").c_str(), 0660), 0);
  for (const std::string version : {"1a", "2a", "3a"}) {
    outcome([&] { EXPECT_FALSE(orv_icu(tz + version).compatible_schema(orv_icu())) << version; });
  }
  EXPECT_TRUE(orv_zoneinfo().compatible_schema(orv_icu()));
  expect_text(outcome([] { EXPECT_FALSE(orv_icu().compatible_schema(orv_zoneinfo())); }),
              "orv_icu::compatible_schema: could not dynamic_cast other component: *");
}

TEST_F(dataset, activation_changes_the_zoneinfo_link_first_and_stops_at_a_failure) {
  build(system("2022a") + "/var/db/timezone/zoneinfo/below = x\n/var/db/timezone/icutz -> old\n");
  EXPECT_EQ(outcome([] { reset_to_system_partition(); }),
            "remove: could not remove /var/db/timezone/zoneinfo: Is a directory\n"
            "Unlink of zoneinfo softlink failed: Is a directory\n"
            "create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default: File exists\n"
            "int 17\n");
  EXPECT_EQ(listing("/var/db"), "/var/db/timezone/icutz -> old\n/var/db/timezone/zoneinfo/below = x\n");
}

TEST_F(dataset, an_icu_link_that_stays_keeps_the_legacy_link) {
  build(download("2023c") + "/var/db/timezone/icutz/below = x\n/var/db/icutz -> old\n");
  EXPECT_EQ(outcome([] { orv_icu(tz + "2023c").activate(); }),
            "remove: could not remove /var/db/timezone/icutz: Is a directory\n"
            "unlink of ICU softlink failed: Is a directory\n"
            "create_symlink: from /var/db/timezone/icutz to " + tz + "2023c/icutz: File exists\n"
            "int 17\n");
  EXPECT_EQ(outcome([] { orv_icu().activate(); }).find("create_symlink"), std::string::npos);
}

}  // namespace
}  // namespace kelvane
