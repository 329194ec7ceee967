// The transforms tabulated in the normal score against Boost.Math's quantile of Φ(z) (of the
// complement Φ(−z) for z > 0, exact to the last bits in the upper tail) on a dense grid, extreme
// parameters included; the exact path where the table gives no value; support and determinism.
// The accepted error is the table's 1e-12 relative, or 1e-12 of the absolute scale it is checked
// against (the standard deviation of a Uniform or Triangular input; a Weibull's location).
#include "simulation_evaluation/secgeneration.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <boost/math/distributions.hpp>
#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <ostream>
#include <string>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;

namespace {

namespace bm = boost::math;

//! A Boost distribution's quantile at Φ(z), from the complement for z > 0.
template <class Dist> std::function<double(double)> QuantileOfScore(Dist dist) {
    return [dist](double z) {
        const bm::normal normal;
        return z <= 0.0 ? bm::quantile(dist, bm::cdf(normal, z))
                        : bm::quantile(bm::complement(dist, bm::cdf(normal, -z)));
    };
}

struct TableCase {
    const char* fName;
    DistType fType;
    std::vector<double> fParams;
    std::function<double(double)> fReference; //!< x(z) by Boost
    double fAbsScale;                         //!< stands in for |x| near 0 (0: relative)
};

void PrintTo(const TableCase& row, std::ostream* os) {
    *os << row.fName;
}

class ScoreTable : public ::testing::TestWithParam<TableCase> {};

//! z from −8.5 to 8.5 in steps of 1/1000 (about 8 to 64 points per interval, never on a node).
std::vector<double> DenseScores() {
    std::vector<double> zs;
    for (double z = -8.5; z <= 8.5; z += 1e-3) {
        zs.push_back(z + 1.234e-7);
    }
    return zs;
}

// Values stay inside the support (pieces that interpolate the value itself are clamped), and every
// worker, preparing its own generator, draws the same values bit for bit.
TEST_P(ScoreTable, AgreesWithBoostOnADenseGridInsideTheSupportDeterministically) {
    const TableCase& c = GetParam();
    SECInputGenerator gen, again;
    ASSERT_TRUE(SECPrepareGenerator(c.fType, c.fParams, gen));
    ASSERT_TRUE(SECPrepareGenerator(c.fType, c.fParams, again));
    ASSERT_TRUE(gen.fScoreTable.IsReady());
    int fromTable = 0;
    for (const double z : DenseScores()) {
        const double x = SECTransform(gen, z);
        ASSERT_EQ(x, SECTransform(again, z)) << z;
        ASSERT_TRUE(x >= gen.fLower && (MCMV::IsMissing(gen.fUpper) || x <= gen.fUpper)) << z;
        const double expected = c.fReference(z);
        if (!std::isfinite(expected)) {
            continue;
        }
        // Values within 1e-300 of 0 have underflowed on both sides (Boost's default policy
        // computes in long double and may keep a subnormal that the component rounds to 0).
        const double tol = 1e-12 * std::fmax(std::fabs(expected), c.fAbsScale) + 1e-300;
        const double tabulated = gen.fScoreTable(z);
        if (!std::isnan(tabulated)) {
            ++fromTable;
            ASSERT_TRUE(mctest::Near(tabulated, expected, 0.0, tol)) << "table, z " << z;
        }
        ASSERT_TRUE(mctest::Near(x, expected, 0.0, tol)) << "z " << z;
        // The exact path is the table's reference; it holds the same accuracy.
        ASSERT_TRUE(mctest::Near(SECTransformExact(gen, z), expected, 0.0, tol))
            << "exact, z " << z;
    }
    // The table answers at least for the central 99.99% of the draws (|z| ≤ 3.9).
    EXPECT_GT(fromTable, 7800);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(EveryTabulatedType, ScoreTable, ::testing::Values(
    TableCase{"Uniform", kDistUniform, {-2.0, 3.0}, QuantileOfScore(bm::uniform(-2.0, 3.0)), 5.0 / std::sqrt(12.0)},
    TableCase{"UniformUnit", kDistUniform, {0.0, 1.0}, QuantileOfScore(bm::uniform(0.0, 1.0)), 1.0 / std::sqrt(12.0)},
    TableCase{"UniformNarrow", kDistUniform, {1e6, 1e6 + 1e-3}, QuantileOfScore(bm::uniform(1e6, 1e6 + 1e-3)), 1e-3 / std::sqrt(12.0)},
    TableCase{"Triangular", kDistTriangular, {1.0, 10.0, 4.0}, QuantileOfScore(bm::triangular(1.0, 4.0, 10.0)), bm::standard_deviation(bm::triangular(1.0, 4.0, 10.0))},
    TableCase{"TriangularModeAtMin", kDistTriangular, {0.0, 1.0, 0.0}, QuantileOfScore(bm::triangular(0.0, 0.0, 1.0)), bm::standard_deviation(bm::triangular(0.0, 0.0, 1.0))},
    TableCase{"TriangularModeNearMax", kDistTriangular, {-5.0, 5.0, 4.999}, QuantileOfScore(bm::triangular(-5.0, 4.999, 5.0)), bm::standard_deviation(bm::triangular(-5.0, 4.999, 5.0))},
    TableCase{"Exponential", kDistExponential, {0.5}, QuantileOfScore(bm::exponential(0.5)), 0.0},
    TableCase{"ExponentialSlow", kDistExponential, {1e-4}, QuantileOfScore(bm::exponential(1e-4)), 0.0},
    TableCase{"Weibull", kDistWeibull, {2.0, 1.5, 0.0}, QuantileOfScore(bm::weibull(1.5, 2.0)), 0.0},
    TableCase{"WeibullSmallShape", kDistWeibull, {1.0, 0.2, 0.0}, QuantileOfScore(bm::weibull(0.2, 1.0)), 0.0},
    TableCase{"WeibullLargeShapeShifted", kDistWeibull, {3.0, 20.0, 7.0}, [](double z) { return 7.0 + QuantileOfScore(bm::weibull(20.0, 3.0))(z); }, 7.0},
    TableCase{"Gamma", kDistGamma, {2.0, 0.5}, QuantileOfScore(bm::gamma_distribution<>(2.0, 2.0)), 0.0},
    TableCase{"GammaSmallShape", kDistGamma, {0.3, 2.0}, QuantileOfScore(bm::gamma_distribution<>(0.3, 0.5)), 0.0},
    TableCase{"GammaTinyShape", kDistGamma, {0.01, 1.0}, QuantileOfScore(bm::gamma_distribution<>(0.01, 1.0)), 0.0},
    TableCase{"GammaHugeShape", kDistGamma, {1e4, 3.0}, QuantileOfScore(bm::gamma_distribution<>(1e4, 1.0 / 3.0)), 0.0},
    TableCase{"Beta", kDistBeta, {2.0, 5.0}, QuantileOfScore(bm::beta_distribution<>(2.0, 5.0)), 0.0},
    TableCase{"BetaUShape", kDistBeta, {0.5, 0.4}, QuantileOfScore(bm::beta_distribution<>(0.5, 0.4)), 0.0},
    TableCase{"BetaClosedForm", kDistBeta, {1.0, 3.0}, QuantileOfScore(bm::beta_distribution<>(1.0, 3.0)), 0.0},
    TableCase{"BetaSkewedSmall", kDistBeta, {0.01, 100.0}, QuantileOfScore(bm::beta_distribution<>(0.01, 100.0)), 0.0},
    TableCase{"BetaLargeShapes", kDistBeta, {1e3, 1e4}, QuantileOfScore(bm::beta_distribution<>(1e3, 1e4)), 0.0}),
    [](const ::testing::TestParamInfo<TableCase>& row) { return std::string(row.param.fName); });
// clang-format on

TEST(ScoreTableFallback, TheExactPathAnswersWhereTheTableCannot) {
    // A U-shaped Beta whose upper values round to 1 beyond z ≈ 1 in double precision: the table
    // leaves those intervals out; a Gamma of shape 0.01, whose lower values underflow below
    // 1e-300 for z < −3; every table beyond |z| = 8; Normal and LogNormal, which have none.
    for (const auto& [type, params] : {std::pair{kDistBeta, std::vector<double>{0.05, 0.05}},
                                       {kDistGamma, {0.01, 1.0}},
                                       {kDistGamma, {2.0, 0.5}},
                                       {kDistNormal, {100.0, 15.0}},
                                       {kDistLognormal, {2.0, 0.5}}}) {
        SECInputGenerator gen;
        ASSERT_TRUE(SECPrepareGenerator(type, params, gen));
        int exactOnly = 0;
        for (double z = -9.0; z <= 9.0; z += 0.01) {
            if (std::isnan(gen.fScoreTable(z))) {
                ++exactOnly;
                const double exact = SECTransformExact(gen, z);
                // Bit for bit: the draw is the exact transform itself.
                ASSERT_TRUE(MCMV::IsMissing(exact) ? MCMV::IsMissing(SECTransform(gen, z))
                                                   : SECTransform(gen, z) == exact)
                    << "type " << type << " z " << z;
            }
        }
        EXPECT_GE(exactOnly, 200) << "type " << type; // at least |z| > 8
    }
    SECInputGenerator normal;
    ASSERT_TRUE(SECPrepareGenerator(kDistNormal, {100.0, 15.0}, normal));
    EXPECT_FALSE(normal.fScoreTable.IsReady());
    // An unusable input has no table and draws missing values.
    SECInputGenerator bad;
    EXPECT_FALSE(SECPrepareGenerator(kDistGamma, {0.0, 1.0}, bad));
    EXPECT_FALSE(bad.fScoreTable.IsReady());
    EXPECT_TRUE(MCMV::IsMissing(SECTransform(bad, 0.5)));
}

} // namespace
