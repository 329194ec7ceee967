// Percentiles of the quantile summary against the exact order statistics of the same values:
// the rank error, measured as the distance from q to [F_n(x̂−), F_n(x̂)], stays within
// max(1e-4, 0.1·√(q(1 − q)/n)) from the 0.1 % to the 99.9 % point, on skewed, heavy-tailed,
// discrete and point-mass values, built in two parts and merged as two workers would be.
#include "simulation_evaluation/secquantiles.h"

#include <gtest/gtest.h>

#include <boost/random/lognormal_distribution.hpp>
#include <boost/random/mersenne_twister.hpp>
#include <boost/random/poisson_distribution.hpp>
#include <boost/random/student_t_distribution.hpp>
#include <boost/random/uniform_01.hpp>

#include <algorithm>
#include <cmath>
#include <functional>

using MCMCSP_800::SECQuantileSummary;

namespace {

struct Values {
    const char* fName;
    std::function<double(boost::random::mt19937&)> fDraw;
};

const Values kValues[] = {
    {"LogNormalSkewed",
     [](boost::random::mt19937& g) {
         return boost::random::lognormal_distribution<>(0.0, 1.5)(g);
     }},
    {"StudentT1HeavyTails",
     [](boost::random::mt19937& g) { return boost::random::student_t_distribution<>(1.0)(g); }},
    {"PoissonDiscrete",
     [](boost::random::mt19937& g) {
         return static_cast<double>(boost::random::poisson_distribution<>(3.0)(g));
     }},
    {"PointMassAndUniform",
     [](boost::random::mt19937& g) {
         const double u = boost::random::uniform_01<>()(g);
         return u < 0.3 ? 0.0 : u;
     }},
};

class QuantileSummaryRanks : public ::testing::TestWithParam<Values> {};

TEST_P(QuantileSummaryRanks, WithinTheRankErrorOfExactOrderStatistics) {
    for (const std::size_t n : {std::size_t{50000}, std::size_t{1000000}}) {
        boost::random::mt19937 gen(20261207u);
        SECQuantileSummary first(1u);
        SECQuantileSummary second(2u);
        std::vector<double> all(n);
        for (std::size_t i = 0; i < n; ++i) {
            all[i] = GetParam().fDraw(gen);
            (i % 3 == 0 ? first : second).Add(all[i]);
        }
        first.Merge(second);
        ASSERT_EQ(first.GetCount(), static_cast<std::int64_t>(n));
        EXPECT_EQ(first.IsExact(), n <= SECQuantileSummary::kExactValues);
        EXPECT_LE(first.GetKept() * sizeof(double), std::size_t{1} << 20) << n; // flat in n
        std::sort(all.begin(), all.end());
        const double dn = static_cast<double>(n);
        for (const double q : {0.001, 0.01, 0.05, 0.25, 0.5, 0.75, 0.95, 0.99, 0.999}) {
            const double x = first.Quantile(q);
            const double below =
                static_cast<double>(std::lower_bound(all.begin(), all.end(), x) - all.begin()) / dn;
            const double atOrBelow =
                static_cast<double>(std::upper_bound(all.begin(), all.end(), x) - all.begin()) / dn;
            const double error = q < below ? below - q : (q > atOrBelow ? q - atOrBelow : 0.0);
            EXPECT_LE(error, std::max(1e-4, 0.1 * std::sqrt(q * (1.0 - q) / dn)))
                << GetParam().fName << " n " << n << " q " << q;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Targets, QuantileSummaryRanks, ::testing::ValuesIn(kValues),
                         [](const auto& p) { return std::string(p.param.fName); });

TEST(QuantileSummary, OrderStatisticIntervalsAndUnreachableEnds) {
    // 1..100: the median's 95% interval is [X(40), X(61)] (P(B ≤ 39) = 0.018, P(B ≤ 40) =
    // 0.028 for B ~ Binomial(100, 1/2)); for n = 10 and q = 0.01 no rank is low enough for
    // the lower end, and the upper end is X(2) (P(B ≥ 2) = 0.0043 ≤ 0.025 < P(B ≥ 1)).
    SECQuantileSummary hundred;
    for (int i = 100; i >= 1; --i) {
        hundred.Add(i);
    }
    double lower = 0.0;
    double upper = 0.0;
    EXPECT_EQ(hundred.Quantile(0.5), 50.0);
    EXPECT_EQ(hundred.Quantile(0.01), 1.0);
    EXPECT_EQ(hundred.Quantile(1.0), 100.0);
    hundred.QuantileInterval(0.5, 0.95, lower, upper);
    EXPECT_EQ(lower, 40.0);
    EXPECT_EQ(upper, 61.0);

    SECQuantileSummary ten;
    for (int i = 1; i <= 10; ++i) {
        ten.Add(i);
    }
    ten.Add(std::nan(""));
    EXPECT_EQ(ten.GetCount(), 10);
    ten.QuantileInterval(0.01, 0.95, lower, upper);
    EXPECT_TRUE(std::isnan(lower));
    EXPECT_EQ(upper, 2.0);
    EXPECT_TRUE(std::isnan(SECQuantileSummary().Quantile(0.5)));
}

} // namespace
