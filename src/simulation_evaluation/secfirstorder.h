// SECFirstOrderIndices: first-order sensitivity indices of every simulated input for every
// continuous target, from the cases of the run itself, without extra scoring.
//
//   S1(X_k) = Var(E[Y | X_k]) / Var(Y)
//
// estimated by the correlation ratio over a partition of X_k into bins (Pearson's η², with the
// small-sample correction of Kelley's ε², 1935): with n cases, B non-empty bins, bin means ȳ_b
// of n_b cases, the between sum of squares SSB = Σ n_b (ȳ_b − ȳ)², the total SST and the within
// mean square MSW = (SST − SSB) / (n − B),
//
//   S1 ≈ (SSB − (B − 1)·MSW) / SST,
//
// since E[SSB] = n·Var(E[Y | bin]) + (B − 1)·σ²_within. The ratio needs no independence of the
// inputs: it is the share of Var(Y) that X_k alone explains, whatever X_k carries of the others.
//
// Bins: a categorical input has one per category, a discrete input with few values one per
// value, every other input 64 bins of width 1/8 of its normal score z on [−4, 4) and one bin
// on each side. A monotone input is a function of z, so bins in z are bins in the input, and
// they lose little of its variance inside the bins whatever its skew, where equal-probability
// bins of a skewed input lose much of it in the wide outer bins.
//
// The accumulator keeps per bin the case count and the sum of each target's difference from a
// centre (a pilot mean, to keep the sums small); SST comes from the target's own statistics.
// Counts and sums add, so workers merge exactly.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace MCMCSP_800 {

class SECFirstOrderIndices {
public:
    //! Bins over the normal score: one below −4, 64 across [−4, 4), one from 4 up.
    static constexpr int kNormalScoreBins = 66;

    //! The bin of normal score z among kNormalScoreBins; the last bin for a missing z.
    static int NormalScoreBin(double z) {
        const double at = (z + 4.0) * 8.0 + 1.0;
        if (!(at >= 1.0)) {
            return at < 1.0 ? 0 : kNormalScoreBins - 1;
        }
        return at >= kNormalScoreBins - 1 ? kNormalScoreBins - 1 : static_cast<int>(at);
    }

    //! Sizes the accumulator: `bins[k]` bins for input k, `centres` one per target.
    void Reset(const std::vector<int>& bins, const std::vector<double>& centres);
    //! Adds one case: `bin[k]` the bin of input k (−1 leaves the input out of this case),
    //! `y[t]` the value of target t.
    void Add(const int* bin, const double* y) {
        const std::size_t nTargets = fvCentres.size();
        for (std::size_t k = 0; k < fvOffsets.size(); ++k) {
            if (bin[k] < 0) {
                continue;
            }
            const std::size_t cell = fvOffsets[k] + static_cast<std::size_t>(bin[k]);
            fvCounts[cell] += 1.0;
            double* sums = &fvSums[cell * nTargets];
            for (std::size_t t = 0; t < nTargets; ++t) {
                sums[t] += y[t] - fvCentres[t];
            }
        }
    }
    //! Adds the cases of `other` (the same inputs, bins and centres); false when they differ.
    bool Merge(const SECFirstOrderIndices& other);

    //! S1 of input `input` for target `target`, whose n values have total sum of squares `sst`
    //! (n − 1 times their variance). Missing with fewer than two non-empty bins, too few cases
    //! for the correction or no variance; clamped to [0, 1].
    double Index(std::size_t input, std::size_t target, double sst) const;
    std::size_t GetNInputs() const { return fvOffsets.size(); }

private:
    std::vector<std::size_t> fvOffsets; //!< first cell of each input
    std::vector<std::size_t> fvNBins;   //!< bins of each input
    std::vector<double> fvCentres;      //!< per target: the centre of its sums
    std::vector<double> fvCounts;       //!< per cell: cases
    std::vector<double> fvSums;         //!< per cell and target: Σ (y − centre)
};

} // namespace MCMCSP_800
