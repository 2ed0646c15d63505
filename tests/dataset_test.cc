#include "dataset/orv_dataset.h"
#include "dataset/orv_icu.h"
#include "dataset/orv_zoneinfo.h"
#include "dataset/store_links.h"
#include "tests/device.h"

namespace kelvane {
namespace {

const std::string tz = "/var/db/timezone/tz/";

class dataset : public device {};

TEST_F(dataset, a_link_target_names_a_data_set_or_is_bad) {
  const std::pair<std::string, std::string> good[] = {{"/usr/share/zoneinfo.default", ""},
                                                      {tz + "2022b.1.1/icutz", tz + "2022b.1.1"},
                                                      {tz + "a/zoneinfo/", tz + "a/zoneinfo"},
                                                      {tz + "a/", tz + "a"}};
  for (const auto& [target, path] : good) EXPECT_EQ(dataset_path_from_link(target), path);
  for (const std::string target :
       {"", "/var/db/timezone/tz/", "/var/db/timezone/tz/2022b", "/var/db/timezone/tz//zoneinfo",
        "/var/db/timezone/tzs/a/zoneinfo", "zoneinfo.default", "/usr/share/zoneinfo.default/"})
    EXPECT_EQ(outcome([&] { dataset_path_from_link(target); }),
              "Bad zoneinfo link " + target + "\nint -1\n");
}

TEST_F(dataset, a_version_text_is_the_directory_name_or_made_from_the_system_partition) {
  build("/usr/share/zoneinfo.default/+VERSION = 2022a\n~/tz/2022b.1.1/icutz/icutz44l.dat = data");
  const orv_dataset system, update(tz + "2022b.1.1");
  EXPECT_EQ(system.get_version_string() + update.get_version_string(), "2022a.1.02022b.1.1");
  EXPECT_TRUE(update.is_newer_than(system) && !update.is_newer_than(update));
  EXPECT_TRUE(system.same_path(orv_dataset("")) && !update.same_path(system));
  for (const std::string path : {"/var/db/timezone/tz/", "//var/db/timezone/tz/a", "tz/2022b",
                                 "/var/db/timezone/TZ/a", "/usr/share/zoneinfo.default"})
    EXPECT_EQ(outcome([&] { orv_dataset{path}; }), "orv_dataset::create_components: bad path " +
                                                       path + "\nSt16invalid_argument badpath\n");
}

TEST_F(dataset, the_schema_is_in_the_name_of_a_readable_file_directly_in_the_directory) {
  static constexpr char icu[] = "/var/db/timezone/tz/1a/icutz",
                        data[] = "/var/db/timezone/tz/1a/icutz/icutz44l.dat";
  // Where sizes and times have 32 bits, large files and late times could not be looked at.
  static constexpr timespec times[] = {{2208988800, 0}, {2208988800, 0}};
  const auto expect = [](
                          const std::string& schema, const std::string& entry,
                          const action& change = [] {}) {
    for (const std::string other : {"", "0"}) {
      build("/usr/share/icu/icutzformat.txt = " + other + schema + "\n~/tz/1a/icutz/" + entry);
      change();
      bool same = false;
      EXPECT_EQ(outcome([&] { same = orv_icu(tz + "1a").compatible_schema(orv_icu()); }),
                schema != "" ? "" : "No ICU schema found for " + tz + "1a\n");
      EXPECT_EQ(same, other == "") << entry;
    }
  };
  expect("007e", "icutz007e.dat = ");
  expect("1b", "icutz1b.dat = ");
  expect("44l", "icutz44l.dat = ", [] { ASSERT_EQ(::truncate(data, 3LL << 30), 0); });
  expect("44l", "icutz44l.dat = ", [] { ASSERT_EQ(::utimensat(0, data, times, 0), 0); });
  expect("44l", "icutz44l.dat = ", [] { ASSERT_EQ(::utimensat(0, icu, times, 0), 0); });
  expect("44l", "icutz44l.dat = ", [] { fs::rename(icu, "/s"), fs::create_symlink("/s", icu); });
  expect("", "icutz44l.dat = ", [] { ASSERT_EQ(::chmod(data, 0660), 0); });
  expect("", "icutz44l.dat = ", [] { ASSERT_EQ(::unlink(data) + ::mkfifo(data, 0644), 0); });
  expect("", "icutz44l.dat = ", [] { fs::remove_all(icu); });
  for (const char* entry :
       {"icutz44l.dat -> /usr/share/icu/icutzformat.txt",
        "icutz44l.dat/below = ", "below/icutz44l.dat = ", "icutz44l.dat.bak = ", "xicutz44l.dat = ",
        "icutz44L.dat = ", "icutz44a.dat = ", "icutz.dat = ", "icutz44lxdat = "})
    expect("", entry);
  EXPECT_TRUE(orv_zoneinfo().compatible_schema(orv_icu()));
  EXPECT_EQ(outcome([] { EXPECT_FALSE(orv_icu().compatible_schema(orv_zoneinfo())); }),
            "orv_icu::compatible_schema: could not dynamic_cast other component\n");
}

}  // namespace
}  // namespace kelvane
