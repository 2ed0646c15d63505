#include <sys/stat.h>

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
      {tz + "2022b.1.1/zoneinfo/", tz + "2022b.1.1/zoneinfo"},
      {tz + "a/", tz + "a"}};
  for (const auto& [target, path] : good) EXPECT_EQ(dataset_path_from_link(target), path);
  for (const std::string target :
       {"", "/var/db/timezone/tz/", "/var/db/timezone/tz/2022b", "/var/db/timezone/tz//zoneinfo",
        "/var/db/timezone/tzs/a/zoneinfo", "zoneinfo.default", "/usr/share/zoneinfo.default/"}) {
    expect_text(outcome([&] { dataset_path_from_link(target); }),
                "Bad zoneinfo link " + target + ": *\nint -1");
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
    expect_text(outcome([&] { orv_dataset{path}; }),
                "orv_dataset::create_components: bad path " + path + ": *\nbadpath");
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
    SCOPED_TRACE(entry);
    expect_text(outcome([&] { EXPECT_TRUE(orv_icu(directory).compatible_schema(orv_icu())); }),
                schema.empty() ? "No ICU schema found for " + directory + ": *" : "");
  }
}

TEST_F(dataset, schemas_are_compared_as_texts_and_with_icu_data_only) {
  build(system("2022a") + download("1a", "044l") + download("2a", "44b") + download("3a") +
        download("4a") + tz + "5a/icutz -> ../4a/icutz");
  ASSERT_EQ(::chmod((tz + "3a/icutz/icutz44l.dat").c_str(), 0660), 0);
  for (const std::string version : {"1a", "2a", "3a"}) {
    bool compatible = true;
    outcome([&] { compatible = orv_icu(tz + version).compatible_schema(orv_icu()); });
    EXPECT_FALSE(compatible) << version;
  }
  EXPECT_TRUE(orv_icu(tz + "5a").compatible_schema(orv_icu()));
  EXPECT_TRUE(orv_zoneinfo().compatible_schema(orv_icu()));
  expect_text(outcome([] { EXPECT_FALSE(orv_icu().compatible_schema(orv_zoneinfo())); }),
              "orv_icu::compatible_schema: could not dynamic_cast other component: *");
}

}  // namespace
}  // namespace kelvane
