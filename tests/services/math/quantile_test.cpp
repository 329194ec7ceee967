#include "mcmath/mcdistfun.h"
#include "mcmath/mcquantile.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <boost/math/distributions/beta.hpp>
#include <boost/math/distributions/gamma.hpp>

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <utility>
#include <vector>

using MCCommon_800::MCMV;
using MCMath_800::MCBetaQuantile;
using MCMath_800::MCGammaQuantile;
using MCMath_800::MCMathPolicy;
using MCMath_800::MCNormalQuantile;

namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
//! The stated accuracy of the prepared quantiles against Boost's inverse.
constexpr double kRel = 1e-12;

//! Probabilities from 1e-12 to 1 − 1e-12, evenly in s = ln(p/(1 − p)) and off the table's
//! nodes, so the interpolation, the fallback beyond |s| = 23 and both halves are all met; and
//! far tails. Each p is also the upper-tail q of Complement(q), the quantile at 1 − q computed
//! from q itself (Boost's quantile of the complement, with q's relative accuracy kept).
std::vector<double> Probabilities() {
    std::vector<double> ps{1e-200, 1e-100, 1e-40};
    for (double s = -27.6; s <= 27.6; s += 0.0917) {
        ps.push_back(1.0 / (1.0 + std::exp(-s)));
    }
    for (const double p : {1e-300, 0.5, std::nextafter(0.5, 1.0), std::nextafter(1.0, 0.0)}) {
        ps.push_back(p);
    }
    return ps;
}

class GammaQuantileVsBoost : public ::testing::TestWithParam<double> {};

TEST_P(GammaQuantileVsBoost, AgreesAcrossProbabilities) {
    const double shape = GetParam();
    for (const double rate : {0.25, 0.5, 1.0, 7.5}) {
        const MCGammaQuantile q(shape, rate);
        const boost::math::gamma_distribution<double, MCMathPolicy> dist(shape, 1.0 / rate);
        for (const double p : Probabilities()) {
            const double expected = boost::math::quantile(dist, p);
            if (std::isfinite(expected)) {
                EXPECT_NEAR_TOL(q(p), expected, kRel, 1e-300)
                    << "shape " << shape << " rate " << rate << " p " << p;
            }
            const double upper = boost::math::quantile(boost::math::complement(dist, p));
            if (std::isfinite(upper)) {
                EXPECT_NEAR_TOL(q.Complement(p), upper, kRel, 1e-300)
                    << "complement, shape " << shape << " rate " << rate << " q " << p;
            }
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Shapes, GammaQuantileVsBoost,
                         ::testing::Values(0.01, 0.05, 0.3, 0.9, 1.0, 2.0, 2.5, 17.0, 300.0, 1e4));

class BetaQuantileVsBoost : public ::testing::TestWithParam<std::pair<double, double>> {};

TEST_P(BetaQuantileVsBoost, AgreesAcrossProbabilities) {
    const auto [a, b] = GetParam();
    const MCBetaQuantile q(a, b);
    const boost::math::beta_distribution<double, MCMathPolicy> dist(a, b);
    for (const double p : Probabilities()) {
        const double expected = boost::math::quantile(dist, p);
        // Relative to the nearer end of the support; a few ulp where 1 − x is that small.
        const double tol =
            kRel * std::fmin(expected, 1.0 - expected) + 4.0 * mctest::kEps * expected;
        EXPECT_NEAR_TOL(q(p), expected, 0.0, tol) << "a " << a << " b " << b << " p " << p;
        if (p >= 1e-150) { // below, Boost's own inverse throws (see the edges)
            EXPECT_NEAR_TOL(q.Complement(p),
                            boost::math::quantile(boost::math::complement(dist, p)), kRel,
                            4.0 * mctest::kEps)
                << "complement, a " << a << " b " << b << " q " << p;
        }
    }
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Shapes, BetaQuantileVsBoost, ::testing::Values(
    std::make_pair(0.05, 0.05), std::make_pair(0.1, 3.0), std::make_pair(0.5, 0.7),
    std::make_pair(2.0, 5.0), std::make_pair(3.0, 0.2), std::make_pair(50.0, 80.0),
    std::make_pair(1e3, 1e4), std::make_pair(0.01, 100.0), std::make_pair(1.0, 3.0),
    std::make_pair(0.5, 0.5), std::make_pair(0.5, 0.4)));
// clang-format on

TEST(PreparedQuantiles, EdgesAndInvalidParameters) {
    const MCGammaQuantile gamma(2.0, 3.0);
    const MCBetaQuantile beta(2.0, 3.0);
    const MCNormalQuantile normal(1.0, 2.0);
    EXPECT_TRUE(gamma.Complement(1.0) == 0.0 && beta.Complement(1.0) == 0.0);
    EXPECT_TRUE(MCMV::IsMissing(gamma.Complement(0.0))); // the upper end is infinite
    EXPECT_EQ(beta.Complement(0.0), 1.0);
    // Boost 1.74's ibetac_inv(2, 5, 1e-300) throws an evaluation error whatever the policy.
    double x = 0.0;
    EXPECT_NO_THROW(x = MCBetaQuantile(2.0, 5.0).Complement(1e-300));
    EXPECT_TRUE(MCMV::IsMissing(x) || (x >= 0.0 && x <= 1.0)) << x;
    EXPECT_TRUE(gamma(0.0) == 0.0 && beta(0.0) == 0.0 && beta(1.0) == 1.0 && normal(0.5) == 1.0);
    EXPECT_TRUE(MCMV::IsMissing(gamma(1.0)) && MCMV::IsMissing(normal(0.0)) &&
                MCMV::IsMissing(normal(1.0)));
    for (const double bad : {kNaN, -0.25, 1.5}) {
        EXPECT_TRUE(MCMV::IsMissing(gamma(bad)) && MCMV::IsMissing(beta(bad)) &&
                    MCMV::IsMissing(normal(bad)) && MCMV::IsMissing(gamma.Complement(bad)) &&
                    MCMV::IsMissing(beta.Complement(bad)))
            << bad;
    }
    // Invalid parameters (and the default objects) give missing for every p.
    const double inf = std::numeric_limits<double>::infinity();
    for (const auto& [first, second] : std::vector<std::pair<double, double>>{
             {0.0, 1.0}, {-1.0, 1.0}, {1.0, 0.0}, {kNaN, 1.0}, {1.0, inf}}) {
        EXPECT_FALSE(MCGammaQuantile(first, second).IsValid() ||
                     MCBetaQuantile(first, second).IsValid());
        for (const double p : {0.0, 0.3, 1.0}) {
            EXPECT_TRUE(MCMV::IsMissing(MCGammaQuantile(first, second)(p)) &&
                        MCMV::IsMissing(MCBetaQuantile(first, second)(p)));
        }
    }
    EXPECT_FALSE(MCNormalQuantile(0.0, 0.0).IsValid());
    EXPECT_TRUE(MCMV::IsMissing(MCGammaQuantile()(0.5)) && MCMV::IsMissing(MCBetaQuantile()(0.5)) &&
                MCMV::IsMissing(MCNormalQuantile()(0.5)) &&
                MCMV::IsMissing(MCGammaQuantile().Complement(0.5)) &&
                MCMV::IsMissing(MCBetaQuantile().Complement(0.5)));
}

} // namespace
