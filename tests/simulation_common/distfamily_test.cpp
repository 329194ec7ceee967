// The family table, row by row: the quantile inverts the distribution function (and its
// complement the upper tail), the density integrates to the distribution function, and the
// mean and variance agree with the integrals of the quantile function. Integrals by Boost's
// tanh-sinh and Gauss-Kronrod rules, which owe nothing to the table's own formulas.
#include "simulation_common/mcspdistfamily.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <boost/math/quadrature/gauss_kronrod.hpp>
#include <boost/math/quadrature/tanh_sinh.hpp>
#include <gtest/gtest.h>

#include <cmath>
#include <ostream>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;

namespace {

struct FamilyCase {
    const char* fName;
    DistType fType;
    std::vector<double> fParams;
    friend std::ostream& operator<<(std::ostream& os, const FamilyCase& c) { return os << c.fName; }
};

class FamilyRow : public ::testing::TestWithParam<FamilyCase> {
protected:
    const MCSPDistFamily& Family() const { return *MCSPFindDistFamily(GetParam().fType); }
    const double* P() const { return GetParam().fParams.data(); }
};

TEST_P(FamilyRow, QuantileInvertsTheDistributionFunctionInBothTails) {
    const MCSPDistFamily& f = Family();
    ASSERT_TRUE(f.IsValid(GetParam().fParams));
    for (const double u : {1e-10, 0.01, 0.3, 0.5, 0.7, 0.99}) {
        const double x = f.fQuantile(P(), u);
        const double xc = f.fQuantileComplement(P(), u); // the upper u-quantile
        if (f.fbDiscrete) {
            // The smallest k with F(k) ≥ u; and with 1 − F(k) ≤ q for the complement.
            EXPECT_GE(f.fCdf(P(), x), u) << u;
            EXPECT_LT(f.fCdf(P(), x - 1.0), u) << u;
            EXPECT_LE(f.fCcdf(P(), xc), u) << u;
            EXPECT_GT(f.fCcdf(P(), xc - 1.0), u) << u;
        } else {
            // x holds u only to its own rounding: a + u·(b − a) keeps 1e-16·|a| of it.
            EXPECT_NEAR_TOL(f.fCdf(P(), x), u, 1e-9, 1e-15) << u;
            EXPECT_NEAR_TOL(f.fCcdf(P(), xc), u, 1e-9, 1e-15) << u;
        }
        EXPECT_NEAR_TOL(f.fCdf(P(), x) + f.fCcdf(P(), x), 1.0, 1e-14, 0.0);
    }
}

TEST_P(FamilyRow, DensityIntegratesToTheDistributionFunction) {
    const MCSPDistFamily& f = Family();
    const double lo = f.fQuantile(P(), 0.05);
    const double hi = f.fQuantile(P(), 0.95);
    double mass = 0.0;
    if (f.fbDiscrete) {
        for (double k = lo; k <= hi; k += 1.0) {
            mass += std::exp(f.fLogDensity(P(), k));
        }
        EXPECT_NEAR_REL(mass, f.fCdf(P(), hi) - f.fCdf(P(), lo - 1.0), 1e-12);
    } else {
        mass = boost::math::quadrature::gauss_kronrod<double, 61>::integrate(
            [&](double x) { return std::exp(f.fLogDensity(P(), x)); }, lo, hi, 15, 1e-13);
        EXPECT_NEAR_REL(mass, 0.9, 1e-9);
    }
    double lower = 0.0;
    double upper = 0.0;
    f.fSupport(P(), lower, upper);
    if (!MCMV::IsMissing(lower)) {
        EXPECT_EQ(f.fLogDensity(P(), lower - 1.0), -HUGE_VAL);
        EXPECT_EQ(f.fCdf(P(), lower - 1.0), 0.0);
    }
    if (!MCMV::IsMissing(upper)) {
        EXPECT_EQ(f.fLogDensity(P(), upper + 1.0), -HUGE_VAL);
        EXPECT_EQ(f.fCcdf(P(), upper), 0.0);
    }
}

TEST_P(FamilyRow, MomentsAreTheIntegralsOfTheQuantile) {
    // E X = ∫₀¹ Q(u) du and E X² likewise; a count's moments as sums over its support.
    const MCSPDistFamily& f = Family();
    double m1 = 0.0;
    double m2 = 0.0;
    if (f.fbDiscrete) {
        const double last = f.fQuantileComplement(P(), 1e-18);
        for (double k = f.fQuantile(P(), 1e-300); k <= last; k += 1.0) {
            const double pk = std::exp(f.fLogDensity(P(), k));
            m1 += k * pk;
            m2 += k * k * pk;
        }
    } else {
        boost::math::quadrature::tanh_sinh<double> rule;
        const auto q = [&](double u) {
            return u < 0.5 ? f.fQuantile(P(), u) : f.fQuantileComplement(P(), 1.0 - u);
        };
        m1 = rule.integrate(q, 0.0, 1.0, 1e-12);
        m2 = rule.integrate([&](double u) { return q(u) * q(u); }, 0.0, 1.0, 1e-12);
    }
    const double mean = f.fMean(P());
    EXPECT_NEAR_TOL(m1, mean, 1e-8, 1e-12);
    EXPECT_NEAR_REL(m2 - m1 * m1, f.fVariance(P()), 1e-7);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(EveryFamily, FamilyRow, ::testing::Values(
    FamilyCase{"Binomial", kDistBinomial, {25.0, 0.96}},
    FamilyCase{"NegBinFailures", kDistNegbinomial, {3.0, 0.1, 0.0}},
    FamilyCase{"NegBinTrials", kDistNegbinomial, {2.5, 0.3, 1.0}},
    FamilyCase{"Poisson", kDistPoisson, {33.0}},
    FamilyCase{"Bernoulli", kDistBernoulli, {0.3}},
    FamilyCase{"LogNormal", kDistLognormal, {2.0, 0.5}},
    FamilyCase{"Normal", kDistNormal, {-3.0, 2.0}},
    FamilyCase{"Triangular", kDistTriangular, {0.0, 1.0, 0.2}},
    FamilyCase{"Uniform", kDistUniform, {-2.0, 3.0}},
    FamilyCase{"WeibullLocated", kDistWeibull, {2.0, 1.5, 1.0}},
    FamilyCase{"Gamma", kDistGamma, {2.0, 0.5}},
    FamilyCase{"Beta", kDistBeta, {2.0, 5.0}},
    FamilyCase{"Exponential", kDistExponential, {0.5}}),
    [](const auto& row) { return std::string(row.param.fName); });
// clang-format on

TEST(FamilyTable, CountQuantilesStayExactInExtremeTails) {
    // Boost's root of the continuous extension drifts far off here (a Binomial's upper tail
    // beyond 1e-17, a Poisson of mean 1e15 below 1e-200); the answer must still be the smallest
    // k with F(k) ≥ u, or with 1 − F(k) ≤ q for the complement.
    for (const auto& [type, params] : {std::pair{kDistBinomial, std::vector<double>{4e6, 0.25}},
                                       {kDistPoisson, std::vector<double>{1e15}},
                                       {kDistNegbinomial, {0.02, 0.002, 0.0}}}) {
        const MCSPDistFamily& f = *MCSPFindDistFamily(type);
        const double* p = params.data();
        for (const double t : {1e-17, 1e-100, 1e-230}) {
            const double k = f.fQuantile(p, t);
            EXPECT_TRUE(f.fCdf(p, k) >= t && !(f.fCdf(p, k - 1.0) >= t)) << type << " " << t;
            const double kc = f.fQuantileComplement(p, t);
            EXPECT_TRUE(f.fCcdf(p, kc) <= t && !(f.fCcdf(p, kc - 1.0) <= t)) << type << " " << t;
        }
    }
}

TEST(FamilyTable, TablesOfProbabilitiesHaveNoRow) {
    for (const DistType t : {kDistCategorical, kDistEmpirical, kDistUserRanges, kDistUnknown}) {
        EXPECT_EQ(MCSPFindDistFamily(t), nullptr) << t;
    }
    EXPECT_EQ(MCSPFindDistFamily(static_cast<DistType>(-1)), nullptr);
}

} // namespace
