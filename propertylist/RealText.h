// The text form of reals in property lists: decimal, and it reads back to the same bits.

#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace welcomer {

// The shortest decimal form that reads back to the same bits; "inf", "-inf" and "nan" for what has none. A
// not-a-number other than the plain quiet one carries its bits: "nan(0xfff8000000000000)".
std::string formatReal(double value);

// The number that `text` stands for: every form that formatReal() gives, "infinity", and a leading plus sign;
// letters may be of either case. None when it is no number or beyond the range of reals.
std::optional<double> parseReal(std::string_view text);

} // namespace welcomer
