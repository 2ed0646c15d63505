#include "foundation/tz_version.h"

#include <stdexcept>
#include <tuple>
#include <vector>

#include "foundation/byte_regex.h"
#include "foundation/warning.h"

namespace kelvane {
namespace {

std::int32_t sub_version(const std::string& number) {
  return number.empty() ? -1 : std::stoi(number);
}

}  // namespace

tz_version::tz_version(const std::string& text) { parse(text); }

void tz_version::parse(const std::string& text) {
  try {
    const std::wregex pattern = byte_regex(L"([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?");
    const std::vector<std::string> results = full_match(text, pattern);
    if (results.empty()) {
      warn("Cannot parse version string %s, results.size() = %d", text.c_str(),
           static_cast<int>(results.size()));
      throw std::invalid_argument("no match");
    }
    year = std::stoi(results[1]);
    letters = results[2];
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
