// The quantiles in the normal score: the upper-tail complements of the prepared Gamma and Beta
// quantiles against Boost, and MCNormalScoreTable on functions whose values and derivatives
// are known in closed form (its accuracy, kinks, gaps, range and clamping).
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
using MCMath_800::MCNormalScoreTable;

namespace {

using Point = MCNormalScoreTable::Point;
using Scale = MCNormalScoreTable::Scale;

//! Upper-tail probabilities from 1e-300 to 1 − 1e-12, evenly in ln(q/(1 − q)).
std::vector<double> UpperProbabilities() {
    std::vector<double> qs{1e-300, 1e-200, 1e-100, 1e-40};
    for (double s = -27.6; s <= 27.6; s += 0.137) {
        qs.push_back(1.0 / (1.0 + std::exp(-s)));
    }
    return qs;
}

// Complement(q) is the quantile at 1 − q computed from q itself: Boost's quantile of the
// complement, with q's relative accuracy kept (1e-12 relative, as the prepared quantiles).
TEST(Complement, GammaAndBetaAgreeWithBoostsUpperTailInverse) {
    for (const double shape : {0.01, 0.3, 2.0, 17.0, 1e4}) {
        const MCGammaQuantile q(shape, 0.5);
        const boost::math::gamma_distribution<double, MCMathPolicy> dist(shape, 2.0);
        for (const double upper : UpperProbabilities()) {
            const double expected = boost::math::quantile(boost::math::complement(dist, upper));
            if (std::isfinite(expected)) {
                EXPECT_NEAR_TOL(q.Complement(upper), expected, 1e-12, 1e-300)
                    << "shape " << shape << " q " << upper;
            }
        }
    }
    for (const auto& [a, b] : {std::pair{2.0, 5.0}, {0.5, 0.4}, {50.0, 80.0}, {1.0, 3.0}}) {
        const MCBetaQuantile q(a, b);
        const boost::math::beta_distribution<double, MCMathPolicy> dist(a, b);
        for (const double upper : UpperProbabilities()) {
            if (upper < 1e-150) {
                continue; // Boost's own inverse throws there (next test)
            }
            const double expected = boost::math::quantile(boost::math::complement(dist, upper));
            EXPECT_NEAR_TOL(q.Complement(upper), expected, 1e-12, 4.0 * mctest::kEps)
                << "a " << a << " b " << b << " q " << upper;
        }
    }
}

TEST(Complement, AFailingBoostInverseGivesMissingNotAnException) {
    // Boost 1.74's ibetac_inv(2, 5, 1e-300) throws an evaluation error whatever the policy.
    const MCBetaQuantile beta(2.0, 5.0);
    double x = 0.0;
    EXPECT_NO_THROW(x = beta.Complement(1e-300));
    EXPECT_TRUE(MCMV::IsMissing(x) || (x >= 0.0 && x <= 1.0)) << x;
}

TEST(Complement, EdgesAndInvalidObjects) {
    const MCGammaQuantile gamma(2.0, 3.0);
    const MCBetaQuantile beta(2.0, 3.0);
    EXPECT_EQ(gamma.Complement(1.0), 0.0);
    EXPECT_TRUE(MCMV::IsMissing(gamma.Complement(0.0))); // the upper end is infinite
    EXPECT_EQ(beta.Complement(1.0), 0.0);
    EXPECT_EQ(beta.Complement(0.0), 1.0);
    for (const double bad : {MCMV::Missing(), -0.25, 1.5}) {
        EXPECT_TRUE(MCMV::IsMissing(gamma.Complement(bad)) &&
                    MCMV::IsMissing(beta.Complement(bad)));
    }
    EXPECT_TRUE(MCMV::IsMissing(MCGammaQuantile().Complement(0.5)) &&
                MCMV::IsMissing(MCBetaQuantile().Complement(0.5)));
}

// ---- MCNormalScoreTable ----------------------------------------------------------------------

//! φ(z).
double Density(double z) {
    constexpr double kSqrtTwoPi = 2.5066282746310005024;
    return std::exp(-0.5 * z * z) / kSqrtTwoPi;
}

//! g(z) = Φ(z) on the linear scale: y' = φ, y'' = −zφ.
bool PhiPoint(double z, int, Point& p) {
    p.fX = MCMath_800::MCDistFun::CdfStdNorm(z);
    p.fY = p.fX;
    p.fDy = Density(z);
    p.fD2y = -z * p.fDy;
    return true;
}

//! g(z) = e^(z + z²/8) on the log scale: y = z + z²/8, y' = 1 + z/4, y'' = 1/4.
bool LogPoint(double z, int, Point& p) {
    p.fY = z + z * z / 8.0;
    p.fX = std::exp(p.fY);
    p.fDy = 1.0 + z / 4.0;
    p.fD2y = 0.25;
    return true;
}

TEST(MCNormalScoreTable, ReproducesKnownFunctionsWithinItsTolerance) {
    MCNormalScoreTable phi;
    MCNormalScoreTable::Setup linear;
    linear.fAbsScale = 0.25;
    ASSERT_TRUE(phi.Build(linear, PhiPoint));
    MCNormalScoreTable exp;
    MCNormalScoreTable::Setup log;
    log.fScale = Scale::kLog;
    ASSERT_TRUE(exp.Build(log, LogPoint));
    for (const MCNormalScoreTable* t : {&phi, &exp}) {
        EXPECT_EQ(t->GetNUsable(), t->GetNIntervals());
        EXPECT_LE(t->GetWorstMidpointError(), 0.5);
        EXPECT_LE(t->GetZMin(), -MCNormalScoreTable::kZMax);
        EXPECT_GE(t->GetZMax(), MCNormalScoreTable::kZMax);
    }
    // Seven points per interval of the finest grid, off the nodes.
    Point p;
    for (double z = -8.0; z < 8.0; z += 1.0 / 896.0 + 1e-9) {
        ASSERT_TRUE(PhiPoint(z, 0, p));
        ASSERT_TRUE(mctest::Near(phi(z), p.fX, 0.0, 1e-12 * std::fmax(p.fX, 0.25))) << z;
        ASSERT_TRUE(LogPoint(z, 0, p));
        ASSERT_TRUE(mctest::Near(exp(z), p.fX, 1e-12)) << z;
    }
}

//! |z| plus a smooth part: a kink at z = 0.3 that only a node there can follow, and a value
//! that is 0 at the kink (so the check is absolute near it).
bool KinkPoint(double z, int side, Point& p) {
    const bool left = side != 0 ? side < 0 : z < 0.3;
    const double sign = left ? -1.0 : 1.0;
    p.fX = sign * (z - 0.3) + 0.1 * std::sin(z);
    p.fY = p.fX;
    p.fDy = sign + 0.1 * std::cos(z);
    p.fD2y = -0.1 * std::sin(z);
    return true;
}

TEST(MCNormalScoreTable, AKinkBecomesANodeWithOneSidedPieces) {
    MCNormalScoreTable table;
    MCNormalScoreTable::Setup setup;
    setup.fAbsScale = 1.0;
    setup.fKink = 0.3;
    ASSERT_TRUE(table.Build(setup, KinkPoint));
    EXPECT_EQ(table.GetNUsable(), table.GetNIntervals());
    EXPECT_EQ(table.GetStep(), MCNormalScoreTable::kFirstStep); // no refinement was needed
    Point p;
    for (double z = 0.3 - 0.2; z < 0.3 + 0.2; z += 1e-3) {
        ASSERT_TRUE(KinkPoint(z, 0, p));
        EXPECT_NEAR_TOL(table(z), p.fX, 0.0, 1e-12) << z;
    }
    // Without the kink the interval around it fails at every step and is left out.
    MCNormalScoreTable blind;
    setup.fKink = std::numeric_limits<double>::quiet_NaN();
    ASSERT_TRUE(blind.Build(setup, KinkPoint));
    EXPECT_EQ(blind.GetStep(), MCNormalScoreTable::kFinestStep);
    EXPECT_LT(blind.GetNUsable(), blind.GetNIntervals());
    EXPECT_TRUE(std::isnan(blind(0.3)));
}

TEST(MCNormalScoreTable, GapsRangeAndEmptyTablesGiveNaN) {
    // A point function that fails below z = −2 (an underflowed tail, say).
    const auto gap = [](double z, int side, Point& p) { return z >= -2.0 && LogPoint(z, side, p); };
    MCNormalScoreTable table;
    MCNormalScoreTable::Setup log;
    log.fScale = Scale::kLog;
    ASSERT_TRUE(table.Build(log, gap));
    EXPECT_TRUE(std::isnan(table(-2.01)));
    EXPECT_FALSE(std::isnan(table(-1.99)));
    for (const double z : {-9.0, 8.5, MCMV::Missing(), std::numeric_limits<double>::infinity()}) {
        EXPECT_TRUE(std::isnan(table(z))) << z;
    }
    MCNormalScoreTable empty;
    EXPECT_FALSE(empty.IsReady());
    EXPECT_TRUE(std::isnan(empty(0.0)));
    const auto never = [](double, int, Point&) { return false; };
    EXPECT_FALSE(table.Build(log, never));
    EXPECT_FALSE(table.IsReady());
    EXPECT_TRUE(std::isnan(table(0.0)));
}

TEST(MCNormalScoreTable, PiecesInXStayInsideTheSupport) {
    // Φ(z) on [0, 1] with an absolute scale of 1: near the ends the interpolation error, though
    // below 1e-12, could step outside [0, 1]; the clamp keeps every value inside.
    MCNormalScoreTable phi;
    MCNormalScoreTable::Setup setup;
    setup.fAbsScale = 1.0;
    setup.fLower = 0.0;
    setup.fUpper = 1.0;
    ASSERT_TRUE(phi.Build(setup, PhiPoint));
    for (double z = -8.0; z < 8.0; z += 0.001) {
        const double x = phi(z);
        ASSERT_TRUE(x >= 0.0 && x <= 1.0) << z;
    }
}

TEST(MCNormalScoreTable, BuildsAreDeterministic) {
    MCNormalScoreTable a;
    MCNormalScoreTable b;
    MCNormalScoreTable::Setup log;
    log.fScale = Scale::kLog;
    ASSERT_TRUE(a.Build(log, LogPoint) && b.Build(log, LogPoint));
    const MCNormalScoreTable copy = a;
    for (double z = -8.0; z < 8.0; z += 0.01) {
        ASSERT_EQ(a(z), b(z));
        ASSERT_EQ(copy(z), a(z));
    }
}

} // namespace
