#include "mcmath/mcaccumulators.h"

#include "mccommon/display.h"
#include "mccommon/mcmv.h"

#include <algorithm>
#include <cmath>

namespace MCMath_800 {

using MCCommon_800::MCMV;

namespace {

//! A frequency weight the accumulators accept: finite and positive.
bool IsUsableWeight(double w) {
    return std::isfinite(w) && w > 0.0;
}

//! The mean moved a share `r` (0 < r ≤ 1) of the way towards `x`, given d = x - mean. Normally
//! mean + d·r; when d overflows (x and the mean near opposite ends of the double range) the
//! convex combination mean·(1 - r) + x·r, which lies between the two and cannot overflow. The
//! sum of squared deviations of such data does overflow: it becomes infinite, and the
//! variance read from it is missing.
double MoveMean(double mean, double x, double d, double r) {
    return std::isfinite(d) ? mean + d * r : mean * (1.0 - r) + x * r;
}

// Chan, Golub and LeVeque's pairwise combination of two chunks A (the running state) and B:
// W = Wa + Wb, d = meanB - meanA, mean = meanA + d·(Wb/W), M2 = M2a + M2b + d²·Wa·(Wb/W).
// With Wa = 0 the result is exactly chunk B.
void ChanPool(double wB, double meanB, double m2B, double& wA, double& meanA, double& m2A) {
    const double w = wA + wB;
    const double d = meanB - meanA;
    const double r = wB / w;
    m2A += m2B + d * d * wA * r;
    meanA = MoveMean(meanA, meanB, d, r);
    wA = w;
}

//! Adds c·d·dᵀ to the packed lower triangle `packed` (row i holds i + 1 entries).
inline void AddOuterProduct(int n, double c, const double* d, double* packed) {
    for (int i = 0; i < n; ++i) {
        const double di = c * d[i];
        for (int j = 0; j <= i; ++j) {
            packed[j] += di * d[j];
        }
        packed += i + 1;
    }
}

//! The same for a size known when compiling, so that the loops unroll.
template <int N> void AddOuterProduct(double c, const double* d, double* packed) {
    AddOuterProduct(N, c, d, packed);
}

//! A variance from a sum of squared deviations: missing when that sum overflowed.
double FiniteOrMissing(double x) {
    return std::isfinite(x) ? x : MCMV::Missing();
}

//! Equality that also holds between two missing values.
bool SameValue(double a, double b) {
    return a == b || (MCMV::IsMissing(a) && MCMV::IsMissing(b));
}

} // namespace

// ------------------------------------------------------------------------------------------
// MCContStats

void MCContStats::Pool(const MCContStats& other) {
    if (other.fCount == 0) {
        return;
    }
    if (fCount == 0) {
        *this = other;
        return;
    }
    const MCContStats b = other; // `other` may be this object
    ChanPool(b.fSumWeights, b.fMean, b.fSumSqDev, fSumWeights, fMean, fSumSqDev);
    fMin = std::min(fMin, b.fMin);
    fMax = std::max(fMax, b.fMax);
    fCount += b.fCount;
}

double MCContStats::GetMean() const {
    return fCount > 0 ? fMean : MCMV::Missing();
}

double MCContStats::GetVariance() const {
    return fSumWeights > 1.0 ? FiniteOrMissing(fSumSqDev / (fSumWeights - 1.0)) : MCMV::Missing();
}

bool MCContStats::GetExtrema(double& minimum, double& maximum) const {
    if (fCount == 0) {
        minimum = MCMV::Missing();
        maximum = MCMV::Missing();
        return false;
    }
    minimum = fMin;
    maximum = fMax;
    return true;
}

void MCContStats::Display() const {
    using namespace MCDisplay_800;
    const DisplayFrame frame("MCContStats display start", "MCContStats display end");
    double lo = 0.0;
    double hi = 0.0;
    GetExtrema(lo, hi);
    DisplayI("Count", fCount);
    DisplayD("Sum of weights", fSumWeights);
    DisplayD("Mean", GetMean());
    DisplayD("Variance", GetVariance());
    DisplayD("Minimum", lo);
    DisplayD("Maximum", hi);
}

// ------------------------------------------------------------------------------------------
// MCCatStats

bool MCCatStats::Update(double value, double weight) {
    if (!IsUsableWeight(weight)) {
        return false;
    }
    // value > -0.5 also rejects a missing value; the upper test keeps the cast defined.
    if (!(value > -0.5) || !(value + 0.5 < kMaxCategory + 1.0)) {
        fRefusedWeight += weight;
        return false;
    }
    const auto c = static_cast<std::size_t>(value + 0.5);
    if (c >= fvCounts.size()) {
        fvCounts.resize(c + 1, 0.0);
    }
    fvCounts[c] += weight;
    fSumCounts += weight;
    return true;
}

void MCCatStats::Pool(const MCCatStats& other) {
    const std::size_t n = other.fvCounts.size();
    if (n > fvCounts.size()) {
        fvCounts.resize(n, 0.0);
    }
    for (std::size_t c = 0; c < n; ++c) {
        fvCounts[c] += other.fvCounts[c];
    }
    fSumCounts += other.fSumCounts;
    fRefusedWeight += other.fRefusedWeight;
}

double MCCatStats::GetCatCount(int c) const {
    if (c < 0 || static_cast<std::size_t>(c) >= fvCounts.size()) {
        return 0.0;
    }
    return fvCounts[static_cast<std::size_t>(c)];
}

int MCCatStats::GetNCategories(bool includeEmpty) const {
    if (includeEmpty) {
        return static_cast<int>(fvCounts.size());
    }
    return static_cast<int>(
        std::count_if(fvCounts.begin(), fvCounts.end(), [](double v) { return v > 0.0; }));
}

void MCCatStats::Display() const {
    using namespace MCDisplay_800;
    const DisplayFrame frame("MCCatStats display start", "MCCatStats display end");
    DisplayI("Number of categories", GetNCategories(true));
    DisplayDV("Category counts", fvCounts);
    DisplayD("Sum of counts", fSumCounts);
    DisplayD("Refused weight", fRefusedWeight);
}

// ------------------------------------------------------------------------------------------
// MCMeansXProdData and MCProvMeans

MCMeansXProdData::MCMeansXProdData(int nVars, bool keepXProds) : fbKeepXProds(keepXProds) {
    SetNVars(nVars);
}

void MCMeansXProdData::SetNVars(int nVars) {
    fNVars = std::max(0, nVars);
    Reset();
}

void MCMeansXProdData::Reset() {
    const auto n = static_cast<std::size_t>(fNVars);
    fSumWeights = 0.0;
    fCount = 0;
    fvMeans.assign(n, 0.0);
    fvDelta.assign(n, 0.0);
    fvXProdSums.assign(fbKeepXProds ? n * (n + 1) / 2 : 0, 0.0);
    fXProds.SetNRows(fbKeepXProds ? fNVars : 0);
    fbXProdsStale = false;
}

const MCSymMatrix& MCMeansXProdData::GetXProds() const {
    if (fbXProdsStale) {
        std::size_t k = 0;
        for (int i = 0; i < fNVars; ++i) {
            for (int j = 0; j <= i; ++j) {
                fXProds.SetElem(i, j, fvXProdSums[k++]);
            }
        }
        fbXProdsStale = false;
    }
    return fXProds;
}

bool MCMeansXProdData::Merge(const MCMeansXProdData& other) {
    if (other.fNVars != fNVars || other.fbKeepXProds != fbKeepXProds) {
        return false;
    }
    if (other.fCount == 0) {
        return true;
    }
    if (&other == this) {
        const MCMeansXProdData copy(other);
        return Merge(copy);
    }
    if (fCount == 0) {
        fSumWeights = other.fSumWeights;
        fCount = other.fCount;
        fvMeans = other.fvMeans;
        fvXProdSums = other.fvXProdSums;
        fbXProdsStale = true;
        return true;
    }
    // Chan's pairwise formula, per element: C = Ca + Cb + (Wa·Wb/W)·d·dᵀ, d = meanB - meanA.
    const double w = fSumWeights + other.fSumWeights;
    const double r = other.fSumWeights / w;
    const double s = fSumWeights * r;
    for (int i = 0; i < fNVars; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        fvDelta[ui] = other.fvMeans[ui] - fvMeans[ui];
    }
    if (fbKeepXProds) {
        std::size_t k = 0;
        for (int i = 0; i < fNVars; ++i) {
            const double di = s * fvDelta[static_cast<std::size_t>(i)];
            for (int j = 0; j <= i; ++j, ++k) {
                fvXProdSums[k] += other.fvXProdSums[k] + di * fvDelta[static_cast<std::size_t>(j)];
            }
        }
        fbXProdsStale = true;
    }
    for (std::size_t i = 0; i < fvMeans.size(); ++i) {
        fvMeans[i] = MoveMean(fvMeans[i], other.fvMeans[i], fvDelta[i], r);
    }
    fSumWeights = w;
    fCount += other.fCount;
    return true;
}

void MCMeansXProdData::Display() const {
    using namespace MCDisplay_800;
    const DisplayFrame frame("MCMeansXProdData display start", "MCMeansXProdData display end");
    DisplayI("Number of variables", fNVars);
    DisplayI("Count", fCount);
    DisplayD("Sum of weights", fSumWeights);
    DisplayDV("Means", fvMeans);
    std::vector<double> row;
    const MCSymMatrix& xprods = GetXProds();
    for (int i = 0; i < xprods.GetNRows(); ++i) {
        xprods.GetRow(i, row);
        DisplayDV("Cross products row", row);
    }
}

bool MCProvMeans::Update(const std::vector<double>& values, double weight) {
    return Update(values.data(), static_cast<int>(values.size()), weight);
}

bool MCProvMeans::Update(const double* values, int n, double weight) {
    if (n != fNVars || !IsUsableWeight(weight)) {
        return false;
    }
    bool finite = true; // one test after the loop: no branch per value
    for (int i = 0; i < n; ++i) {
        finite &= std::isfinite(values[i]);
    }
    if (!finite) {
        return false;
    }
    // Multivariate West update: with d = x - mean (before) and W' = W + w, r = w/W',
    // mean' = mean + r·d and C' = C + w·d·(x - mean')ᵀ = C + (r·W)·d·dᵀ.
    const double wOld = fSumWeights;
    fSumWeights += weight;
    const double r = weight / fSumWeights;
    const double rc = r * wOld;
    double* means = fvMeans.data();
    double* delta = fvDelta.data();
    for (int i = 0; i < n; ++i) {
        const double d = values[i] - means[i];
        delta[i] = d;
        means[i] = MoveMean(means[i], values[i], d, r);
    }
    if (fbKeepXProds && wOld > 0.0) {
        // A simulation updates a handful of variables per case: the loops unrolled for its
        // sizes run several times faster than the general triangle (same operations, same
        // order, same result).
        using Kernel = void (*)(double, const double*, double*);
        static constexpr Kernel kUnrolled[] = {nullptr,
                                               nullptr,
                                               &AddOuterProduct<2>,
                                               &AddOuterProduct<3>,
                                               &AddOuterProduct<4>,
                                               &AddOuterProduct<5>,
                                               &AddOuterProduct<6>,
                                               &AddOuterProduct<7>,
                                               &AddOuterProduct<8>};
        if (n >= 2 && n <= 8) {
            kUnrolled[n](rc, delta, fvXProdSums.data());
        } else {
            AddOuterProduct(n, rc, delta, fvXProdSums.data());
        }
        fbXProdsStale = true;
    }
    ++fCount;
    return true;
}

// ------------------------------------------------------------------------------------------
// MCHistogramData

MCHistogramData::MCHistogramData(int nBins, double minVal, double maxVal, bool keepVariance)
    : fMin(minVal), fMax(maxVal), fWidth(0.0), fInvWidth(0.0), fbKeepVariance(keepVariance) {
    const double range = maxVal - minVal;
    int n = std::max(1, nBins);
    if (std::isfinite(range) && range > 0.0) {
        fWidth = range / n;
        fInvWidth = n / range;
    } else {
        n = 1;
    }
    fvBinWeights.assign(static_cast<std::size_t>(n), 0.0);
}

bool MCHistogramData::UpdateData(double f, double g, double x) {
    const double w = f * g;
    if (!std::isfinite(x) || !IsUsableWeight(f) || !IsUsableWeight(g) || !IsUsableWeight(w)) {
        return false;
    }
    if (fWidth == 0.0) {
        fvBinWeights[0] += f;
    } else if (x < fMin) {
        fUnderflow += f;
    } else if (x > fMax) {
        fOverflow += f;
    } else {
        // The index is below n except for x at (or rounding to) the maximum: the last bin.
        const auto last = fvBinWeights.size() - 1;
        const auto b = std::min(static_cast<std::size_t>((x - fMin) * fInvWidth), last);
        fvBinWeights[b] += f;
    }
    fTotalFreq += f;
    fMoments.Update(x, w);
    return true;
}

bool MCHistogramData::Merge(const MCHistogramData& other) {
    if (other.fvBinWeights.size() != fvBinWeights.size() || !SameValue(other.fMin, fMin) ||
        !SameValue(other.fWidth, fWidth) || other.fbKeepVariance != fbKeepVariance) {
        return false;
    }
    if (&other == this) {
        const MCHistogramData copy(other);
        return Merge(copy);
    }
    for (std::size_t b = 0; b < fvBinWeights.size(); ++b) {
        fvBinWeights[b] += other.fvBinWeights[b];
    }
    fTotalFreq += other.fTotalFreq;
    fUnderflow += other.fUnderflow;
    fOverflow += other.fOverflow;
    fMoments.Pool(other.fMoments);
    return true;
}

double MCHistogramData::GetBinWeight(int b) const {
    if (b < 0 || static_cast<std::size_t>(b) >= fvBinWeights.size()) {
        return 0.0;
    }
    return fvBinWeights[static_cast<std::size_t>(b)];
}

double MCHistogramData::GetVariance() const {
    return fbKeepVariance ? fMoments.GetVariance() : MCMV::Missing();
}

void MCHistogramData::Display() const {
    using namespace MCDisplay_800;
    const DisplayFrame frame("MCHistogramData display start", "MCHistogramData display end");
    DisplayI("Number of bins", GetNBins());
    DisplayD("Minimum", fMin);
    DisplayD("Maximum", fMax);
    DisplayD("Bin width", fWidth);
    DisplayDV("Bin weights", fvBinWeights);
    DisplayD("Total weight", fTotalFreq);
    DisplayD("Underflow weight", fUnderflow);
    DisplayD("Overflow weight", fOverflow);
    DisplayD("Mean", GetMean());
    DisplayD("Variance", GetVariance());
}

} // namespace MCMath_800
