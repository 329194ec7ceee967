#include "mccommon/numtext.h"

#include <charconv>
#include <cmath>
#include <cstdlib>
#include <limits>
#include <sstream>
#include <string_view>

namespace MCCommon_800 {

std::string FormatDefault(double x) {
    std::ostringstream os;
    os << x;
    return os.str();
}

std::string FormatRoundTrip(double x) {
    if (std::isnan(x)) {
        return "NaN";
    }
    if (std::isinf(x)) {
        return x > 0 ? "INF" : "-INF";
    }
    constexpr double kTwo53 = 9007199254740992.0;
    if (x == std::trunc(x) && std::fabs(x) < kTwo53) {
        if (x == 0.0 && std::signbit(x)) {
            return "-0";
        }
        return std::to_string(static_cast<long long>(x));
    }
    char buf[64];
    const auto res = std::to_chars(buf, buf + sizeof buf, x);
    return std::string(buf, res.ptr);
}

bool ParseDouble(const std::string& text, double& out) {
    return ParseDouble(std::string_view(text), out);
}

bool ParseDouble(std::string_view text, double& out) {
    std::size_t b = 0;
    std::size_t e = text.size();
    while (b < e && (text[b] == ' ' || text[b] == '\t' || text[b] == '\n' || text[b] == '\r')) {
        ++b;
    }
    while (e > b && (text[e - 1] == ' ' || text[e - 1] == '\t' || text[e - 1] == '\n' ||
                     text[e - 1] == '\r')) {
        --e;
    }
    if (b == e) {
        return false;
    }
    // Read in place: this runs for every cell of a data file.
    const std::string_view t = text.substr(b, e - b);
    const auto isDigitOrPoint = [](char c) { return (c >= '0' && c <= '9') || c == '.'; };
    const bool numeric = isDigitOrPoint(t[0]) ||
                         ((t[0] == '+' || t[0] == '-') && t.size() > 1 && isDigitOrPoint(t[1]));
    if (!numeric) {
        if (t == "INF" || t == "inf" || t == "+INF" || t == "Infinity") {
            out = std::numeric_limits<double>::infinity();
            return true;
        }
        if (t == "-INF" || t == "-inf" || t == "-Infinity") {
            out = -std::numeric_limits<double>::infinity();
            return true;
        }
        if (t == "NaN" || t == "nan") {
            out = std::numeric_limits<double>::quiet_NaN();
            return true;
        }
    }
    // from_chars does not take a leading '+'; strtod would take hex and locale forms.
    const char* first = t.data();
    const char* last = t.data() + t.size();
    if (*first == '+') {
        ++first;
        if (first == last || *first == '-') {
            return false;
        }
    }
    double value = 0.0;
    const auto res = std::from_chars(first, last, value);
    if (res.ec == std::errc::result_out_of_range) {
        // Overflow becomes infinity, underflow a signed zero, as strtod does.
        value = std::strtod(std::string(t).c_str(), nullptr);
    } else if (res.ec != std::errc()) {
        return false;
    }
    if (res.ptr != last) {
        return false;
    }
    out = value;
    return true;
}

} // namespace MCCommon_800
