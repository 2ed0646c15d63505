// Regular expressions that match bytes, whatever the locale.

#ifndef KELVANE_FOUNDATION_BYTE_REGEX_H_
#define KELVANE_FOUNDATION_BYTE_REGEX_H_

#include <regex>
#include <string>
#include <vector>

namespace kelvane {

// The compiled form of `pattern`, in the ECMAScript grammar, for full_match(). Wide, because
// libstdc++ tabulates 256 answers of the locale for each bracket of a narrow pattern, which makes
// it several times as dear to build, and none for a wide one.
inline std::wregex byte_regex(const wchar_t* pattern) {
#ifdef __GLIBCXX__
  // The default matcher recurses for each character, so that a long text overflows the stack; the
  // matcher that this flag selects does not.
  return std::wregex(pattern, std::wregex::ECMAScript | std::regex_constants::__polynomial);
#else
  return std::wregex(pattern);
#endif
}

// What `pattern` finds if it matches all of `text`: the text, then that of each group, empty for a
// group that took no part. No texts at all if it does not match.
//
// Example: "icutz44l.dat" and L"icutz([0-9]+[lbe])\\.dat" give "icutz44l.dat" and "44l".
inline std::vector<std::string> full_match(const std::string& text, const std::wregex& pattern) {
  std::wstring wide;  // Not by way of char, which may be negative: that is no wide character.
  for (const char byte : text) wide.push_back(static_cast<unsigned char>(byte));
  std::wsmatch groups;
  std::regex_match(wide, groups, pattern);
  std::vector<std::string> texts;
  for (const std::wssub_match& group : groups) texts.emplace_back(group.first, group.second);
  return texts;
}

}  // namespace kelvane

#endif  // KELVANE_FOUNDATION_BYTE_REGEX_H_
