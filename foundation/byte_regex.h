// Regular expressions over plain bytes.

#ifndef KELVANE_FOUNDATION_BYTE_REGEX_H_
#define KELVANE_FOUNDATION_BYTE_REGEX_H_

#include <cstddef>
#include <cstring>
#include <locale>
#include <regex>
#include <string>

namespace kelvane {

// The traits of a regular expression whose characters are bytes and equal only to themselves,
// whatever the process's locale. They spare its collation, which std::regex_traits asks about each
// of 256 bytes for each bracket, ten times the cost of building a pattern. Named classes
// ([:alpha:], \d) and collating elements are not supported.
struct byte_traits {
  // What a pattern makes for itself; a std::locale would be a copy of the process's.
  struct classic_locale : std::locale {
    classic_locale() : std::locale(classic()) {}
  };

  using char_type = char;
  using string_type = std::string;
  using locale_type = classic_locale;
  using char_class_type = unsigned;

  static std::size_t length(const char* text) { return std::strlen(text); }
  char translate(char byte) const { return byte; }
  char translate_nocase(char byte) const { return byte; }
  bool isctype(char, char_class_type) const { return false; }
  int value(char digit, int) const { return digit - '0'; }
  locale_type imbue(const locale_type&) { return {}; }
  locale_type getloc() const { return {}; }

  template <class Iterator>
  string_type transform(Iterator first, Iterator last) const {
    return string_type(first, last);
  }
  template <class Iterator>
  string_type transform_primary(Iterator, Iterator) const {
    return string_type();
  }
  template <class Iterator>
  string_type lookup_collatename(Iterator, Iterator) const {
    return string_type();
  }
  template <class Iterator>
  char_class_type lookup_classname(Iterator, Iterator, bool = false) const {
    return 0;
  }
};

using byte_regex = std::basic_regex<char, byte_traits>;

// The ECMAScript grammar. libstdc++'s default matcher recurses for each character, so that a long
// text overflows the stack; the matcher that this flag of its own selects does not.
#ifdef __GLIBCXX__
inline constexpr auto byte_regex_grammar =
    std::regex_constants::ECMAScript | std::regex_constants::__polynomial;
#else
inline constexpr auto byte_regex_grammar = std::regex_constants::ECMAScript;
#endif

}  // namespace kelvane

#endif  // KELVANE_FOUNDATION_BYTE_REGEX_H_
