// Regular expressions over plain bytes.

#ifndef KELVANE_FOUNDATION_BYTE_REGEX_H_
#define KELVANE_FOUNDATION_BYTE_REGEX_H_

#include <regex>

namespace kelvane {

// The traits of a regular expression in which a byte equals only itself. std::regex_traits asks the
// locale about each of 256 bytes for each bracket of a pattern, which makes the pattern more than
// ten times as dear to build. These never ask: named classes ([:alpha:], \d) and equivalence
// classes ([=a=]) are not supported.
struct byte_traits : std::regex_traits<char> {
  bool isctype(char, char_class_type) const { return false; }
  // The library's own reads the digit from a stream.
  int value(char digit, int) const { return digit - '0'; }

  template <class Iterator>
  string_type transform_primary(Iterator, Iterator) const {
    return {};
  }
  template <class Iterator>
  char_class_type lookup_classname(Iterator, Iterator, bool = false) const {
    return {};
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
