// The one tolerance check of the test suite: relative and absolute parts, and missing values
// compared as values (missing equals missing, and nothing else).
#pragma once

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <sstream>

namespace mctest {

//! Machine epsilon, for tolerances written as multiples of it.
inline constexpr double kEps = std::numeric_limits<double>::epsilon();

//! Success when |actual - expected| <= abs + rel * |expected|, or both are NaN (missing), or
//! both are the same infinity.
inline ::testing::AssertionResult Near(double actual, double expected, double rel,
                                       double abs = 0.0) {
    if (std::isnan(actual) || std::isnan(expected)) {
        if (std::isnan(actual) && std::isnan(expected)) {
            return ::testing::AssertionSuccess();
        }
    } else if (std::isinf(actual) || std::isinf(expected)) {
        if (actual == expected) {
            return ::testing::AssertionSuccess();
        }
    } else if (std::fabs(actual - expected) <= abs + rel * std::fabs(expected)) {
        return ::testing::AssertionSuccess();
    }
    std::ostringstream os;
    os.precision(17);
    os << "actual " << actual << " differs from expected " << expected << " (rel " << rel
       << ", abs " << abs << ")";
    return ::testing::AssertionFailure() << os.str();
}

} // namespace mctest

#define EXPECT_NEAR_REL(actual, expected, rel) EXPECT_TRUE(::mctest::Near((actual), (expected), (rel)))
#define EXPECT_NEAR_TOL(actual, expected, rel, abs)                                            \
    EXPECT_TRUE(::mctest::Near((actual), (expected), (rel), (abs)))
