// Weighted statistics accumulators of the math services: one pass over weighted values, then
// pooled across threads or data chunks.
//
// The fitting's descriptive passes and the simulation's workers feed these once per record or
// case, so an update touches only the object's own storage (no allocation once a category or
// bin exists). Every accumulator is a value (copyable) with the same shape: state, update,
// pool (Pool or Merge: add another accumulator of the same kind), finish (the getters).
//
// Moments are kept as a running weighted mean and a running weighted sum of squared (or
// crossed) deviations from it, never as sums of raw powers, so that data far from zero (a
// shift of 1e9) keep their variance:
//   update (West 1979, "Updating mean and variance estimates: an improved method", CACM 22(9)):
//     W' = W + w,  d = x - mean,  mean' = mean + d·w/W',  M2' = M2 + w·d·(x - mean')
//   pool (Chan, Golub and LeVeque 1979/1983, the pairwise formula for two chunks A and B):
//     W = Wa + Wb,  d = meanB - meanA,  mean = meanA + d·Wb/W,  M2 = M2a + M2b + d²·Wa·Wb/W
// Both are backward stable: the relative error of M2 grows like n·eps·(1 + |mean|/sd) at worst
// and like sqrt(n)·eps·(1 + |mean|/sd) typically (Chan, Golub and LeVeque 1983, "Algorithms for
// computing the sample variance: analysis and recommendations", Am. Stat. 37(3)).
//
// Weights are frequency weights: a weight of 3 counts like three equal rows. A value that is
// missing or not finite, and a weight that is missing, not finite or not positive, is refused:
// the update returns false and the moments do not change.
#pragma once

#include "mcmath/mcsymmatrix.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <vector>

namespace MCMath_800 {

// ------------------------------------------------------------------------------------------
//! Weighted count, mean, variance and extremes of one continuous quantity. The simulation keeps
//! one per input and per continuous target and pools the workers' objects into the master's.
class MCContStats {
public:
    MCContStats() = default;

    //! Adds x with weight 1.0; false (nothing changed) when x is missing or not finite.
    bool Update(double x) { return Update(x, 1.0); }
    //! Adds x with frequency weight `weight` (West's update); false when x is missing or not
    //! finite, or the weight is not a finite positive number. Inline: the simulation calls it
    //! a dozen times per case from another library.
    bool Update(double x, double weight) {
        if (!std::isfinite(x) || !std::isfinite(weight) || !(weight > 0.0)) {
            return false;
        }
        fMin = std::min(fMin, x);
        fMax = std::max(fMax, x);
        // West's update (header note); w/W' first, so that the first value sets the mean
        // exactly. d overflows only for x and the mean near opposite ends of the double range:
        // the convex combination then keeps the mean between them, and M2 overflows (the
        // variance is missing).
        fSumWeights += weight;
        const double d = x - fMean;
        const double r = weight / fSumWeights;
        fMean = std::isfinite(d) ? fMean + d * r : fMean * (1.0 - r) + x * r;
        fSumSqDev += weight * d * (x - fMean);
        ++fCount;
        return true;
    }
    //! Adds every value of `other` (Chan's pairwise formula); `other` may be this object.
    void Pool(const MCContStats& other);
    //! Forgets every value.
    void Reset() { *this = MCContStats(); }

    //! W, the sum of the weights of the accepted values (the "n" of a standard error).
    double GetSumFreqWeights() const { return fSumWeights; }
    //! Number of accepted updates (unweighted).
    std::int64_t GetCount() const { return fCount; }
    //! Weighted mean; missing before the first value.
    double GetMean() const;
    //! Weighted sample variance M2/(W - 1), the unbiased estimate for frequency weights:
    //! √(variance) is the sample standard deviation and √(variance/W) the standard error of the
    //! mean. Missing when W ≤ 1, and when M2 overflowed (values near both ends of the double
    //! range).
    double GetVariance() const;
    //! M2, the weighted sum of squared deviations from the mean (0 before the first value).
    double GetSumSqDev() const { return fSumSqDev; }
    //! The smallest and largest accepted values; both missing (and false) before the first.
    bool GetExtrema(double& minimum, double& maximum) const;

    //! Statistics of values summarised elsewhere: W, the number of values, the weighted mean,
    //! M2 and the extremes (the simulation keeps the inputs' moments in its cross products and
    //! only their extremes per case). No value when W is not positive.
    static MCContStats FromSummary(double sumWeights, std::int64_t count, double mean,
                                   double sumSqDev, double minimum, double maximum) {
        MCContStats stats;
        if (sumWeights > 0.0 && count > 0) {
            stats.fSumWeights = sumWeights;
            stats.fCount = count;
            stats.fMean = mean;
            stats.fSumSqDev = sumSqDev;
            stats.fMin = minimum;
            stats.fMax = maximum;
        }
        return stats;
    }

    //! Diagnostic listing through the display stream.
    void Display() const;

private:
    double fSumWeights = 0.0; //!< W
    double fMean = 0.0;       //!< running weighted mean (0 while W = 0)
    double fSumSqDev = 0.0;   //!< M2 = Σ w·(x - mean)²
    //! Smallest value; +∞ before the first, so that an update needs no test for the first
    //! value (GetExtrema reports missing then).
    double fMin = std::numeric_limits<double>::infinity();
    //! Largest value; −∞ before the first.
    double fMax = -std::numeric_limits<double>::infinity();
    std::int64_t fCount = 0; //!< accepted updates
};

// ------------------------------------------------------------------------------------------
//! Weighted counts of the whole values 0, 1, 2, ... of one discrete quantity: the category
//! counts of a discrete covariate or of a factor in the fitting, and of a categorical target in
//! the simulation.
//!
//! A value x counts for category c = trunc(x + 0.5), the rule by which factor values become
//! category codes (2.4 → 2, 2.5 → 3, -0.4 → 0). Values at or below -0.5 (no category), missing or
//! non-finite values, values whose category would exceed kMaxCategory, and unusable weights are
//! refused: Update returns false and only the refused weight grows (when the weight is usable).
//! The count vector grows to the largest category seen, so categories that never occur between
//! 0 and the largest have count 0.
class MCCatStats {
public:
    //! Largest category counted; bounds the memory one wild value can claim (8 MB of counts).
    static constexpr int kMaxCategory = (1 << 20) - 1;

    MCCatStats() = default;

    //! Adds `weight` to the count of category trunc(value + 0.5); see the class note.
    bool Update(double value, double weight);
    //! Adds the counts (and refused weight) of `other`; `other` may be this object.
    void Pool(const MCCatStats& other);
    //! Forgets every count.
    void Reset() { *this = MCCatStats(); }

    //! Weighted count per category 0 .. GetNCategories(true) - 1.
    const std::vector<double>& GetCatCounts() const { return fvCounts; }
    //! Weighted count of category c; 0 for a category never seen or out of range.
    double GetCatCount(int c) const;
    //! Sum of all counts (the accepted weight).
    double GetSumCounts() const { return fSumCounts; }
    //! With `includeEmpty` true: the length of the count vector, largest category + 1 (the K of
    //! sums over categories 0 .. K-1). With false: the number of categories with a positive
    //! count.
    int GetNCategories(bool includeEmpty) const;
    //! Weight of the refused values that had a usable weight.
    double GetRefusedWeight() const { return fRefusedWeight; }

    //! Diagnostic listing through the display stream.
    void Display() const;

private:
    std::vector<double> fvCounts; //!< weighted count per category
    double fSumCounts = 0.0;      //!< Σ counts
    double fRefusedWeight = 0.0;  //!< weight of refused values
};

// ------------------------------------------------------------------------------------------
//! Weighted means and the matrix of weighted sums of cross products of deviations from the
//! means of n variables: C(i, j) = Σ w·(x_i - mean_i)·(x_j - mean_j). C/(W-1) is the sample
//! covariance matrix and C(i, j)/√(C(i, i)·C(j, j)) the Pearson correlation.
//!
//! This is the data half of MCProvMeans, which adds the row update; the simulation merges
//! the workers' objects through it.
class MCMeansXProdData {
public:
    //! No variables; cross products kept.
    MCMeansXProdData() = default;
    //! `nVars` variables; `keepXProds` false keeps the means only (GetXProds stays empty).
    explicit MCMeansXProdData(int nVars, bool keepXProds = true);
    virtual ~MCMeansXProdData() = default;
    MCMeansXProdData(const MCMeansXProdData&) = default;
    MCMeansXProdData& operator=(const MCMeansXProdData&) = default;

    //! Resizes to `nVars` variables (negative counts as 0) and forgets every row.
    void SetNVars(int nVars);
    int GetNVars() const { return fNVars; }
    //! Whether the cross products are kept.
    bool GetKeepXProds() const { return fbKeepXProds; }
    //! Forgets every row, keeping the size.
    void Reset();

    //! Adds the rows of `other` (Chan's pairwise formula for means and cross products). False,
    //! with this object unchanged, when the numbers of variables or the keep-cross-products
    //! flags differ.
    bool Merge(const MCMeansXProdData& other);

    //! W, the sum of the weights of the accepted rows.
    double GetSumWeights() const { return fSumWeights; }
    //! Number of accepted rows (unweighted).
    std::int64_t GetCount() const { return fCount; }
    //! Weighted means, one per variable; all 0 before the first row (check GetSumWeights).
    const std::vector<double>& GetMeans() const { return fvMeans; }
    //! The n x n matrix C of weighted sums of cross products of deviations; 0 before the
    //! first row, 0 x 0 when the cross products are not kept. The matrix holds the rows added
    //! up to this call: the sums are kept packed (see fvXProdSums) and copied into it when it
    //! is asked for after an update, so call again after adding rows (not safe from two
    //! threads at once on one object, like every update).
    const MCSymMatrix& GetXProds() const;

    //! Diagnostic listing through the display stream.
    void Display() const;

protected:
    int fNVars = 0;              //!< n
    bool fbKeepXProds = true;    //!< whether C is kept
    double fSumWeights = 0.0;    //!< W
    std::int64_t fCount = 0;     //!< accepted rows
    std::vector<double> fvMeans; //!< running weighted means
    //! C as it accumulates: the lower triangle packed row by row, C(i, j) for j ≤ i at
    //! i(i + 1)/2 + j, so that a row update runs through it in order; empty when not kept.
    std::vector<double> fvXProdSums;
    mutable MCSymMatrix fXProds;        //!< C for GetXProds, n x n when kept
    mutable bool fbXProdsStale = false; //!< fvXProdSums changed since fXProds was filled
    std::vector<double> fvDelta;        //!< scratch: deviations of the row being added
};

//! Accumulates rows of n values into an MCMeansXProdData: the fitting's means and
//! correlations of the covariates, the simulation's means and correlations of the inputs and
//! targets.
class MCProvMeans : public MCMeansXProdData {
public:
    MCProvMeans() = default;
    //! `nVars` variables; `keepXProds` as for MCMeansXProdData.
    MCProvMeans(int nVars, bool keepXProds) : MCMeansXProdData(nVars, keepXProds) {}

    //! Adds one row with frequency weight `weight` (the multivariate form of West's update:
    //! with d = x - mean before the update and r = w·W/W', C += r·d·dᵀ, n(n + 1)/2 products
    //! into the packed sums, no allocation). False, with nothing changed, when the row does
    //! not hold exactly GetNVars() values, a value is missing or not finite, or the weight is
    //! not a finite positive number.
    bool Update(const std::vector<double>& values, double weight);
    //! As above over `n` values starting at `values`.
    bool Update(const double* values, int n, double weight);
};

// ------------------------------------------------------------------------------------------
//! Equal-width histogram of one continuous covariate in the fitting: the chi-square and
//! Empirical steps read its bin weights as the covariate's distribution. Also keeps the
//! weighted mean and, on request, the weighted variance.
//!
//! Every value comes with a frequency weight f and a regression weight g. The bin weights and
//! the total weight are sums of f; the mean and variance use w = f·g.
//!
//! The range [minimum, maximum] is closed: the maximum belongs to the last bin (the fitting
//! builds the histogram over the observed extremes, so its largest value must be counted).
//! Bin b holds minimum + b·width ≤ x < minimum + (b+1)·width, the last bin also x = maximum.
//! Values outside the range go to an underflow or overflow weight and still count in the total
//! weight, the mean and the variance. A degenerate range (maximum ≤ minimum, or fewer than two
//! bins requested with an empty range) gives one bin of width 0 that takes every value.
class MCHistogramData {
public:
    //! One bin over [-1, 1], variance not kept.
    MCHistogramData() : MCHistogramData(1, -1.0, 1.0, false) {}
    //! `nBins` bins (fewer than 1 counts as 1) over [minVal, maxVal]; `keepVariance` asks for
    //! the weighted variance.
    MCHistogramData(int nBins, double minVal, double maxVal, bool keepVariance);
    virtual ~MCHistogramData() = default;
    MCHistogramData(const MCHistogramData&) = default;
    MCHistogramData& operator=(const MCHistogramData&) = default;

    //! Adds x with frequency weight f and regression weight g. False (nothing changed) when x
    //! is missing or not finite, or f or g is not a finite positive number.
    bool UpdateData(double f, double g, double x);
    //! Adds the values of `other`. False, with this object unchanged, when the bins differ
    //! (number, minimum, width) or the keep-variance flags differ.
    bool Merge(const MCHistogramData& other);

    int GetNBins() const { return static_cast<int>(fvBinWeights.size()); }
    double GetMinimum() const { return fMin; }
    double GetMaximum() const { return fMax; }
    //! (maximum - minimum)/bins, 0 for the degenerate range.
    double GetBinWidth() const { return fWidth; }
    //! Sum of the frequency weights per bin.
    const std::vector<double>& GetBinWeights() const { return fvBinWeights; }
    //! Frequency weight of bin b; 0 out of range.
    double GetBinWeight(int b) const;
    //! Sum of the frequency weights of every accepted value, inside the range or not.
    double GetTotalWeight() const { return fTotalFreq; }
    //! Frequency weight of the values below the minimum, above the maximum.
    double GetUnderflowWeight() const { return fUnderflow; }
    double GetOverflowWeight() const { return fOverflow; }
    //! Σ f·g of every accepted value.
    double GetTotalWeighted() const { return fMoments.GetSumFreqWeights(); }
    //! Mean of every accepted value with weights f·g; missing before the first.
    double GetMean() const { return fMoments.GetMean(); }
    //! Sample variance with weights f·g (divisor Σ f·g - 1); missing when not kept or when
    //! Σ f·g ≤ 1.
    double GetVariance() const;
    bool GetKeepVariance() const { return fbKeepVariance; }

    //! Diagnostic listing through the display stream.
    void Display() const;

private:
    double fMin;                      //!< lower end of the range
    double fMax;                      //!< upper end of the range
    double fWidth;                    //!< bin width, 0 for the degenerate range
    double fInvWidth;                 //!< 1/width, 0 for the degenerate range
    bool fbKeepVariance;              //!< whether the variance is reported
    std::vector<double> fvBinWeights; //!< Σ f per bin
    double fTotalFreq = 0.0;          //!< Σ f
    double fUnderflow = 0.0;          //!< Σ f below the minimum
    double fOverflow = 0.0;           //!< Σ f above the maximum
    MCContStats fMoments;             //!< mean, M2 and count with weights f·g
};

} // namespace MCMath_800
