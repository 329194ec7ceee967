// Special functions of the likelihood code and the table search of the samplers.
//
// The Beta likelihood (its score and Hessian) calls Digamma and Trigamma; the simulation draws
// discrete and categorical values by searching a cumulative table with BinSearch.
#pragma once

#include <vector>

namespace MCMath_800 {

//! Static special functions and the cumulative-table search. Thread-safe, no allocation.
struct MCMathFun {
    //! ψ(x) = d ln Γ(x)/dx. The poles x = 0, −1, −2, ... and NaN give missing.
    static double Digamma(double x);
    //! ψ'(x) = d² ln Γ(x)/dx². The poles x = 0, −1, −2, ... and NaN give missing.
    static double Trigamma(double x);

    //! Finds u among the cells of an ascending cumulative table. The entries table[lo] ≤
    //! table[lo + 1] ≤ ... ≤ table[hi] bound hi − lo cells; cell i runs from table[i] to
    //! table[i + 1]. The result j lies in [lo + 1, hi], and j − 1 is the index of the cell
    //! that holds u:
    //!   - bRightClosed false (the sampler's use): cells are [table[i], table[i + 1]), so j is
    //!     the smallest index with table[j] > u. A u equal to an inner boundary belongs to the
    //!     cell that starts there; a cell of zero width is never chosen.
    //!   - bRightClosed true: cells are (table[i], table[i + 1]], j is the smallest index with
    //!     table[j] ≥ u; a u equal to an inner boundary belongs to the cell that ends there.
    //! A u below table[lo] counts as table[lo] and a u at or above table[hi] counts as the
    //! end of the last cell of non-zero width, so a uniform u ∈ [0, 1) always lands in a cell
    //! of positive probability even when the table's total falls short of 1 by rounding. A
    //! table whose cells all have zero width gives lo + 1. With a drawn u and the table
    //! 0, p0, p0 + p1, ..., 1 this chooses cell i with probability p_i.
    //! When there is no cell (u is NaN, lo < 0, hi ≥ table size or hi ≤ lo) the result is
    //! lo, so that result − 1 = lo − 1 lies outside the range's cells (−1 for lo = 0);
    //! callers pass a number u and a valid range.
    static int BinSearch(const std::vector<double>& table, int lo, int hi, double u,
                         bool bRightClosed);
};

} // namespace MCMath_800
