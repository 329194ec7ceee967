// The one missing value of mcsim.
//
// Missing is a quiet NaN and IsMissing tests for any NaN, so that a NaN produced by a library
// (0/0, log of a negative number) can never pass for a number: it reads as missing.
#pragma once

#include <cmath>
#include <limits>

namespace MCCommon_800 {

struct MCMV {
    static constexpr double Missing() { return std::numeric_limits<double>::quiet_NaN(); }
    static bool IsMissing(double x) { return std::isnan(x); }
};

} // namespace MCCommon_800
