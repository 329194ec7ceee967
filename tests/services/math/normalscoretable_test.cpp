// MCNormalScoreTable on functions whose values and derivatives are known in closed form: its
// accuracy, kinks, gaps, range and clamping.
#include "mcmath/mcdistfun.h"
#include "mcmath/mcquantile.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <vector>

using MCCommon_800::MCMV;
using MCMath_800::MCNormalScoreTable;

namespace {

constexpr double kInf = std::numeric_limits<double>::infinity();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
using Point = MCNormalScoreTable::Point;
using Scale = MCNormalScoreTable::Scale;

//! φ(z).
double Density(double z) {
    return std::exp(-0.5 * z * z) / 2.5066282746310005024;
}

//! g(z) = Φ(z) on the linear scale: y' = φ, y'' = −zφ.
bool PhiPoint(double z, int, Point& p) {
    p.fX = p.fY = MCMath_800::MCDistFun::CdfStdNorm(z);
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

//! |z − 0.3| plus a smooth part: a kink that only a node there can follow, and a value that is
//! 0 at the kink (so the check is absolute near it).
bool KinkPoint(double z, int side, Point& p) {
    const double sign = (side != 0 ? side < 0 : z < 0.3) ? -1.0 : 1.0;
    p.fX = p.fY = sign * (z - 0.3) + 0.1 * std::sin(z);
    p.fDy = sign + 0.1 * std::cos(z);
    p.fD2y = -0.1 * std::sin(z);
    return true;
}

MCNormalScoreTable::Setup MakeSetup(Scale scale, double absScale, double lower = -kInf,
                                    double upper = kInf, double kink = kNaN) {
    MCNormalScoreTable::Setup setup;
    setup.fScale = scale;
    setup.fAbsScale = absScale;
    setup.fLower = lower;
    setup.fUpper = upper;
    setup.fKink = kink;
    return setup;
}

TEST(MCNormalScoreTable, ReproducesKnownFunctionsWithinItsToleranceDeterministically) {
    MCNormalScoreTable phi, exp, again;
    ASSERT_TRUE(phi.Build(MakeSetup(Scale::kLinear, 0.25), PhiPoint));
    ASSERT_TRUE(exp.Build(MakeSetup(Scale::kLog, 0.0), LogPoint));
    ASSERT_TRUE(again.Build(MakeSetup(Scale::kLog, 0.0), LogPoint));
    const MCNormalScoreTable copy = exp;
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
        // Builds and copies are deterministic: every worker draws the same values.
        ASSERT_TRUE(again(z) == exp(z) && copy(z) == exp(z)) << z;
    }
}

TEST(MCNormalScoreTable, AKinkBecomesANodeWithOneSidedPieces) {
    MCNormalScoreTable table, blind;
    ASSERT_TRUE(table.Build(MakeSetup(Scale::kLinear, 1.0, -kInf, kInf, 0.3), KinkPoint));
    EXPECT_EQ(table.GetNUsable(), table.GetNIntervals());
    EXPECT_EQ(table.GetStep(), MCNormalScoreTable::kFirstStep); // no refinement was needed
    Point p;
    for (double z = 0.3 - 0.2; z < 0.3 + 0.2; z += 1e-3) {
        ASSERT_TRUE(KinkPoint(z, 0, p));
        EXPECT_NEAR_TOL(table(z), p.fX, 0.0, 1e-12) << z;
    }
    // Without the kink the interval around it fails at every step and is left out.
    ASSERT_TRUE(blind.Build(MakeSetup(Scale::kLinear, 1.0), KinkPoint));
    EXPECT_EQ(blind.GetStep(), MCNormalScoreTable::kFinestStep);
    EXPECT_LT(blind.GetNUsable(), blind.GetNIntervals());
    EXPECT_TRUE(std::isnan(blind(0.3)));
}

TEST(MCNormalScoreTable, GapsRangeAndEmptyTablesGiveNaN) {
    // A point function that fails below z = −2 (an underflowed tail, say).
    const auto gap = [](double z, int side, Point& p) { return z >= -2.0 && LogPoint(z, side, p); };
    MCNormalScoreTable table, empty;
    ASSERT_TRUE(table.Build(MakeSetup(Scale::kLog, 0.0), gap));
    EXPECT_TRUE(std::isnan(table(-2.01)));
    EXPECT_FALSE(std::isnan(table(-1.99)));
    for (const double z : {-9.0, 8.5, MCMV::Missing(), kInf}) {
        EXPECT_TRUE(std::isnan(table(z))) << z;
    }
    EXPECT_FALSE(empty.IsReady());
    EXPECT_TRUE(std::isnan(empty(0.0)));
    EXPECT_FALSE(
        table.Build(MakeSetup(Scale::kLog, 0.0), [](double, int, Point&) { return false; }));
    EXPECT_FALSE(table.IsReady());
    EXPECT_TRUE(std::isnan(table(0.0)));
}

TEST(MCNormalScoreTable, PiecesInXStayInsideTheSupport) {
    // Φ on [0, 1] with an absolute scale of 1: near the ends the interpolation error, though
    // below 1e-12, could step outside [0, 1]; the clamp keeps every value inside.
    MCNormalScoreTable phi;
    ASSERT_TRUE(phi.Build(MakeSetup(Scale::kLinear, 1.0, 0.0, 1.0), PhiPoint));
    for (double z = -8.0; z < 8.0; z += 0.001) {
        const double x = phi(z);
        ASSERT_TRUE(x >= 0.0 && x <= 1.0) << z;
    }
}

} // namespace
