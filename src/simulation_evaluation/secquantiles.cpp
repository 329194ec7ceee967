#include "simulation_evaluation/secquantiles.h"

#include "mccommon/mcmv.h"

#include <boost/math/distributions/binomial.hpp>
#include <boost/sort/pdqsort/pdqsort.hpp>

#include <algorithm>
#include <cmath>
#include <numeric>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;

namespace {
//! Smallest capacity of a level: lower levels compact tiny buffers often for no gain.
constexpr std::size_t kMinCapacity = 8;
//! Capacity ratio between neighbouring levels.
constexpr double kShrink = 2.0 / 3.0;

//! splitmix64 (Steele, Lea and Flood, "Fast splittable pseudorandom number generators",
//! OOPSLA 2014): a full-period 64-bit mix, enough for fair offset bits.
std::uint64_t SplitMix(std::uint64_t& state) {
    std::uint64_t z = (state += 0x9E3779B97F4A7C15ull);
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
    return z ^ (z >> 31);
}
} // namespace

SECQuantileSummary::SECQuantileSummary(std::uint64_t seed)
    : fvLevels(1), fvCapacity(1, kTopCapacity), fState(seed) {}

std::size_t SECQuantileSummary::Capacity(std::size_t h) const {
    return fvCapacity[h];
}

void SECQuantileSummary::UpdateLimit() {
    if (IsExact()) {
        fvCapacity.assign(1, kTopCapacity);
        fLimit = kExactValues;
        return;
    }
    const std::size_t levels = fvLevels.size();
    fvCapacity.resize(levels);
    fLimit = 0;
    for (std::size_t h = 0; h < levels; ++h) {
        const double depth = static_cast<double>(levels - 1 - h);
        const double cap = std::ceil(static_cast<double>(kTopCapacity) * std::pow(kShrink, depth));
        fvCapacity[h] = std::max(kMinCapacity, static_cast<std::size_t>(cap));
        fLimit += fvCapacity[h];
    }
}

unsigned SECQuantileSummary::NextBit() {
    if (fNBits == 0) {
        fBits = SplitMix(fState);
        fNBits = 64;
    }
    const auto bit = static_cast<unsigned>(fBits & 1u);
    fBits >>= 1;
    --fNBits;
    return bit;
}

void SECQuantileSummary::Compress() {
    while (fKept >= fLimit) {
        std::size_t h = 0;
        while (h + 1 < fvLevels.size() && fvLevels[h].size() < Capacity(h)) {
            ++h;
        }
        if (h + 1 == fvLevels.size()) {
            fvLevels.emplace_back();
        }
        std::vector<double>& level = fvLevels[h];
        if (h == 0) {
            // Pattern-defeating quicksort without data-dependent branches (Peters 2021): the
            // level is random data, where mispredicted comparisons cost most of a sort's time.
            boost::sort::pdqsort_branchless(level.begin(), level.end());
        }
        // An odd value out stays at its level; of the sorted pairs one value of each moves up,
        // merged into the sorted level above through the scratch buffer.
        const std::size_t paired = level.size() & ~std::size_t{1};
        fvPromoted.clear();
        for (std::size_t i = NextBit(); i < paired; i += 2) {
            fvPromoted.push_back(level[i]);
        }
        std::vector<double>& up = fvLevels[h + 1];
        fvScratch.resize(up.size() + fvPromoted.size());
        std::merge(up.begin(), up.end(), fvPromoted.begin(), fvPromoted.end(), fvScratch.begin());
        up.swap(fvScratch);
        fKept -= paired / 2;
        level.erase(level.begin(), level.begin() + static_cast<std::ptrdiff_t>(paired));
        if (h + 2 == fvLevels.size() && up.size() == fvPromoted.size()) {
            UpdateLimit(); // a new top level
        }
    }
}

void SECQuantileSummary::Merge(const SECQuantileSummary& other) {
    if (other.fCount == 0) {
        return;
    }
    if (other.fvLevels.size() > fvLevels.size()) {
        fvLevels.resize(other.fvLevels.size());
    }
    for (std::size_t h = 0; h < other.fvLevels.size(); ++h) {
        std::vector<double>& to = fvLevels[h];
        const std::vector<double>& from = other.fvLevels[h];
        const std::size_t start = to.size();
        to.insert(to.end(), from.begin(), from.end());
        if (h > 0) {
            std::inplace_merge(to.begin(), to.begin() + static_cast<std::ptrdiff_t>(start),
                               to.end());
        }
    }
    fCount += other.fCount;
    fKept += other.fKept;
    fbSorted = false;
    UpdateLimit();
    Compress();
}

void SECQuantileSummary::SortView() const {
    if (fbSorted) {
        return;
    }
    std::vector<std::pair<double, double>> items;
    items.reserve(fKept);
    double weight = 1.0;
    for (const std::vector<double>& level : fvLevels) {
        for (const double x : level) {
            items.emplace_back(x, weight);
        }
        weight *= 2.0;
    }
    std::sort(items.begin(), items.end());
    fvViewValues.resize(items.size());
    fvViewCum.resize(items.size());
    double cum = 0.0;
    for (std::size_t i = 0; i < items.size(); ++i) {
        cum += items[i].second;
        fvViewValues[i] = items[i].first;
        fvViewCum[i] = cum;
    }
    fbSorted = true;
}

double SECQuantileSummary::OrderStatistic(std::int64_t rank) const {
    if (fCount == 0 || rank < 1 || rank > fCount) {
        return MCMV::Missing();
    }
    SortView();
    const auto it = std::lower_bound(fvViewCum.begin(), fvViewCum.end(), static_cast<double>(rank));
    const std::size_t i = it == fvViewCum.end() ? fvViewCum.size() - 1
                                                : static_cast<std::size_t>(it - fvViewCum.begin());
    return fvViewValues[i];
}

double SECQuantileSummary::Quantile(double q) const {
    if (fCount == 0 || !(q > 0.0) || q > 1.0) {
        return MCMV::Missing();
    }
    // ⌈q·n⌉, with a product that lands a rounding step above a whole number taken as it.
    const double n = static_cast<double>(fCount);
    auto rank = static_cast<std::int64_t>(std::ceil(q * n * (1.0 - 1e-15)));
    rank = std::min<std::int64_t>(std::max<std::int64_t>(rank, 1), fCount);
    return OrderStatistic(rank);
}

void SECQuantileSummary::QuantileInterval(double q, double level, double& lower,
                                          double& upper) const {
    lower = MCMV::Missing();
    upper = MCMV::Missing();
    if (fCount == 0 || !(q > 0.0 && q < 1.0) || !(level > 0.0 && level < 1.0)) {
        return;
    }
    const double tail = (1.0 - level) / 2.0;
    const boost::math::binomial_distribution<double> b(static_cast<double>(fCount), q);
    // l: the largest rank with P(B ≤ l − 1) ≤ tail. P(B ≤ k) grows with k: bisect on k = l − 1.
    if (boost::math::cdf(b, 0.0) <= tail) {
        std::int64_t lo = 0;          // P(B ≤ lo) ≤ tail
        std::int64_t hi = fCount - 1; // search bound
        while (lo < hi) {
            const std::int64_t mid = lo + (hi - lo + 1) / 2;
            if (boost::math::cdf(b, static_cast<double>(mid)) <= tail) {
                lo = mid;
            } else {
                hi = mid - 1;
            }
        }
        lower = OrderStatistic(lo + 1);
    }
    // u: the smallest rank with P(B ≥ u) = P(B > u − 1) ≤ tail; it falls as u grows.
    const auto above = [&b](std::int64_t u) {
        return boost::math::cdf(boost::math::complement(b, static_cast<double>(u - 1)));
    };
    if (above(fCount) <= tail) {
        std::int64_t lo = 1;
        std::int64_t hi = fCount; // P(B ≥ hi) ≤ tail
        while (lo < hi) {
            const std::int64_t mid = lo + (hi - lo) / 2;
            if (above(mid) <= tail) {
                hi = mid;
            } else {
                lo = mid + 1;
            }
        }
        upper = OrderStatistic(hi);
    }
}

} // namespace MCMCSP_800
