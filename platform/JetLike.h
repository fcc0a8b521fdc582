#pragma once

#include <optional>
#include <string_view>

namespace maroset::platform {

// The original database engine's `like`, which the system's queries are written for:
//   *        any run of characters, the empty run included
//   ?        any one character
//   #        one digit 0-9
//   [list]   one character of the list; ranges such as [a-z] or [0-9A-F] allowed; `-` first
//            or last and `!` anywhere but first are ordinary; [*], [?], [#] and [[] match
//            the character itself; [] matches the empty run
//   [!list]  one character not in the list
// Everything else, `%` and `_` included, is an ordinary character. Letters compare without
// regard to case (ASCII and Latin-1 letters; text is bytes). An escape character, when
// given, makes the character after it ordinary.
//
// A pattern with an unclosed `[`, a descending range such as [z-a], or a pattern ending in
// the escape character fails with Invalid pattern string (93).
bool JetLike(std::string_view text, std::string_view pattern,
             std::optional<char> escape = std::nullopt);

// Whether a pattern holds no wildcard (nor the escape character): it then matches exactly the
// texts JetSameText accepts, the same letters in any case. Most patterns are plain tag names
// tried against every row of a query; a caller may decide this once per query.
bool JetPlainPattern(std::string_view pattern, std::optional<char> escape = std::nullopt);
bool JetSameText(std::string_view text, std::string_view pattern);

// The error number of a malformed pattern.
inline constexpr int InvalidPatternString = 93;

}  // namespace maroset::platform
