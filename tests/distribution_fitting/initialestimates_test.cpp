// Moment and start estimates from given statistics (worked by hand from the moment equations),
// and the values of SIMULATE_DEBUG_OPTIMIZER.
#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/mcmv.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;

namespace {

constexpr double kMissing = MCCommon_800::MCMV::Missing();

//! Statistics with mean m and variances v (divisor W - 1) and s2 (divisor W).
DFCMomentInputs Stats(double m, double v, double s2 = 1.0) {
    return DFCMomentInputs{m, v, s2, 0.5, 9.0, 3.0, 2.5, 0.25};
}

struct EstimateCase {
    const char* name;
    DistType type;
    DFCMomentInputs in;
    bool threeParamWeibull;
    bool exists;
    std::vector<double> expected;
};

class MomentEstimates : public ::testing::TestWithParam<EstimateCase> {};

TEST_P(MomentEstimates, SolveTheMomentEquations) {
    const EstimateCase& c = GetParam();
    std::vector<double> params{99.0}; // replaced, never appended to
    EXPECT_EQ(ComputeMomentEstimate(c.type, c.in, c.threeParamWeibull, params), c.exists);
    ASSERT_EQ(params.size(), c.expected.size());
    for (std::size_t i = 0; i < params.size(); ++i) {
        EXPECT_NEAR_REL(params[i], c.expected[i], 4 * mctest::kEps) << "parameter " << i;
    }
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, MomentEstimates, ::testing::Values(
    // n = floor(2/(1 - 0.8) + 0.5) = 10, prob = 2/10.
    EstimateCase{"Binomial", kDistBinomial, Stats(2.0, 1.6), false, true, {10.0, 0.2}},
    EstimateCase{"BinomialAtLeastOneTrial", kDistBinomial, Stats(0.2, 0.0), false, true, {1, 0.2}},
    EstimateCase{"BinomialNoVariance", kDistBinomial, Stats(2.0, kMissing), false, false, {}},
    // v <= m: r = 1, p = 1/(2 + 1); else r = 9/(6 - 3) = 3, p = 3/(3 + 3).
    EstimateCase{"NegBinUnder", kDistNegbinomial, Stats(2.0, 1.5), false, true, {1, 1.0 / 3, 2}},
    EstimateCase{"NegBinOver", kDistNegbinomial, Stats(3.0, 6.0), false, true, {3.0, 0.5, 2.0}},
    EstimateCase{"LogNormal", kDistLognormal, Stats(3.0, 2.0), false, true, {2.5, 0.5}},
    EstimateCase{"NormalUsesDivisorW", kDistNormal, Stats(3.0, 2.0, 0.25), false, true, {3, 0.5}},
    EstimateCase{"Poisson", kDistPoisson, Stats(3.5, 2.0), false, true, {3.5}},
    EstimateCase{"Triangular", kDistTriangular, Stats(3.0, 2.0), false, true, {0.5, 9.0, 3.0}},
    EstimateCase{"Uniform", kDistUniform, Stats(3.0, 2.0), false, true, {0.5, 9.0}},
    EstimateCase{"Weibull", kDistWeibull, Stats(3.0, 2.0), false, true, {1.0, 1.0, 0.0}},
    EstimateCase{"Weibull3", kDistWeibull, Stats(3.0, 2.0), true, true, {1.0, 1.0, 0.5 - 1e-5}},
    // shape 16/8, rate 4/8.
    EstimateCase{"Gamma", kDistGamma, Stats(4.0, 8.0), false, true, {2.0, 0.5}},
    EstimateCase{"GammaWithoutSpread", kDistGamma, Stats(4.0, 0.0), false, false, {}},
    // t = 0.25/0.05 - 1 = 4: shapes 2 and 2.
    EstimateCase{"Beta", kDistBeta, Stats(0.5, 0.05), false, true, {2.0, 2.0}},
    EstimateCase{"BetaNoVariance", kDistBeta, Stats(0.5, kMissing), false, false, {}},
    EstimateCase{"Exponential", kDistExponential, Stats(4.0, 2.0), false, true, {0.25}},
    EstimateCase{"CategoricalHasNone", kDistCategorical, Stats(4.0, 2.0), false, false, {}},
    EstimateCase{"EmpiricalIsNoCandidate", kDistEmpirical, Stats(4.0, 2.0), false, false, {}}),
    [](const ::testing::TestParamInfo<EstimateCase>& param) { return param.param.name; });
// clang-format on

struct SwitchCase {
    const char* name;
    const char* value;
    bool debugOptimizer;
    bool threeParamWeibull;
};

class DebugOptimizerValues : public ::testing::TestWithParam<SwitchCase> {};

TEST_P(DebugOptimizerValues, OnlyExactOneAndTwoSwitchOn) {
    const SwitchCase& c = GetParam();
    const DFCDebugOptimizerSwitches switches = ParseDebugOptimizerValue(c.value);
    EXPECT_EQ(switches.fbDebugOptimizer, c.debugOptimizer);
    EXPECT_EQ(switches.fbThreeParamWeibull, c.threeParamWeibull);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, DebugOptimizerValues, ::testing::Values(
    SwitchCase{"Unset", nullptr, false, false}, SwitchCase{"One", "1", true, true},
    SwitchCase{"Two", "2", true, false}, SwitchCase{"Twelve", "12", false, false},
    SwitchCase{"Empty", "", false, false}, SwitchCase{"Padded", " 1", false, false},
    SwitchCase{"Zero", "0", false, false}),
    [](const ::testing::TestParamInfo<SwitchCase>& param) { return param.param.name; });
// clang-format on

} // namespace
