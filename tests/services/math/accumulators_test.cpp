#include "mcmath/mcaccumulators.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <random>
#include <vector>

using MCCommon_800::MCMV;
using namespace MCMath_800;

namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();

// Mean and M2 by the two-pass formula in long double: the reference for the one-pass updates.
struct TwoPass {
    long double fW = 0.0L;
    long double fMean = 0.0L;
    long double fM2 = 0.0L;
};

TwoPass ReferenceMoments(const std::vector<double>& x, const std::vector<double>& w) {
    TwoPass r;
    for (std::size_t i = 0; i < x.size(); ++i) {
        r.fW += w[i];
        r.fMean += static_cast<long double>(w[i]) * x[i];
    }
    r.fMean /= r.fW;
    for (std::size_t i = 0; i < x.size(); ++i) {
        const long double d = x[i] - r.fMean;
        r.fM2 += w[i] * d * d;
    }
    return r;
}

// Cross product Σ w·(a - mean_a)·(b - mean_b) by two passes in long double.
long double ReferenceXProd(const std::vector<double>& a, const std::vector<double>& b,
                           const std::vector<double>& w) {
    const TwoPass ra = ReferenceMoments(a, w);
    const TwoPass rb = ReferenceMoments(b, w);
    long double c = 0.0L;
    for (std::size_t i = 0; i < a.size(); ++i) {
        c += w[i] * (a[i] - ra.fMean) * (b[i] - rb.fMean);
    }
    return c;
}

} // namespace

// ------------------------------------------------------------------------------------------
// Pooling k random parts equals one pass, and both match the two-pass reference. The two
// results differ only in the order of rounding errors (O(n·eps) at worst for these
// well-conditioned data), hence 1e-12 relative.

class PoolSplit : public ::testing::TestWithParam<int> {};

TEST_P(PoolSplit, PooledPartsEqualOnePass) {
    const int k = GetParam();
    const auto uk = static_cast<std::size_t>(k);
    std::mt19937_64 gen(77u + uk);
    std::normal_distribution<double> normal(6.0, 2.0);
    std::uniform_real_distribution<double> weight(0.1, 3.0);
    std::uniform_int_distribution<std::size_t> part(0, uk - 1);
    // Three correlated columns for the cross products: x, x·z and 10 - x.
    std::vector<double> x, xz, w;
    MCContStats whole;
    MCCatStats wholeCat;
    MCHistogramData wholeHist(12, 0.0, 12.0, true);
    MCProvMeans wholeMeans(3, true);
    std::vector<MCContStats> parts(uk);
    std::vector<MCCatStats> cats(uk);
    std::vector<MCHistogramData> hists(uk, wholeHist);
    std::vector<MCProvMeans> means(uk, wholeMeans);
    for (int i = 0; i < 2000; ++i) {
        x.push_back(normal(gen));
        xz.push_back(x.back() * normal(gen));
        w.push_back(weight(gen));
        const std::vector<double> row{x.back(), xz.back(), 10.0 - x.back()};
        const std::size_t p = part(gen);
        ASSERT_TRUE(whole.Update(x.back(), w.back()) && parts[p].Update(x.back(), w.back()));
        EXPECT_EQ(wholeCat.Update(x.back(), w.back()), cats[p].Update(x.back(), w.back()));
        ASSERT_TRUE(wholeHist.UpdateData(w.back(), 1.0, x.back()));
        ASSERT_TRUE(hists[p].UpdateData(w.back(), 1.0, x.back()));
        ASSERT_TRUE(wholeMeans.Update(row, w.back()) && means[p].Update(row, w.back()));
    }
    MCContStats pooled;
    MCCatStats pooledCat;
    MCHistogramData pooledHist(12, 0.0, 12.0, true);
    MCProvMeans merged(3, true);
    for (std::size_t p = 0; p < uk; ++p) {
        pooled.Pool(parts[p]);
        pooledCat.Pool(cats[p]);
        ASSERT_TRUE(pooledHist.Merge(hists[p]));
        ASSERT_TRUE(merged.Merge(means[p]));
    }

    const TwoPass ref = ReferenceMoments(x, w);
    for (const MCContStats* s : {&whole, &pooled}) {
        EXPECT_EQ(s->GetCount(), 2000);
        EXPECT_NEAR_REL(s->GetSumFreqWeights(), static_cast<double>(ref.fW), 1e-12);
        EXPECT_NEAR_REL(s->GetMean(), static_cast<double>(ref.fMean), 1e-12);
        EXPECT_NEAR_REL(s->GetVariance(), static_cast<double>(ref.fM2 / (ref.fW - 1.0L)), 1e-12);
        double lo = 0.0;
        double hi = 0.0;
        ASSERT_TRUE(s->GetExtrema(lo, hi));
        EXPECT_EQ(lo, *std::min_element(x.begin(), x.end()));
        EXPECT_EQ(hi, *std::max_element(x.begin(), x.end()));
    }
    for (const MCProvMeans* m : {&wholeMeans, &merged}) {
        EXPECT_NEAR_REL(m->GetMeans()[0], static_cast<double>(ref.fMean), 1e-12);
        EXPECT_NEAR_REL(m->GetXProds().GetElem(0, 0), static_cast<double>(ref.fM2), 1e-12);
        // Column 2 is 10 - x: its cross product with x is -M2.
        EXPECT_NEAR_REL(m->GetXProds().GetElem(2, 0), -static_cast<double>(ref.fM2), 1e-12);
        EXPECT_NEAR_REL(m->GetXProds().GetElem(1, 0), static_cast<double>(ReferenceXProd(x, xz, w)),
                        1e-11);
        EXPECT_NEAR_REL(m->GetXProds().GetElem(1, 1),
                        static_cast<double>(ReferenceXProd(xz, xz, w)), 1e-12);
    }
    ASSERT_EQ(pooledCat.GetNCategories(true), wholeCat.GetNCategories(true));
    for (int c = 0; c < wholeCat.GetNCategories(true); ++c) {
        EXPECT_NEAR_REL(pooledCat.GetCatCount(c), wholeCat.GetCatCount(c), 1e-12);
    }
    EXPECT_NEAR_REL(pooledCat.GetRefusedWeight(), wholeCat.GetRefusedWeight(), 1e-12);
    for (int b = 0; b < 12; ++b) {
        EXPECT_NEAR_REL(pooledHist.GetBinWeight(b), wholeHist.GetBinWeight(b), 1e-12);
    }
    EXPECT_NEAR_REL(pooledHist.GetOverflowWeight(), wholeHist.GetOverflowWeight(), 1e-12);
    EXPECT_NEAR_REL(pooledHist.GetVariance(), wholeHist.GetVariance(), 1e-12);
}

INSTANTIATE_TEST_SUITE_P(Parts, PoolSplit, ::testing::Values(2, 3, 7, 16));

// Integer weights equal repeated rows.
TEST(AccumulatorWeights, IntegerWeightsEqualRepeatedRows) {
    std::mt19937_64 gen(31);
    std::uniform_real_distribution<double> value(-3.0, 9.0);
    std::uniform_int_distribution<int> reps(1, 5);
    MCContStats s[2];
    MCCatStats cat[2];
    MCProvMeans pm[2] = {MCProvMeans(2, true), MCProvMeans(2, true)};
    MCHistogramData h[2] = {MCHistogramData(8, -3.0, 9.0, true),
                            MCHistogramData(8, -3.0, 9.0, true)};
    for (int i = 0; i < 400; ++i) {
        const double x = value(gen);
        const std::vector<double> row{x, 0.5 * x * x};
        const int r = reps(gen);
        s[0].Update(x, r);
        cat[0].Update(x, r);
        pm[0].Update(row, r);
        h[0].UpdateData(r, 1.0, x);
        for (int j = 0; j < r; ++j) {
            s[1].Update(x);
            cat[1].Update(x, 1.0);
            pm[1].Update(row, 1.0);
            h[1].UpdateData(1.0, 1.0, x);
        }
    }
    EXPECT_EQ(s[0].GetSumFreqWeights(), s[1].GetSumFreqWeights());
    EXPECT_NEAR_REL(s[0].GetMean(), s[1].GetMean(), 1e-13);
    EXPECT_NEAR_REL(s[0].GetVariance(), s[1].GetVariance(), 1e-12);
    EXPECT_EQ(cat[0].GetCatCounts(), cat[1].GetCatCounts()); // sums of whole numbers: exact
    EXPECT_EQ(cat[0].GetRefusedWeight(), cat[1].GetRefusedWeight());
    for (int i = 0; i < 2; ++i) {
        EXPECT_NEAR_REL(pm[0].GetMeans()[static_cast<std::size_t>(i)],
                        pm[1].GetMeans()[static_cast<std::size_t>(i)], 1e-13);
        for (int j = 0; j <= i; ++j) {
            EXPECT_NEAR_REL(pm[0].GetXProds().GetElem(i, j), pm[1].GetXProds().GetElem(i, j),
                            1e-12);
        }
    }
    EXPECT_EQ(h[0].GetBinWeights(), h[1].GetBinWeights());
    EXPECT_NEAR_REL(h[0].GetVariance(), h[1].GetVariance(), 1e-12);
}

// ------------------------------------------------------------------------------------------
// Data far from zero keep their variance. The inputs are y = 1e9 + u with sd(u) = 1: the
// reference is the exact variance of those doubles (y - 1e9 is exact), computed two-pass in
// long double. Sums of raw powers would lose every digit here (Σy² ≈ 1e21 against a variance
// of 1). West's update loses about log10(|mean|/sd) = 9 digits in the worst case; in practice
// the errors of the running mean cancel and the result holds to about 1e-8. The bound 1e-6
// leaves room while failing any raw-power method by many orders.
TEST(AccumulatorShift, DataShiftedBy1e9KeepTheirVariance) {
    constexpr double kShift = 1e9;
    std::mt19937_64 gen(4242);
    std::normal_distribution<double> normal(0.0, 1.0);
    std::vector<double> y;
    std::vector<double> u;
    std::vector<double> ones;
    MCContStats stats;
    MCProvMeans means(2, true);
    for (int i = 0; i < 100000; ++i) {
        y.push_back(kShift + normal(gen));
        u.push_back(y.back() - kShift);
        ones.push_back(1.0);
        stats.Update(y.back());
        means.Update(std::vector<double>{y.back(), -y.back()}, 1.0);
    }
    const TwoPass ref = ReferenceMoments(u, ones);
    const double variance = static_cast<double>(ref.fM2 / (ref.fW - 1.0L));
    EXPECT_NEAR_REL(stats.GetVariance(), variance, 1e-6);
    // The running mean carries rounding errors of the size of ulp(1e9)/2 ≈ 6e-8 from each of
    // its n updates, damped only slowly (a random walk of about 1e-5 here): 1e-13 relative to
    // the mean itself.
    EXPECT_NEAR_REL(stats.GetMean(), kShift + static_cast<double>(ref.fMean), 1e-13);
    EXPECT_NEAR_REL(means.GetXProds().GetElem(0, 0), static_cast<double>(ref.fM2), 1e-6);
    EXPECT_NEAR_REL(means.GetXProds().GetElem(1, 0), -static_cast<double>(ref.fM2), 1e-6);

    // Pooling two shifted halves keeps it too.
    MCContStats a;
    MCContStats b;
    for (std::size_t i = 0; i < y.size(); ++i) {
        (i % 2 ? a : b).Update(y[i]);
    }
    a.Pool(b);
    EXPECT_NEAR_REL(a.GetVariance(), variance, 1e-6);
}

TEST(MCContStats, EmptyAndSingleValueReportMissing) {
    MCContStats s;
    double lo = 0.0;
    double hi = 0.0;
    EXPECT_FALSE(s.GetExtrema(lo, hi));
    EXPECT_TRUE(MCMV::IsMissing(lo) && MCMV::IsMissing(hi));
    EXPECT_TRUE(MCMV::IsMissing(s.GetMean()));
    s.Update(7.0);
    EXPECT_EQ(s.GetMean(), 7.0);
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
    double fX;
    double fWeight;
};

class RefusedUpdate : public ::testing::TestWithParam<BadUpdate> {};

TEST_P(RefusedUpdate, NothingChanges) {
    const BadUpdate& c = GetParam();
    MCContStats s;
    s.Update(1.0);
    MCProvMeans pm(1, true);
    pm.Update(std::vector<double>{1.0}, 1.0);
    MCHistogramData h(4, 0.0, 4.0, true);
    h.UpdateData(1.0, 1.0, 1.0);
    MCCatStats cat;
    cat.Update(1.0, 1.0);

    EXPECT_FALSE(s.Update(c.fX, c.fWeight));
    EXPECT_FALSE(pm.Update(std::vector<double>{c.fX}, c.fWeight));
    EXPECT_FALSE(h.UpdateData(c.fWeight, 1.0, c.fX));
    EXPECT_FALSE(cat.Update(c.fX, c.fWeight));
    EXPECT_EQ(s.GetCount(), 1);
    EXPECT_EQ(s.GetMean(), 1.0);
    EXPECT_EQ(pm.GetCount(), 1);
    EXPECT_EQ(pm.GetMeans()[0], 1.0);
    EXPECT_EQ(h.GetTotalWeight(), 1.0);
    EXPECT_EQ(h.GetMean(), 1.0);
    EXPECT_EQ(cat.GetSumCounts(), 1.0);
}

INSTANTIATE_TEST_SUITE_P(
    Table, RefusedUpdate,
    ::testing::Values(BadUpdate{"MissingValue", kNaN, 1.0}, BadUpdate{"InfiniteValue", kInf, 1.0},
                      BadUpdate{"MinusInfinity", -kInf, 1.0}, BadUpdate{"ZeroWeight", 2.0, 0.0},
                      BadUpdate{"NegativeWeight", 2.0, -1.0}, BadUpdate{"MissingWeight", 2.0, kNaN},
                      BadUpdate{"InfiniteWeight", 2.0, kInf}),
    [](const ::testing::TestParamInfo<BadUpdate>& p) { return p.param.fName; });

// ------------------------------------------------------------------------------------------
// MCCatStats: category of a value.

struct CatCase {
    const char* fName;
    double fValue;
    int fCategory; //!< -1: refused
};

class CatStatsCategory : public ::testing::TestWithParam<CatCase> {};

TEST_P(CatStatsCategory, ValueCountsForItsCategory) {
    const CatCase& c = GetParam();
    MCCatStats s;
    EXPECT_EQ(s.Update(c.fValue, 2.5), c.fCategory >= 0);
    if (c.fCategory < 0) {
        EXPECT_EQ(s.GetSumCounts(), 0.0);
        EXPECT_EQ(s.GetNCategories(true), 0);
        EXPECT_EQ(s.GetRefusedWeight(), 2.5);
        return;
    }
    EXPECT_EQ(s.GetCatCount(c.fCategory), 2.5);
    EXPECT_EQ(s.GetNCategories(true), c.fCategory + 1);
    EXPECT_EQ(s.GetNCategories(false), 1);
}

INSTANTIATE_TEST_SUITE_P(
    Table, CatStatsCategory,
    ::testing::Values(
        CatCase{"Zero", 0.0, 0}, CatCase{"Whole", 3.0, 3}, CatCase{"RoundsDown", 2.4, 2},
        CatCase{"HalfRoundsUp", 2.5, 3}, CatCase{"SmallNegative", -0.4, 0},
        CatCase{"MinusHalf", -0.5, -1}, CatCase{"Negative", -3.0, -1}, CatCase{"Missing", kNaN, -1},
        CatCase{"Infinite", kInf, -1},
        CatCase{"LargestCategory", MCCatStats::kMaxCategory, MCCatStats::kMaxCategory},
        CatCase{"BeyondLargest", MCCatStats::kMaxCategory + 1.0, -1}, CatCase{"Huge", 1e300, -1}),
    [](const ::testing::TestParamInfo<CatCase>& p) { return p.param.fName; });

TEST(MCCatStats, GapsCountAsEmptyCategories) {
    MCCatStats s;
    s.Update(0.0, 1.0);
    s.Update(4.0, 2.0);
    s.Update(4.2, 1.0);
    EXPECT_EQ(s.GetCatCounts(), (std::vector<double>{1.0, 0.0, 0.0, 0.0, 3.0}));
    EXPECT_EQ(s.GetNCategories(true), 5);
    EXPECT_EQ(s.GetNCategories(false), 2);
    EXPECT_EQ(s.GetCatCount(7), 0.0);
    EXPECT_EQ(s.GetCatCount(-1), 0.0);
    EXPECT_EQ(s.GetSumCounts(), 4.0);
    s.Pool(s);
    EXPECT_EQ(s.GetCatCount(4), 6.0);
    EXPECT_EQ(s.GetSumCounts(), 8.0);
}

// ------------------------------------------------------------------------------------------
// MCMeansXProdData::Merge

TEST(MCMeansXProdData, MergeRefusesAMismatchAndKeepsItsState) {
    MCProvMeans three(3, true);
    three.Update(std::vector<double>{1.0, 2.0, 3.0}, 1.0);
    three.Update(std::vector<double>{2.0, 0.0, 5.0}, 2.0);
    const MCProvMeans before = three;

    MCProvMeans two(2, true);
    two.Update(std::vector<double>{1.0, 2.0}, 1.0);
    EXPECT_FALSE(three.Merge(two));
    EXPECT_FALSE(two.Merge(three));
    MCProvMeans meansOnly(3, false);
    meansOnly.Update(std::vector<double>{1.0, 2.0, 3.0}, 1.0);
    EXPECT_FALSE(three.Merge(meansOnly));
    EXPECT_EQ(meansOnly.GetXProds().GetNRows(), 0);

    EXPECT_EQ(three.GetCount(), before.GetCount());
    EXPECT_EQ(three.GetMeans(), before.GetMeans());
    EXPECT_TRUE(three.GetXProds() == before.GetXProds());

    // A row of the wrong length is refused too.
    EXPECT_FALSE(three.Update(std::vector<double>{1.0, 2.0}, 1.0));
    // An empty accumulator of the same shape merges as a no-op; merging into an empty one
    // copies.
    EXPECT_TRUE(three.Merge(MCProvMeans(3, true)));
    MCProvMeans empty(3, true);
    EXPECT_TRUE(empty.Merge(three));
    EXPECT_EQ(empty.GetMeans(), three.GetMeans());
    EXPECT_TRUE(empty.GetXProds() == three.GetXProds());
}

TEST(MCMeansXProdData, MergeWithItselfDoublesTheWeights) {
    MCProvMeans pm(2, true);
    pm.Update(std::vector<double>{1.0, 4.0}, 1.0);
    pm.Update(std::vector<double>{3.0, 0.0}, 1.0);
    // Two rows: means (2, 2), C = [[2, -4], [-4, 8]].
    ASSERT_TRUE(pm.Merge(pm));
    EXPECT_EQ(pm.GetSumWeights(), 4.0);
    EXPECT_EQ(pm.GetMeans(), (std::vector<double>{2.0, 2.0}));
    EXPECT_EQ(pm.GetXProds().GetElem(0, 0), 4.0);
    EXPECT_EQ(pm.GetXProds().GetElem(1, 0), -8.0);
    EXPECT_EQ(pm.GetXProds().GetElem(1, 1), 16.0);
}

// ------------------------------------------------------------------------------------------
// MCHistogramData: where a value goes.

struct BinCase {
    const char* fName;
    double fX;
    int fBin; //!< -1 underflow, -2 overflow
};

class HistogramBin : public ::testing::TestWithParam<BinCase> {};

TEST_P(HistogramBin, ValueLandsInItsBin) {
    const BinCase& c = GetParam();
    MCHistogramData h(10, 0.0, 10.0, false);
    ASSERT_TRUE(h.UpdateData(2.0, 1.0, c.fX));
    EXPECT_EQ(h.GetTotalWeight(), 2.0);
    EXPECT_EQ(h.GetUnderflowWeight(), c.fBin == -1 ? 2.0 : 0.0);
    EXPECT_EQ(h.GetOverflowWeight(), c.fBin == -2 ? 2.0 : 0.0);
    for (int b = 0; b < 10; ++b) {
        EXPECT_EQ(h.GetBinWeight(b), b == c.fBin ? 2.0 : 0.0) << "bin " << b;
    }
}

INSTANTIATE_TEST_SUITE_P(
    Table, HistogramBin,
    ::testing::Values(BinCase{"Minimum", 0.0, 0}, BinCase{"InsideFirst", 0.999, 0},
                      BinCase{"Edge", 1.0, 1}, BinCase{"Middle", 5.5, 5},
                      BinCase{"JustBelowMaximum", 9.999, 9}, BinCase{"MaximumInLastBin", 10.0, 9},
                      BinCase{"Below", -0.5, -1}, BinCase{"Above", 10.5, -2},
                      BinCase{"TinyAboveMaximum", std::nextafter(10.0, 11.0), -2}),
    [](const ::testing::TestParamInfo<BinCase>& p) { return p.param.fName; });

TEST(MCHistogramData, DegenerateRangeTakesEveryValueInOneBin) {
    for (const auto& range : {std::pair<double, double>{3.0, 3.0}, {5.0, 1.0}, {0.0, kInf}}) {
        MCHistogramData h(10, range.first, range.second, true);
        EXPECT_EQ(h.GetNBins(), 1);
        EXPECT_EQ(h.GetBinWidth(), 0.0);
        h.UpdateData(1.0, 1.0, -100.0);
        h.UpdateData(1.0, 1.0, 3.0);
        EXPECT_EQ(h.GetBinWeight(0), 2.0);
        EXPECT_EQ(h.GetTotalWeight(), 2.0);
    }
}

TEST(MCHistogramData, MomentsUseBothWeightsAndMergeChecksTheBins) {
    // Values 1 and 3 with f·g = 1 each: mean 2, sample variance 2; g scales only the moments.
    MCHistogramData h(4, 0.0, 4.0, true);
    h.UpdateData(1.0, 1.0, 1.0);
    h.UpdateData(0.5, 2.0, 3.0);
    EXPECT_EQ(h.GetTotalWeight(), 1.5);
    EXPECT_EQ(h.GetTotalWeighted(), 2.0);
    EXPECT_EQ(h.GetMean(), 2.0);
    EXPECT_EQ(h.GetVariance(), 2.0);
    EXPECT_TRUE(MCMV::IsMissing(MCHistogramData(4, 0.0, 4.0, false).GetVariance()));

    const MCHistogramData before = h;
    EXPECT_FALSE(h.Merge(MCHistogramData(5, 0.0, 4.0, true)));
    EXPECT_FALSE(h.Merge(MCHistogramData(4, 0.5, 4.5, true)));
    EXPECT_FALSE(h.Merge(MCHistogramData(4, 0.0, 4.0, false)));
    EXPECT_EQ(h.GetBinWeights(), before.GetBinWeights());
    EXPECT_EQ(h.GetTotalWeight(), before.GetTotalWeight());
}
