#pragma once

#include <string>
#include <string_view>

namespace foundation::core::text {

// Conversions between UTF-8 and UTF-16. Both are total: malformed input (a lone surrogate, a
// byte that cannot start or continue a sequence, an overlong or out-of-range encoding, a
// truncated sequence) becomes U+FFFD, one per maximal ill-formed subsequence, and the
// conversion carries on with the next code unit. Well-formed input round-trips exactly.
std::string toUtf8(std::u16string_view text);
// toUtf8(text) appended to `out`.
void appendUtf8(std::string& out, std::u16string_view text);
std::u16string toUtf16(std::string_view text);

}  // namespace foundation::core::text
