// The simulation report's own computations: percentiles read from a histogram accumulator
// (against quantiles from Boost.Math), the regrouped text histogram, and the report and JSON
// document built from hand-made results.
#include "cli/report.h"
#include "cli/reportjson.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"
#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secsettings.h"

#include <boost/math/distributions/exponential.hpp>
#include <boost/math/distributions/lognormal.hpp>
#include <boost/math/distributions/normal.hpp>
#include <boost/math/distributions/uniform.hpp>

#include <gtest/gtest.h>

#include <functional>
#include <sstream>

namespace {

using MCCommon_800::MCMV;
using MCMCSP_800::MCHistogramData;
using namespace MCHost;

//! A distribution given by its quantile function, and the histogram range to put it in.
struct KnownDistribution {
    std::string fName;                       //!< test name
    std::function<double(double)> fQuantile; //!< inverse distribution function
    double fLow;                             //!< histogram minimum
    double fHigh;                            //!< histogram maximum
};

std::ostream& operator<<(std::ostream& os, const KnownDistribution& d) {
    return os << d.fName;
}

class HistogramPercentileTest : public ::testing::TestWithParam<KnownDistribution> {};

// The n values x_i = Q((i + 0.5) / n) have the distribution's quantiles as their percentiles
// (to within 1/n in probability). Values beyond the histogram's range land in outlier bins,
// which must count like the others. Interpolating inside bins of a smooth density is far
// better than the one-bin-width bound: a quarter of a bin is asked for.
TEST_P(HistogramPercentileTest, MatchesTheQuantiles) {
    const KnownDistribution& d = GetParam();
    const int n = 20000;
    MCHistogramData histogram(100, d.fLow, d.fHigh, true);
    double minimum = d.fQuantile(0.5 / n);
    double maximum = d.fQuantile((n - 0.5) / n);
    for (int i = 0; i < n; ++i) {
        ASSERT_TRUE(histogram.UpdateData(1.0, 1.0, d.fQuantile((i + 0.5) / n)));
    }
    const double width = histogram.GetBinWidth();
    for (double p : {0.5, 1.0, 5.0, 25.0, 50.0, 75.0, 95.0, 99.0, 99.5}) {
        const double exact = d.fQuantile(p / 100.0);
        // 1/n in probability is a step of 1/(n f(x)) in value: allow two of them.
        const double step = 2.0 * (d.fQuantile(p / 100.0 + 1.0 / n) - exact);
        EXPECT_NEAR_TOL(HistogramPercentile(histogram, p, minimum, maximum), exact, 0.0,
                        0.25 * width + step)
            << "percentile " << p;
    }
    EXPECT_NEAR_TOL(HistogramPercentile(histogram, 0.0, minimum, maximum), minimum, 0.0, 1e-12);
    EXPECT_NEAR_TOL(HistogramPercentile(histogram, 100.0, minimum, maximum), maximum, 0.0, 1e-12);
}

INSTANTIATE_TEST_SUITE_P(
    Known, HistogramPercentileTest,
    ::testing::Values(
        KnownDistribution{
            "NormalWithBothTailsOutside",
            [](double p) { return boost::math::quantile(boost::math::normal(0.0, 1.0), p); }, -2.0,
            2.0},
        KnownDistribution{
            "ExponentialWithTheUpperTailOutside",
            [](double p) { return boost::math::quantile(boost::math::exponential(1.0), p); }, 0.0,
            2.0},
        KnownDistribution{
            "UniformInsideTheRange",
            [](double p) { return boost::math::quantile(boost::math::uniform(10.0, 20.0), p); },
            9.0, 21.0},
        KnownDistribution{
            "LognormalInANarrowRange",
            [](double p) { return boost::math::quantile(boost::math::lognormal(0.0, 0.5), p); },
            0.8, 1.5}),
    [](const ::testing::TestParamInfo<KnownDistribution>& p) { return p.param.fName; });

// 600 zeros and 400 values spread evenly over [5, 10): the zeros are a point mass at the
// minimum, and the rest is uniform, so the 80th percentile is 5 + (0.8 - 0.6) / 0.4 * 5.
TEST(HistogramPercentile, PointMassAtTheMinimumIsExact) {
    MCHistogramData histogram(1000, 0.0, 10.0, true);
    for (int i = 0; i < 600; ++i) {
        histogram.UpdateData(1.0, 1.0, 0.0);
    }
    for (int i = 0; i < 400; ++i) {
        histogram.UpdateData(1.0, 1.0, 5.0 + 5.0 * (i + 0.5) / 400.0);
    }
    EXPECT_EQ(HistogramPercentile(histogram, 25.0, 0.0, 9.99375), 0.0);
    EXPECT_EQ(HistogramPercentile(histogram, 60.0, 0.0, 9.99375), 0.0);
    EXPECT_NEAR_TOL(HistogramPercentile(histogram, 80.0, 0.0, 9.99375), 7.5, 0.0, 0.01);
}

TEST(HistogramPercentile, EmptyAndDegenerateHistograms) {
    const MCHistogramData empty(1000, 0.0, 1.0, true);
    EXPECT_TRUE(MCMV::IsMissing(HistogramPercentile(empty, 50.0, 0.0, 1.0)));
    // A range that cannot be cut gives one bin of width 0: every value is alike.
    MCHistogramData constant(1000, 3.0, 3.0, true);
    constant.UpdateData(1.0, 1.0, 3.0);
    constant.UpdateData(1.0, 1.0, 3.0);
    EXPECT_EQ(HistogramPercentile(constant, 90.0, 3.0, 3.0), 3.0);
}

TEST(GroupHistogram, RoundRowsKeepEveryCount) {
    MCHistogramData histogram(1000, 0.0, 1.0, false);
    for (int i = 0; i < 5000; ++i) {
        histogram.UpdateData(1.0, 1.0, -0.3 + 1.7 * (i + 0.5) / 5000.0); // some in outlier bins
    }
    const std::vector<HistogramBin> bins = HistogramBins(histogram);
    const std::vector<HistogramRow> rows = GroupHistogram(bins, -0.3, 1.4, 14);
    ASSERT_GE(rows.size(), 10u);
    ASSERT_LE(rows.size(), 20u);
    double total = 0.0;
    for (const HistogramRow& r : rows) {
        total += r.fCount;
        EXPECT_NEAR_TOL(r.fUpper - r.fLower, 0.1, 1e-12, 0.0); // 1.7 / 14 = 0.121 rounds to 0.1
    }
    EXPECT_EQ(total, 5000.0);
    EXPECT_LE(rows.front().fLower, -0.3);
    EXPECT_GE(rows.back().fUpper, 1.4);
}

// Results made by hand: one continuous target with a missing standard deviation, one
// categorical target whose counts run by category value, and two correlated inputs.
TEST(SimulationReport, JsonCarriesTheResultsWithNullForMissing) {
    MCMCSP_800::SECSettings settings;
    MCMCSP_800::SPCSettings plan;
    plan.SetCorrMatrixCell("a", "a", 1.0);
    plan.SetCorrMatrixCell("b", "a", 0.5);
    plan.SetCorrMatrixCell("b", "b", 1.0);
    MCXML_800::MCVarList vars;
    vars.Add(std::make_unique<MCXML_800::MCCatVar>(
        "band", MCXML_800::MCCatNumEncoder(std::vector<std::string>{"lo", "mid", "hi"})));
    MCMCSP_800::SECOutputStats stats(settings, plan, vars);
    stats.SetSimCaseCount(4);
    stats.SetValidCaseCount(4);
    stats.SetCovariateNames({"a", "b"});
    stats.GetSimulCorr().SetNRows(2);
    stats.GetSimulCorr().SetElem(0, 1, 0.48);
    MCMCSP_800::SECInputCorrelationPair ab;
    ab.fFirst = "b";
    ab.fSecond = "a";
    ab.fTarget = 0.5;
    ab.fNormalCorr = 1.0;
    ab.fAttainableLow = -0.3;
    ab.fAttainableHigh = 0.45;
    ab.fbUnreachable = true;
    stats.GetInputCorrelationPairs().push_back(ab);

    MCMCSP_800::SECContinuousTargetInfo y;
    y.fName = "y";
    y.fMean = 2.5;
    y.fMinimum = 1.0;
    y.fMaximum = 4.0;
    y.fHistogram = MCHistogramData(10, 0.0, 5.0, true);
    for (double x : {1.0, 2.0, 3.0, 4.0}) {
        y.fHistogram.UpdateData(1.0, 1.0, x);
    }
    y.fvPearsonCorrs = {0.9, MCMV::Missing()};
    stats.GetContTargetInfo().push_back(y);
    MCMCSP_800::SECCategoricalTargetInfo band;
    band.fName = "band";
    band.fvCatCounts = {3.0, 1.0}; // "hi" was never drawn
    stats.GetCateTargetInfo().push_back(band);

    SimulationReport report;
    report.fvIterations.push_back(BuildReportIteration(stats, 0, {50.0}));
    const nlohmann::json doc = nlohmann::json::parse(ReportToJson(report).dump());
    const nlohmann::json& it = doc.at("iterations")[0];
    EXPECT_EQ(it.at("counts").at("valid"), 4);
    const nlohmann::json& target = it.at("continuous_targets")[0];
    EXPECT_EQ(target.at("mean"), 2.5);
    EXPECT_TRUE(target.at("std_dev").is_null());
    EXPECT_TRUE(target.at("sensitivity")[1].at("correlation").is_null());
    EXPECT_EQ(target.at("histogram").at("bins").size(), 4u);
    EXPECT_NEAR_TOL(target.at("percentiles")[0].at("value").get<double>(), 2.5, 0.0, 0.5);
    const nlohmann::json& categories = it.at("categorical_targets")[0].at("categories");
    ASSERT_EQ(categories.size(), 3u);
    EXPECT_EQ(categories[0].at("label"), "lo");
    EXPECT_EQ(categories[0].at("share"), 0.75);
    EXPECT_EQ(categories[2].at("label"), "hi");
    EXPECT_EQ(categories[2].at("count"), 0.0);
    ASSERT_EQ(it.at("input_correlations").size(), 1u);
    EXPECT_EQ(it.at("input_correlations")[0].at("plan"), 0.5);
    EXPECT_EQ(it.at("input_correlations")[0].at("simulated"), 0.48);
    EXPECT_EQ(it.at("input_correlations")[0].at("normal_scale"), 1.0);
    EXPECT_EQ(it.at("input_correlations")[0].at("attainable_high"), 0.45);
    EXPECT_EQ(it.at("input_correlations")[0].at("unreachable"), true);
    EXPECT_TRUE(it.at("contingency_table").is_null());

    std::ostringstream text;
    WriteTextReport(text, report);
    EXPECT_NE(text.str().find("std dev  missing"), std::string::npos) << text.str();
    EXPECT_NE(text.str().find("[-0.300, 0.450]        1.0000      0.480  unreachable"),
              std::string::npos)
        << text.str();

    // The streamed document is the whole one, with none, one and two iterations.
    for (const std::size_t n : {0u, 1u, 2u}) {
        report.fvIterations.resize(n, report.fvIterations.empty() ? ReportIteration()
                                                                   : report.fvIterations[0]);
        std::ostringstream streamed;
        WriteJsonReport(streamed, report);
        EXPECT_EQ(streamed.str(), ReportToJson(report).dump(2) + "\n") << n;
    }
}

} // namespace
