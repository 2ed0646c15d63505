// The version of a time-zone data release.

#ifndef KELVANE_FOUNDATION_TZ_VERSION_H_
#define KELVANE_FOUNDATION_TZ_VERSION_H_

#include <cstdint>
#include <string>

namespace kelvane {

// The parsed form of a version text such as 2016a.1.0: digits for the year, one or more of the
// letters a to z, then up to two sub-versions, each a dot and digits; nothing before, between or
// after. It cannot be turned back into text: 02016a.01 and 2016a.1 are equal.
struct tz_version {
  // After a text was parsed, -1 in `major` or `minor` means that it has no such sub-version.
  std::int32_t year = -1;
  std::string letters;
  std::int32_t major = -1;
  std::int32_t minor = -1;

  // The unset value, as initialised above; it is older than every version.
  tz_version() = default;

  // As parse(text).
  explicit tz_version(const std::string& text);

  // Replaces all four fields by those that `text` states. A text of any other shape gives the unset
  // value, after the warnings "Cannot parse version string TEXT, results.size() = 0" and "Cannot
  // parse version string TEXT". Throws std::out_of_range for a number above 2147483647; the fields
  // before it have then been set.
  //
  // Example: 2016a.1 gives year 2016, letters a, major 1 and minor -1.
  void parse(const std::string& text);

  // Whether all four fields are equal; != follows from it.
  bool operator==(const tz_version&) const = default;
};

// Whether `left` is newer than `right`: the first field that differs decides, in the order of the
// fields. Letters compare byte by byte, not by length: b is newer than aa, and za than z.
bool operator>(const tz_version& left, const tz_version& right);

}  // namespace kelvane

#endif  // KELVANE_FOUNDATION_TZ_VERSION_H_
