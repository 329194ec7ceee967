// Number <-> text conversions shared by the libraries: the default stream form used for labels
// and category texts, the shortest round-trip form used in documents, and a strict parser.
#pragma once

#include <string>
#include <string_view>

namespace MCCommon_800 {

//! `x` as a default-formatted std::ostream writes it: six significant digits, the shorter of
//! fixed and scientific notation ("10", "0.25", "1e+06"). Missing is written as "nan".
std::string FormatDefault(double x);

//! The shortest text that reads back to exactly `x`. Integral values below 2^53 in magnitude
//! are written in plain notation ("95", "100000", "-3"); other finite values use the shortest
//! round-trip form of std::to_chars; infinities are "INF"/"-INF" and NaN is "NaN".
std::string FormatRoundTrip(double x);

//! Reads the whole of `text` (surrounding blanks allowed) as a decimal number into `out`.
//! "INF", "-INF", "inf", "NaN" are accepted. False, with `out` untouched, when anything else is
//! there.
bool ParseDouble(const std::string& text, double& out);
//! The same, reading `text` where it lies (a cell of a data file, without a copy).
bool ParseDouble(std::string_view text, double& out);
//! The same for a C string (a literal would otherwise fit both overloads above).
inline bool ParseDouble(const char* text, double& out) {
    return ParseDouble(std::string_view(text), out);
}

} // namespace MCCommon_800
