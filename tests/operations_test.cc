// The operations that the program is made of, where no start of a device shows the difference.

#include "foundation/first_word.h"
#include "foundation/tz_version.h"
#include "tests/device.h"

namespace kelvane {

TEST(first_word, lies_between_white_space_of_any_kind) {
  const std::string blanks(5000, ' '), pages(9000, 'w'), bytes("#\xa0\0\x85", 4);
  const std::pair<std::string, std::string> words[] = {
      {blanks + pages + "\f", pages}, {"\t\n\v\f\r" + bytes + "\v2023d", bytes}, {" \n", ""}};
  for (const auto& [text, word] : words) {
    std::ofstream("/file") << text;
    EXPECT_EQ(first_word("/file"), word) << text;
  }
  ::mkfifo("/pipe", 0600);
  EXPECT_EQ(first_word("/pipe"), "");
}

TEST(versions, are_ordered_by_the_first_field_that_differs) {
  std::istringstream rising(R"(
      0a  2015z.9.9  2016a  2016a.0  2016a.1  2016a.1.0  2016a.1.9  2016a.2  2016a.10
      2016aa  2016b  2016z  2016za  2017a  10000a  2147483647a
  )");
  std::vector<tz_version> versions(1);
  for (std::string text; rising >> text;) versions.emplace_back(text);
  for (const tz_version& left : versions) {
    for (const tz_version& right : versions) {
      EXPECT_EQ(left > right, &left > &right) << left.letters << " " << right.letters;
      EXPECT_EQ(left == right, &left == &right);
    }
  }
  EXPECT_EQ(tz_version("02016a.010"), tz_version("2016a.10"));
}

TEST(a_version, has_the_fields_that_its_text_states) {
  const std::string many(100000, 'z');
  EXPECT_EQ(tz_version("1" + many).letters, many);
  for (const char* const other_shape :
       {"", "a", "2016", "2016A", "2016a.", "2016a.1.2.3", " 2016a", "2016a ", "a2016", "2016\xe9",
        "2016a.-1", "2016a1", "2016ax1", "2016a.1x0", "2016a..1", "tzdata2016a"}) {
    tz_version version("1x.1.1");
    version.parse(other_shape);
    EXPECT_EQ(version, tz_version()) << other_shape;
  }
  for (const char* const too_large :
       {"18446744073709553632b", "2147483648b", "2017b.2147483648", "2017b.2.4294967297"}) {
    EXPECT_THROW(tz_version{too_large}, std::out_of_range) << too_large;
  }
}

}  // namespace kelvane
