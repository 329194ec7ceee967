#include "mcmath/mcaccumulators.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <numeric>
#include <random>
#include <string>
#include <vector>

using MCCommon_800::MCMV;
using namespace MCMath_800;

namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();

// Two-pass references in long double: the weighted mean, and Σ w·(a - mean_a)·(b - mean_b).
long double Mean(const std::vector<double>& x, const std::vector<double>& w) {
    long double sw = 0.0L, swx = 0.0L;
    for (std::size_t i = 0; i < x.size(); ++i) {
        sw += w[i];
        swx += static_cast<long double>(w[i]) * x[i];
    }
    return swx / sw;
}

double XProd(const std::vector<double>& a, const std::vector<double>& b,
             const std::vector<double>& w) {
    const long double ma = Mean(a, w), mb = Mean(b, w);
    long double c = 0.0L;
    for (std::size_t i = 0; i < a.size(); ++i) {
        c += w[i] * (a[i] - ma) * (b[i] - mb);
    }
    return static_cast<double>(c);
}

void ExpectNearAll(const std::vector<double>& a, const std::vector<double>& b, double rel) {
    ASSERT_EQ(a.size(), b.size());
    for (std::size_t i = 0; i < a.size(); ++i) {
        EXPECT_NEAR_REL(a[i], b[i], rel) << "index " << i;
    }
}

template <class Row> std::string ByName(const ::testing::TestParamInfo<Row>& p) {
    return p.param.fName;
}

// Pooling k random parts equals one pass, and a row of weight r·w equals r rows of weight w (the
// one pass takes the former, the parts the latter); both match the two-pass reference. Only the
// order of rounding differs (O(n·eps) for these well-conditioned data): 1e-12 relative.
class PoolSplit : public ::testing::TestWithParam<int> {};

TEST_P(PoolSplit, PooledPartsOfRepeatedRowsEqualOneWeightedPass) {
    const auto k = static_cast<std::size_t>(GetParam());
    std::mt19937_64 gen(77u + k);
    std::normal_distribution<double> normal(6.0, 2.0);
    std::uniform_real_distribution<double> weight(0.1, 3.0);
    std::uniform_int_distribution<int> repeats(1, 3);
    std::uniform_int_distribution<std::size_t> part(0, k - 1);
    // Index k holds the one pass, 0 .. k-1 the parts.
    std::vector<MCContStats> s(k + 1);
    std::vector<MCCatStats> cat(k + 1);
    std::vector<MCHistogramData> hist(k + 1, MCHistogramData(12, 0.0, 12.0, true));
    std::vector<MCProvMeans> pm(k + 1, MCProvMeans(3, true));
    std::vector<double> x, xz, w;
    std::int64_t rows = 0; // rows seen by the parts
    const auto update = [&](std::size_t p, const std::vector<double>& row, double wi) {
        ASSERT_TRUE(s[p].Update(row[0], wi) && pm[p].Update(row, wi));
        ASSERT_TRUE(hist[p].UpdateData(wi, 1.0, row[0]));
        cat[p].Update(row[0], wi);
    };
    for (int i = 0; i < 2000; ++i) {
        x.push_back(normal(gen));
        xz.push_back(x.back() * normal(gen));
        const double w0 = weight(gen);
        const int r = repeats(gen);
        w.push_back(r * w0);
        rows += r;
        // Three correlated columns for the cross products: x, x·z and 10 - x.
        const std::vector<double> row{x.back(), xz.back(), 10.0 - x.back()};
        update(k, row, w.back());
        for (int j = 0; j < r; ++j) {
            update(part(gen), row, w0);
        }
    }
    MCContStats pooled;
    MCCatStats pooledCat;
    MCHistogramData pooledHist(12, 0.0, 12.0, true);
    MCProvMeans merged(3, true);
    for (std::size_t p = 0; p < k; ++p) {
        pooled.Pool(s[p]);
        pooledCat.Pool(cat[p]);
        ASSERT_TRUE(pooledHist.Merge(hist[p]) && merged.Merge(pm[p]));
    }
    const auto mean = static_cast<double>(Mean(x, w));
    const double m2 = XProd(x, x, w);
    const double sumW = std::accumulate(w.begin(), w.end(), 0.0L);
    EXPECT_EQ(s[k].GetCount(), 2000);
    EXPECT_EQ(pooled.GetCount(), rows);
    for (const MCContStats* r : {&s[k], &pooled}) {
        EXPECT_NEAR_REL(r->GetSumFreqWeights(), sumW, 1e-12);
        EXPECT_NEAR_REL(r->GetMean(), mean, 1e-12);
        EXPECT_NEAR_REL(r->GetVariance(), m2 / (sumW - 1.0), 1e-12);
        double lo = 0.0, hi = 0.0;
        ASSERT_TRUE(r->GetExtrema(lo, hi));
        EXPECT_EQ(lo, *std::min_element(x.begin(), x.end()));
        EXPECT_EQ(hi, *std::max_element(x.begin(), x.end()));
    }
    for (const MCProvMeans* m : {&pm[k], &merged}) {
        EXPECT_NEAR_REL(m->GetMeans()[0], mean, 1e-12);
        EXPECT_NEAR_REL(m->GetXProds().GetElem(0, 0), m2, 1e-12);
        EXPECT_NEAR_REL(m->GetXProds().GetElem(2, 0), -m2, 1e-12); // 10 - x against x
        EXPECT_NEAR_REL(m->GetXProds().GetElem(1, 0), XProd(x, xz, w), 1e-11);
        EXPECT_NEAR_REL(m->GetXProds().GetElem(1, 1), XProd(xz, xz, w), 1e-12);
    }
    ExpectNearAll(pooledCat.GetCatCounts(), cat[k].GetCatCounts(), 1e-12);
    EXPECT_NEAR_REL(pooledCat.GetRefusedWeight(), cat[k].GetRefusedWeight(), 1e-12);
    ExpectNearAll(pooledHist.GetBinWeights(), hist[k].GetBinWeights(), 1e-12);
    EXPECT_NEAR_REL(pooledHist.GetOverflowWeight(), hist[k].GetOverflowWeight(), 1e-12);
    EXPECT_NEAR_REL(pooledHist.GetVariance(), hist[k].GetVariance(), 1e-12);
}

INSTANTIATE_TEST_SUITE_P(Parts, PoolSplit, ::testing::Values(2, 3, 7, 16));

// y = 1e9 + u, sd(u) = 1: the reference is the exact variance of those doubles (y - 1e9 is
// exact). Raw power sums lose every digit (Σy² ≈ 1e21); West's update loses at most
// log10(|mean|/sd) = 9 digits, about 8 in practice, so 1e-6 fails any raw-power method by
// orders. The running mean carries ulp(1e9)/2 per update, a random walk of 1e-13 of the mean.
TEST(AccumulatorShift, DataShiftedBy1e9KeepTheirVariance) {
    constexpr double kShift = 1e9;
    std::mt19937_64 gen(4242);
    std::normal_distribution<double> normal(0.0, 1.0);
    std::vector<double> u;
    MCContStats stats, halves[2];
    MCProvMeans means(2, true);
    for (int i = 0; i < 100000; ++i) {
        const double y = kShift + normal(gen);
        u.push_back(y - kShift);
        stats.Update(y);
        halves[i % 2].Update(y);
        means.Update(std::vector<double>{y, -y}, 1.0);
    }
    const std::vector<double> ones(u.size(), 1.0);
    const double m2 = XProd(u, u, ones);
    const double variance = m2 / (static_cast<double>(u.size()) - 1.0);
    EXPECT_NEAR_REL(stats.GetVariance(), variance, 1e-6);
    EXPECT_NEAR_REL(stats.GetMean(), kShift + static_cast<double>(Mean(u, ones)), 1e-13);
    EXPECT_NEAR_REL(means.GetXProds().GetElem(0, 0), m2, 1e-6);
    EXPECT_NEAR_REL(means.GetXProds().GetElem(1, 0), -m2, 1e-6);
    halves[0].Pool(halves[1]);
    EXPECT_NEAR_REL(halves[0].GetVariance(), variance, 1e-6);
}

TEST(MCContStats, EmptyAndSingleValueReportMissing) {
    MCContStats s;
    double lo = 0.0, hi = 0.0;
    EXPECT_FALSE(s.GetExtrema(lo, hi));
    EXPECT_TRUE(MCMV::IsMissing(lo) && MCMV::IsMissing(hi) && MCMV::IsMissing(s.GetMean()));
    s.Update(7.0);
    EXPECT_TRUE(MCMV::IsMissing(s.GetVariance())); // W = 1: no sample variance
    MCContStats copy = s;
    s.Pool(s); // pooling with itself doubles the data: 7, 7
    EXPECT_EQ(s.GetSumFreqWeights(), 2.0);
    EXPECT_EQ(s.GetVariance(), 0.0);
    copy.Pool(MCContStats());
    EXPECT_EQ(copy.GetCount(), 1);
}

// Bad input leaves every accumulator unchanged.
struct BadUpdate {
    const char* fName;
    double fX, fWeight;
};

class RefusedUpdate : public ::testing::TestWithParam<BadUpdate> {};

TEST_P(RefusedUpdate, NothingChanges) {
    const BadUpdate& c = GetParam();
    MCContStats s;
    MCProvMeans pm(1, true);
    MCHistogramData h(4, 0.0, 4.0, true);
    MCCatStats cat;
    ASSERT_TRUE(s.Update(1.0) && pm.Update(std::vector<double>{1.0}, 1.0) &&
                h.UpdateData(1.0, 1.0, 1.0) && cat.Update(1.0, 1.0));
    EXPECT_FALSE(s.Update(c.fX, c.fWeight));
    EXPECT_FALSE(pm.Update(std::vector<double>{c.fX}, c.fWeight));
    EXPECT_FALSE(h.UpdateData(c.fWeight, 1.0, c.fX));
    EXPECT_FALSE(cat.Update(c.fX, c.fWeight));
    EXPECT_TRUE(s.GetCount() == 1 && s.GetMean() == 1.0);
    EXPECT_TRUE(pm.GetCount() == 1 && pm.GetMeans()[0] == 1.0);
    EXPECT_TRUE(h.GetTotalWeight() == 1.0 && h.GetMean() == 1.0);
    EXPECT_EQ(cat.GetSumCounts(), 1.0);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, RefusedUpdate, ::testing::Values(
    BadUpdate{"MissingValue", kNaN, 1.0}, BadUpdate{"InfiniteValue", kInf, 1.0},
    BadUpdate{"MinusInfinity", -kInf, 1.0}, BadUpdate{"ZeroWeight", 2.0, 0.0},
    BadUpdate{"NegativeWeight", 2.0, -1.0}, BadUpdate{"MissingWeight", 2.0, kNaN},
    BadUpdate{"InfiniteWeight", 2.0, kInf}), ByName<BadUpdate>);
// clang-format on

// MCCatStats: the category of a value, -1 when refused.
struct CatCase {
    const char* fName;
    double fValue;
    int fCategory;
};

class CatStatsCategory : public ::testing::TestWithParam<CatCase> {};

TEST_P(CatStatsCategory, ValueCountsForItsCategory) {
    const CatCase& c = GetParam();
    MCCatStats s;
    EXPECT_EQ(s.Update(c.fValue, 2.5), c.fCategory >= 0);
    EXPECT_EQ(s.GetRefusedWeight(), c.fCategory < 0 ? 2.5 : 0.0);
    EXPECT_EQ(s.GetNCategories(true), c.fCategory + 1);
    if (c.fCategory >= 0) {
        EXPECT_EQ(s.GetCatCount(c.fCategory), 2.5);
    }
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, CatStatsCategory, ::testing::Values(
    CatCase{"Zero", 0.0, 0}, CatCase{"Whole", 3.0, 3}, CatCase{"RoundsDown", 2.4, 2},
    CatCase{"HalfRoundsUp", 2.5, 3}, CatCase{"SmallNegative", -0.4, 0},
    CatCase{"MinusHalf", -0.5, -1}, CatCase{"Negative", -3.0, -1}, CatCase{"Missing", kNaN, -1},
    CatCase{"Infinite", kInf, -1},
    CatCase{"LargestCategory", MCCatStats::kMaxCategory, MCCatStats::kMaxCategory},
    CatCase{"BeyondLargest", MCCatStats::kMaxCategory + 1.0, -1}, CatCase{"Huge", 1e300, -1}),
    ByName<CatCase>);
// clang-format on

TEST(MCCatStats, GapsCountAsEmptyCategories) {
    MCCatStats s;
    s.Update(0.0, 1.0);
    s.Update(4.0, 2.0);
    s.Update(4.2, 1.0);
    EXPECT_EQ(s.GetCatCounts(), (std::vector<double>{1.0, 0.0, 0.0, 0.0, 3.0}));
    EXPECT_EQ(s.GetNCategories(false), 2);
    EXPECT_TRUE(s.GetCatCount(7) == 0.0 && s.GetCatCount(-1) == 0.0);
    s.Pool(s);
    EXPECT_TRUE(s.GetCatCount(4) == 6.0 && s.GetSumCounts() == 8.0);
}

TEST(MCMeansXProdData, MergeRefusesAMismatchAndKeepsItsState) {
    MCProvMeans three(3, true), two(2, true), meansOnly(3, false);
    three.Update(std::vector<double>{1.0, 2.0, 3.0}, 1.0);
    three.Update(std::vector<double>{2.0, 0.0, 5.0}, 2.0);
    const MCProvMeans before = three;
    two.Update(std::vector<double>{1.0, 2.0}, 1.0);
    meansOnly.Update(std::vector<double>{1.0, 2.0, 3.0}, 1.0);
    EXPECT_FALSE(three.Merge(two) || two.Merge(three) || three.Merge(meansOnly));
    EXPECT_FALSE(three.Update(std::vector<double>{1.0, 2.0}, 1.0)); // row of the wrong length
    EXPECT_EQ(three.GetCount(), before.GetCount());
    EXPECT_EQ(three.GetMeans(), before.GetMeans());
    EXPECT_TRUE(three.GetXProds() == before.GetXProds());
    // An empty accumulator of the same shape merges as a no-op; merging into one copies.
    EXPECT_TRUE(three.Merge(MCProvMeans(3, true)));
    MCProvMeans empty(3, true);
    EXPECT_TRUE(empty.Merge(three));
    EXPECT_EQ(empty.GetMeans(), three.GetMeans());
    EXPECT_TRUE(empty.GetXProds() == three.GetXProds());

    // Merging with itself doubles the weights. Two rows: means (2, 2), C = [[2, -4], [-4, 8]].
    MCProvMeans pm(2, true);
    pm.Update(std::vector<double>{1.0, 4.0}, 1.0);
    pm.Update(std::vector<double>{3.0, 0.0}, 1.0);
    ASSERT_TRUE(pm.Merge(pm));
    EXPECT_EQ(pm.GetSumWeights(), 4.0);
    EXPECT_EQ(pm.GetMeans(), (std::vector<double>{2.0, 2.0}));
    const MCSymMatrix& c = pm.GetXProds();
    EXPECT_EQ((std::vector<double>{c.GetElem(0, 0), c.GetElem(1, 0), c.GetElem(1, 1)}),
              (std::vector<double>{4.0, -8.0, 16.0}));
}

// MCHistogramData: where a value goes (-1 underflow, 10 overflow).
struct BinCase {
    const char* fName;
    double fX;
    int fBin;
};

class HistogramBin : public ::testing::TestWithParam<BinCase> {};

TEST_P(HistogramBin, ValueLandsInItsBin) {
    const BinCase& c = GetParam();
    MCHistogramData h(10, 0.0, 10.0, false);
    ASSERT_TRUE(h.UpdateData(2.0, 1.0, c.fX));
    EXPECT_EQ(h.GetTotalWeight(), 2.0);
    EXPECT_EQ(h.GetUnderflowWeight(), c.fBin == -1 ? 2.0 : 0.0);
    EXPECT_EQ(h.GetOverflowWeight(), c.fBin == 10 ? 2.0 : 0.0);
    for (int b = 0; b < 10; ++b) {
        EXPECT_EQ(h.GetBinWeight(b), b == c.fBin ? 2.0 : 0.0) << "bin " << b;
    }
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, HistogramBin, ::testing::Values(
    BinCase{"Minimum", 0.0, 0}, BinCase{"InsideFirst", 0.999, 0}, BinCase{"Edge", 1.0, 1},
    BinCase{"Middle", 5.5, 5}, BinCase{"JustBelowMaximum", 9.999, 9},
    BinCase{"MaximumInLastBin", 10.0, 9}, BinCase{"Below", -0.5, -1}, BinCase{"Above", 10.5, 10},
    BinCase{"TinyAboveMaximum", std::nextafter(10.0, 11.0), 10}), ByName<BinCase>);
// clang-format on

TEST(MCHistogramData, DegenerateRangeTakesEveryValueInOneBin) {
    for (const auto& range : {std::pair<double, double>{3.0, 3.0}, {5.0, 1.0}, {0.0, kInf}}) {
        MCHistogramData h(10, range.first, range.second, true);
        EXPECT_TRUE(h.GetNBins() == 1 && h.GetBinWidth() == 0.0);
        h.UpdateData(1.0, 1.0, -100.0);
        h.UpdateData(1.0, 1.0, 3.0);
        EXPECT_EQ(h.GetBinWeight(0), 2.0);
    }
}

TEST(MCHistogramData, MomentsUseBothWeightsAndMergeChecksTheBins) {
    // Values 1 and 3 with f·g = 1 each: mean 2, sample variance 2; g scales only the moments.
    MCHistogramData h(4, 0.0, 4.0, true);
    h.UpdateData(1.0, 1.0, 1.0);
    h.UpdateData(0.5, 2.0, 3.0);
    EXPECT_EQ((std::vector<double>{h.GetTotalWeight(), h.GetTotalWeighted(), h.GetMean(),
                                   h.GetVariance()}),
              (std::vector<double>{1.5, 2.0, 2.0, 2.0}));
    EXPECT_TRUE(MCMV::IsMissing(MCHistogramData(4, 0.0, 4.0, false).GetVariance()));
    const MCHistogramData before = h;
    EXPECT_FALSE(h.Merge(MCHistogramData(5, 0.0, 4.0, true)));
    EXPECT_FALSE(h.Merge(MCHistogramData(4, 0.5, 4.5, true)));
    EXPECT_FALSE(h.Merge(MCHistogramData(4, 0.0, 4.0, false)));
    EXPECT_EQ(h.GetBinWeights(), before.GetBinWeights());
    EXPECT_EQ(h.GetTotalWeight(), before.GetTotalWeight());
}

} // namespace
