// SECQuantileSummary: the percentiles of one continuous target, in memory that does not grow
// with the number of cases.
//
// Up to kExactValues values (1 MB) the summary keeps every value and its percentiles are exact
// order statistics. Past that it becomes a KLL sketch (Karnin, Lang and Liberty, "Optimal
// quantile approximation in streams", FOCS 2016): level h holds values that stand for 2^h
// cases each; a full level is sorted and every other value, from a random offset of 0 or 1,
// moves one level up with twice the weight. Each such compaction moves any rank by at most
// 2^h, up or down with equal chance, so the errors of many compactions cancel rather than
// add. Capacities shrink by 2/3 per level below the top (kTopCapacity), which keeps the whole
// sketch near 3·kTopCapacity values while the rank error is set by the top levels: its
// standard deviation is about 1.5·n/kTopCapacity, about 5e-5 of n. The offsets come from a
// splitmix64 stream of the summary's own seed, so a run is reproducible.
//
// Percentiles are the inverse of the (weighted) empirical distribution function: the smallest
// kept value x with F(x) ≥ q. On the exact values this is the order statistic X_(⌈qn⌉), for
// which q lies in [F_n(x−), F_n(x)]: no rank error at all, ties and point masses included.
//
// Summaries merge (the workers of one run, in worker order): the values of each level of the
// other are added to the same level, then full levels are compacted.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace MCMCSP_800 {

class SECQuantileSummary {
public:
    //! Values kept exactly before the summary turns into a sketch: 2^17, 1 MB of doubles.
    static constexpr std::size_t kExactValues = std::size_t{1} << 17;
    //! Capacity of the sketch's top level.
    static constexpr std::size_t kTopCapacity = std::size_t{1} << 15;

    //! An empty summary whose compactions draw their offsets from `seed`.
    explicit SECQuantileSummary(std::uint64_t seed = 0x5EC0DE5ull);

    //! Adds one value; values that are not finite are left out.
    void Add(double x) {
        if (x - x != 0.0) {
            return;
        }
        fvLevels[0].push_back(x);
        ++fCount;
        ++fKept;
        fbSorted = false;
        if (fKept >= fLimit) {
            Compress();
        }
    }
    //! Adds the values that `other` summarises.
    void Merge(const SECQuantileSummary& other);

    //! Values summarised.
    std::int64_t GetCount() const { return fCount; }
    //! Every value is kept: the percentiles are exact order statistics.
    bool IsExact() const { return fvLevels.size() == 1; }
    //! Values kept (memory is eight bytes per value).
    std::size_t GetKept() const { return fKept; }

    //! The value at rank `rank` (1 ≤ rank ≤ n) of the ordered values: the smallest kept value
    //! whose cumulative weight reaches `rank`. Missing when empty or the rank is outside.
    double OrderStatistic(std::int64_t rank) const;
    //! The `q` quantile (0 < q ≤ 1): OrderStatistic(⌈q·n⌉). Missing when empty.
    double Quantile(double q) const;
    //! The distribution-free confidence interval of the `q` quantile at confidence `level`:
    //! the order statistics X_(l) ≤ ξ_q ≤ X_(u) with P(B ≤ l − 1) ≤ α/2 and P(B ≥ u) ≤ α/2 for
    //! B ~ Binomial(n, q), α = 1 − level. An end that n values cannot reach (l < 1, u > n) is
    //! missing.
    void QuantileInterval(double q, double level, double& lower, double& upper) const;

private:
    //! Compacts full levels until the kept values fit the limit again.
    void Compress();
    //! Capacity of level h of the sketch.
    std::size_t Capacity(std::size_t h) const;
    //! Recomputes the capacities and fLimit from the number of levels.
    void UpdateLimit();
    //! Sorts the kept values with their weights for the queries.
    void SortView() const;
    //! The next offset bit.
    unsigned NextBit();

    std::vector<std::vector<double>> fvLevels; //!< level h: values weighing 2^h
    std::vector<std::size_t> fvCapacity;       //!< capacity of each level
    std::vector<double> fvPromoted;            //!< a compaction's values moving up
    std::vector<double> fvScratch;             //!< the merge of a level with them
    std::int64_t fCount = 0;                   //!< values summarised
    std::size_t fKept = 0;                     //!< values kept over all levels
    std::size_t fLimit = kExactValues;         //!< kept values that trigger a compaction
    std::uint64_t fState;                      //!< splitmix64 state of the offsets
    std::uint64_t fBits = 0;                   //!< unused offset bits
    int fNBits = 0;                            //!< how many of fBits are unused
    //! The sorted view of the queries: values and cumulative weights.
    mutable std::vector<double> fvViewValues;
    mutable std::vector<double> fvViewCum;
    mutable bool fbSorted = false; //!< the view matches the kept values
};

} // namespace MCMCSP_800
