#include "simulation_common/mcsphistogramdata.h"

#include "component/mcspassert.h"
#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <limits>
#include <random>

using namespace MCMCSP_800;
using MCCommon_800::MCMV;

namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();
constexpr double kMaxD = std::numeric_limits<double>::max();

//! The bin that received the single value of `h`: its index, read from the bins or outliers.
int OnlyBinOf(const MCHistogramData& h) {
    for (std::size_t b = 0; b < h.GetBinFreqCounts().size(); ++b) {
        if (h.GetBinFreqCounts()[b] > 0.0) {
            return static_cast<int>(b);
        }
    }
    return h.GetOutlierBinMap().empty() ? INT_MIN + 1 : h.GetOutlierBinMap().begin()->first;
}

struct BinCase {
    const char* name;
    int nBins;
    double minVal, maxVal, x;
    int expected;
};

class HistogramBinTest : public ::testing::TestWithParam<BinCase> {};

TEST_P(HistogramBinTest, ValueLandsInItsBin) {
    const BinCase& c = GetParam();
    MCHistogramData h(c.nBins, c.minVal, c.maxVal, true);
    ASSERT_TRUE(h.UpdateData(1.0, 1.0, c.x));
    EXPECT_EQ(OnlyBinOf(h), c.expected);
}

// The range is half-open: the maximum is an outlier, the largest double below it is not. A
// range that cannot be cut (and too few bins) falls back to one bin, with an assertion.
// clang-format off
INSTANTIATE_TEST_SUITE_P(Edges, HistogramBinTest, ::testing::Values(
    BinCase{"Max", 10, 0, 10, 10.0, 10}, BinCase{"BelowMin", 10, 0, 10, -0.5, -1},
    BinCase{"NearMax", 10, 0, 10, 9.999, 9}, BinCase{"FarBelow", 10, 0, 10, -10.0, -10},
    BinCase{"JustBelowMax", 10, 0, 10, std::nextafter(10.0, 0.0), 9},
    BinCase{"JustBelowMin", 10, 0, 10, -1e-300, -1}, BinCase{"ThirdsMax", 3, 0, 1, 1.0, 3},
    BinCase{"HugeClamped", 10, 0, 10, 1e300, INT_MAX},
    BinCase{"EmptyRangeOneBin", 10, 5, 5, 100.0, 0}, BinCase{"NaNRangeOneBin", 10, kNaN, 1, 3.0, 0},
    BinCase{"ReversedRangeOneBin", 10, 1, 0, 3.0, 0}, BinCase{"OneBin", 1, 0, 10, 42.0, 0},
    BinCase{"UnsetBoundsOneBin", 10, -kMaxD, kMaxD, 3.0, 0},
    BinCase{"ZeroBinsOneBin", 0, 0, 10, 42.0, 0}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

TEST(MCHistogramData, ConstructorAssertsOnUnusableLayouts) {
    const MCHistogramData oneBin(1, 0, 10, false);
    EXPECT_EQ(GetLastAssertion(), "MCHistogramData constructor: nBins > 1");
    const MCHistogramData reversed(10, 1, 0, false);
    EXPECT_EQ(GetLastAssertion(), "MCHistogramData constructor: maxVal >= minVal");
    MCHistogramData byDefault; // has its one bin
    EXPECT_TRUE(byDefault.UpdateData(1, 1, 7.0));
}

struct BadInput {
    const char* name;
    double f, g, x;
};

class HistogramBadInputTest : public ::testing::TestWithParam<BadInput> {};

TEST_P(HistogramBadInputTest, IsRefusedAndChangesNothing) {
    const BadInput& c = GetParam();
    MCHistogramData h(10, 0, 10, true);
    ASSERT_TRUE(h.UpdateData(2, 1, 4.0));
    ClearLastAssertion();
    EXPECT_FALSE(h.UpdateData(c.f, c.g, c.x));
    EXPECT_NE(GetLastAssertion(), "");
    EXPECT_TRUE(h.GetNCases() == 1.0 && h.GetWeightedCount() == 2.0 && h.GetMean() == 4.0 &&
                h.GetSecondMoment() == 0.0 && h.GetOutlierBinMap().empty());
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Refused, HistogramBadInputTest, ::testing::Values(
    BadInput{"MissingValue", 1, 1, MCMV::Missing()}, BadInput{"Infinity", 1, 1, kInf},
    BadInput{"ZeroFreq", 0, 1, 1}, BadInput{"NegativeRegression", 1, -2, 1},
    BadInput{"MissingFreq", kNaN, 1, 1}, BadInput{"InfiniteRegression", 1, kInf, 1},
    BadInput{"ProductUnderflows", 1e-200, 1e-200, 1}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

TEST(MCHistogramData, KnownMomentsAndNoneForOneCase) {
    MCHistogramData h(10, 0, 10, true);
    ASSERT_TRUE(h.UpdateData(1, 1, 1.0) && h.UpdateData(1, 1, 3.0));
    EXPECT_EQ(h.GetMean(), 2.0);
    EXPECT_EQ(h.GetSecondMoment(), 1.0);
    EXPECT_NEAR_REL(h.GetStdDev(), std::sqrt(2.0), 2 * mctest::kEps);
    MCHistogramData single(10, 0, 10, true);
    ASSERT_TRUE(single.UpdateData(1, 1, 1.0));
    EXPECT_TRUE(MCMV::IsMissing(single.GetStdDev()));
    MCHistogramData noMoment(10, 0, 10, false);
    ASSERT_TRUE(noMoment.UpdateData(3, 1, 1.0));
    EXPECT_TRUE(MCMV::IsMissing(noMoment.GetStdDev()));
    // -0.11 (w = 1) then 0.44 (w = 0.25): the exact mean is 0, the update yields 1.4e-17.
    MCHistogramData cancel(10, -1, 1, true);
    ASSERT_TRUE(cancel.UpdateData(1, 1, -0.11) && cancel.UpdateData(0.25, 1, 0.44));
    EXPECT_EQ(cancel.GetMean(), 0.0);
}

// ---- Merging: k accumulators that split a stream equal one that saw all of it ----

void ExpectSameHistogram(const MCHistogramData& a, const MCHistogramData& b, double rel,
                         double momentRel) {
    EXPECT_EQ(a.GetNCases(), b.GetNCases());
    EXPECT_EQ(a.GetTotalWeight(), b.GetTotalWeight()); // integer frequency weights
    EXPECT_NEAR_REL(a.GetWeightedCount(), b.GetWeightedCount(), rel);
    EXPECT_NEAR_REL(a.GetMean(), b.GetMean(), rel);
    EXPECT_NEAR_REL(a.GetSecondMoment(), b.GetSecondMoment(), momentRel);
    EXPECT_EQ(a.GetBinFreqCounts(), b.GetBinFreqCounts());
    for (std::size_t i = 0; i < a.GetBinMeans().size(); ++i) {
        EXPECT_NEAR_REL(a.GetBinWeightedCounts()[i], b.GetBinWeightedCounts()[i], rel) << i;
        EXPECT_NEAR_REL(a.GetBinMeans()[i], b.GetBinMeans()[i], rel) << "bin " << i;
    }
    ASSERT_EQ(a.GetOutlierBinMap().size(), b.GetOutlierBinMap().size());
    for (const auto& [index, bin] : a.GetOutlierBinMap()) {
        const auto found = b.GetOutlierBinMap().find(index);
        ASSERT_NE(found, b.GetOutlierBinMap().end()) << "outlier bin " << index;
        EXPECT_EQ(bin.fFreqCount, found->second.fFreqCount);
        EXPECT_NEAR_REL(bin.fWeightedCount, found->second.fWeightedCount, rel);
        EXPECT_NEAR_REL(bin.fMean, found->second.fMean, rel) << "outlier bin " << index;
    }
}

struct SplitCase {
    const char* name;
    int parts, n;
    unsigned seed;
    double offset, outlierShare;
    double momentRel; //!< streaming variance error grows with (offset / spread)
};

class HistogramSplitTest : public ::testing::TestWithParam<SplitCase> {};

// n weighted values inside [offset, offset + 10) except a share of them in the 3 units on
// either side (a handful of outlier bins, each hit repeatedly). The one pass is checked against
// the weighted mean and population variance by two passes in long double.
TEST_P(HistogramSplitTest, MergedPartsEqualOnePass) {
    const SplitCase& c = GetParam();
    constexpr double kRel = 1e-12;
    const double lo = c.offset;
    std::mt19937_64 rng(c.seed);
    std::uniform_real_distribution<double> inside(0.0, 10.0), side(0.0, 3.0), g(0.5, 2.0);
    std::uniform_int_distribution<int> f(1, 4), pick(0, c.parts - 1);
    std::bernoulli_distribution isOutlier(c.outlierShare), below(0.5);
    MCHistogramData whole(50, lo, lo + 10.0, true);
    std::vector<MCHistogramData> parts(static_cast<std::size_t>(c.parts), whole);
    long double sw = 0, swx = 0, swxx = 0;
    for (int i = 0; i < c.n; ++i) {
        double x = lo + inside(rng);
        if (isOutlier(rng)) {
            x = below(rng) ? lo - side(rng) : lo + 10.0 + side(rng);
        }
        const double fi = f(rng), gi = g(rng);
        ASSERT_TRUE(whole.UpdateData(fi, gi, x));
        ASSERT_TRUE(parts[static_cast<std::size_t>(pick(rng))].UpdateData(fi, gi, x));
        const long double w = static_cast<long double>(fi) * gi, d = x - lo;
        sw += w;
        swx += w * d;
        swxx += w * d * d;
    }
    // Moments of x - lo (exact for these offsets), so that the reference keeps its digits.
    const long double refMean = swx / sw;
    EXPECT_NEAR_REL(whole.GetMean(), static_cast<double>(lo + refMean), kRel);
    EXPECT_NEAR_REL(whole.GetSecondMoment(), static_cast<double>(swxx / sw - refMean * refMean),
                    c.momentRel);

    // Into an empty receiver (the master), and into the first part with the others.
    std::vector<const MCHistogramData*> all;
    for (const MCHistogramData& part : parts) {
        all.push_back(&part);
    }
    MCHistogramData master(50, lo, lo + 10.0, true);
    ASSERT_TRUE(master.AddObjects(all).IsOK());
    ExpectSameHistogram(master, whole, kRel, c.momentRel);
    ASSERT_TRUE(parts[0].AddObjects({all.begin() + 1, all.end()}).IsOK());
    ExpectSameHistogram(parts[0], whole, kRel, c.momentRel);
}

// With offset 1e7 and spread ~3 the pooled form sum(W_i (m2_i + mean_i^2)) / W - mean^2 is off
// by about eps * 1e14 / 8 ~ 3e-3 of the variance; the streaming update itself stays near 1e-10.
// clang-format off
INSTANTIATE_TEST_SUITE_P(Streams, HistogramSplitTest, ::testing::Values(
    SplitCase{"TwoParts", 2, 4000, 1, 0.0, 0.1, 1e-12},
    SplitCase{"ThreeParts", 3, 4000, 2, -1000.0, 0.2, 1e-11},
    SplitCase{"EightParts", 8, 4000, 3, 0.0, 0.05, 1e-12},
    SplitCase{"SomePartsEmpty", 40, 30, 5, 0.0, 0.2, 1e-12},
    SplitCase{"LargeOffset", 4, 4000, 6, 1e7, 0.1, 1e-8}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

// A bin that the receiver never used (mean still missing) takes the other's mean.
TEST(MCHistogramData, MergeFillsBinsTheReceiverNeverUsed) {
    MCHistogramData a(10, 0, 10, true), b(10, 0, 10, true);
    ASSERT_TRUE(a.UpdateData(1, 1, 0.5));
    ASSERT_TRUE(b.UpdateData(2, 1, 5.5) && b.UpdateData(1, 1, 12.5));
    ASSERT_TRUE(a.AddObjects({&b}).IsOK());
    EXPECT_EQ(a.GetBinMeans()[5], 5.5);
    EXPECT_TRUE(MCMV::IsMissing(a.GetBinMeans()[6]));
    EXPECT_EQ(a.GetOutlierBinMap().at(12).fMean, 12.5);
    EXPECT_NEAR_REL(a.GetMean(), (0.5 + 2 * 5.5 + 12.5) / 4, 2 * mctest::kEps);
}

TEST(MCHistogramData, MergeWithItselfDoublesTheWeights) {
    MCHistogramData h(10, 0, 10, true), twice(10, 0, 10, true);
    for (const double x : {1.0, 3.0, 3.5, 11.0}) {
        ASSERT_TRUE(h.UpdateData(1, 1, x) && twice.UpdateData(2, 1, x));
    }
    EXPECT_EQ(h.AddObjects({nullptr}).GetErrorCode(), 390010);
    ASSERT_TRUE(h.AddObjects({&h}).IsOK());
    EXPECT_EQ(h.GetNCases(), 8.0);
    EXPECT_EQ(h.GetBinFreqCounts(), twice.GetBinFreqCounts());
    EXPECT_NEAR_REL(h.GetMean(), twice.GetMean(), 2 * mctest::kEps);
    EXPECT_NEAR_REL(h.GetSecondMoment(), twice.GetSecondMoment(), 8 * mctest::kEps);
    EXPECT_NEAR_REL(h.GetBinMeans()[3], 3.25, 2 * mctest::kEps);
}

struct MergeCase {
    const char* name;
    int nBins;
    double minVal, maxVal;
    bool keepMoment, otherEmpty, ok;
};

class HistogramMergeRuleTest : public ::testing::TestWithParam<MergeCase> {};

TEST_P(HistogramMergeRuleTest, CompatibleOrFailsWith390010) {
    const MergeCase& c = GetParam();
    MCHistogramData receiver(10, 0, 10, true), other(c.nBins, c.minVal, c.maxVal, c.keepMoment);
    ASSERT_TRUE(receiver.UpdateData(1, 1, 2.5));
    if (!c.otherEmpty) {
        ASSERT_TRUE(other.UpdateData(1, 1, 3.5));
    }
    const MCHistogramData before(receiver);
    const MCCommon_800::MCStatus status = receiver.AddObjects({&before, &other});
    EXPECT_EQ(status.GetErrorCode(), c.ok ? 0 : 390010);
    if (!c.ok) {
        ExpectSameHistogram(receiver, before, 0.0, 0.0); // checked before anything changed
    }
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Layouts, HistogramMergeRuleTest, ::testing::Values(
    MergeCase{"Same", 10, 0, 10, true, false, true},
    MergeCase{"OtherBins", 20, 0, 10, true, false, false},
    MergeCase{"OtherMinimum", 10, 1, 11, true, false, false},
    MergeCase{"OtherWidth", 10, 0, 20, true, false, false},
    MergeCase{"OtherMomentFlag", 10, 0, 10, false, false, false},
    MergeCase{"EmptyOtherIsSkipped", 20, 0, 10, false, true, true}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

// Outliers are not charted; the record is built once and kept.
TEST(MCHistogramData, ChartRecordIsBuiltOnceFromUsedBins) {
    MCHistogramData h(10, 0, 10, true);
    for (const double x : {1.25, 1.75, 6.5, 10.0, -4.0}) {
        ASSERT_TRUE(h.UpdateData(2, 0.5, x));
    }
    const MCXML_800::MCVariateData& record = h.GenerateMCVariateData("profit");
    EXPECT_EQ(record.GetCount(), 10.0);
    ASSERT_EQ(record.fCoordinates.size(), 2u);
    EXPECT_EQ(record.fCoordinates[0].fValues, (std::vector<double>{1.5, 6.5}));
    EXPECT_EQ(record.fCoordinates[1].fValues, (std::vector<double>{4.0, 2.0}));
    EXPECT_EQ(record.GetStatistic("mean", kNaN), h.GetMean());
    EXPECT_EQ(record.GetStatistic("stdDeviation", kNaN), h.GetStdDev());

    ASSERT_TRUE(h.UpdateData(1, 1, 3.5));
    const MCXML_800::MCVariateData& again = h.GenerateMCVariateData("other");
    EXPECT_EQ(again.fCoordinates[0].fVarName, "profit");
    EXPECT_EQ(again.fCoordinates[0].fValues.size(), 2u);

    // W <= 1 charts a standard deviation of 0 rather than a missing value.
    MCHistogramData small(10, 0, 10, true);
    ASSERT_TRUE(small.UpdateData(1, 0.5, 1.0));
    EXPECT_EQ(small.GenerateMCVariateData("").GetStatistic("stdDeviation", kNaN), 0.0);
}

} // namespace
