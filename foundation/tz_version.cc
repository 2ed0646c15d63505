#include "foundation/tz_version.h"

#include <regex>
#include <stdexcept>
#include <tuple>

#include "foundation/byte_regex.h"
#include "foundation/warning.h"

namespace kelvane {
namespace {

std::int32_t sub_version(const std::ssub_match& group) {
  return group.matched ? std::stoi(group.str()) : -1;
}

}  // namespace

tz_version::tz_version(const std::string& text) { parse(text); }

void tz_version::parse(const std::string& text) {
  try {
    const byte_regex pattern("([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?",
                             byte_regex_grammar);
    std::smatch results;
    if (!std::regex_match(text, results, pattern)) {
      warn("Cannot parse version string %s, results.size() = %d", text.c_str(),
           static_cast<int>(results.size()));
      throw std::invalid_argument("no match");
    }
    year = std::stoi(results.str(1));
    letters = results.str(2);
    major = sub_version(results[3]);
    minor = sub_version(results[4]);
  } catch (const std::invalid_argument&) {
    warn("Cannot parse version string %s", text.c_str());
    *this = tz_version();
  }
}

bool operator>(const tz_version& left, const tz_version& right) {
  return std::tie(left.year, left.letters, left.major, left.minor) >
         std::tie(right.year, right.letters, right.major, right.minor);
}

}  // namespace kelvane
