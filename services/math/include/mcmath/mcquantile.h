// Prepared quantile functions: a distribution's inverse set up once for fixed parameters and
// then evaluated very often (the simulation maps hundreds of millions of uniforms through the
// inverse of a Gamma or Beta input), with no allocation and no exception.
//
// Method (Gamma and Beta). The construction tabulates the quantile in transformed
// coordinates: s = ln(p/(1 − p)) on an even grid of step 1/8 over |s| ≤ 23
// (p from 1e-10 to 1 − 1e-10), and y = ln x for the Gamma (unit rate), y = ln(x/(1 − x)) for
// the Beta. In these coordinates the tails become nearly straight lines (ln x is linear in
// ln p as p → 0, for instance), so a cubic Hermite interpolant with the exact slopes
// dy/ds = p(1 − p)/(f(x)·dx/dy) at the nodes (f the density) gives a start within about 1e-6
// relative (5e-5 for shapes near 0.01). An evaluation interpolates the start and refines it
// by Halley's method on the distribution function, as the inverse incomplete gamma and beta
// functions of Press et al., Numerical Recipes, 3rd ed., 2007, §6.2.1 and §6.4.1, do:
//     x ← x − δ / (1 − δ·(f'/f)/2),   δ = (F(x) − p)/f(x),
// using the complement 1 − F for p > 0.5 so that the upper tail keeps its relative accuracy.
// Halley converges cubically, so one step suffices; a step larger than 1e-5 relative is
// followed by another (at most four). Cost: one Boost incomplete gamma or beta evaluation,
// two exp, one log and the interpolation, about 2 to 7 times faster than the plain Boost
// inverse (figures in bench/README.md). Beta shapes with a closed-form inverse (a = 1, b = 1,
// or a = b = 1/2) go straight to Boost, which is faster there.
//
// Accuracy, measured against boost::math::quantile under MCMathPolicy: Gamma within 5e-14
// relative (worst at shape 0.01; 1e-15 for shapes ≥ 1), Beta within 1e-13 relative to the
// nearer end of the support, min(x, 1 − x), or one unit in the last place where 1 − x is
// that small. The tests check 1e-12 across shapes from 0.01 to 1e4 and p from 1e-12 to
// 1 − 1e-12. Where the quantile is badly conditioned (a Gamma with shape α < 1 near 0 has
// condition number 1/α) both carry the same F-evaluation error, amplified alike. Outside the
// grid (p < 1e-10 or p > 1 − 1e-10), where a node underflows (tiny shapes put much of the
// mass within 1e-300 of 0, or within rounding of 1), and whenever a step fails or leaves the
// support, the object falls back to the plain Boost inverse, so the result is always that
// accurate.
//
// Edges as for MCDistFun::IdfGam and IdfBeta: p = 0 gives the lower end of the support, p = 1
// the upper end (missing for the Gamma, whose upper end is infinite), NaN and p outside
// [0, 1] missing. An object built with invalid parameters (not finite or ≤ 0) gives missing
// for every p; IsValid tells.
//
// Normal: mean + sd·Φ⁻¹(p) with Boost's erfc⁻¹, which is already a few rational
// approximations and needs no table.
//
// The objects are plain values (about 6 KB for Gamma and Beta): copy one into each worker.
#pragma once

#include <array>

namespace MCMath_800 {

//! The interpolation table shared by the tabulated quantiles: nodes y_i with slopes dy/ds at
//! s_i = kSMin + i·kStep, and the index range of the nodes that hold usable values.
class MCQuantileTable {
public:
    //! Grid step in s = ln(p/(1 − p)).
    static constexpr double kStep = 0.125;
    //! Lowest s of the grid; the highest is −kSMin.
    static constexpr double kSMin = -23.0;
    //! Number of nodes.
    static constexpr int kNodes = 369;

    //! The s of node i.
    static double NodeS(int i) { return kSMin + kStep * i; }
    //! Stores node i; a value or slope that is not finite makes the node unusable.
    void SetNode(int i, double y, double dyds);
    //! Fixes the usable range: the longest run of consecutive nodes with finite values.
    void Finish();
    //! The cubic Hermite interpolant at s, or NaN when s lies outside the usable range.
    double Interpolate(double s) const;

private:
    std::array<double, kNodes> fY{};     //!< node values y_i
    std::array<double, kNodes> fDyDs{};  //!< node slopes dy/ds
    std::array<bool, kNodes> fbUsable{}; //!< node i holds finite values
    int fLo = 0;                         //!< first node of the usable range
    int fHi = -1;                        //!< last node of the usable range (fHi ≤ fLo: none)
};

//! Quantile of the Gamma distribution with shape α and rate β (density
//! β^α·x^(α−1)·e^(−βx)/Γ(α)), the same function as MCDistFun::IdfGam(p, α, β).
class MCGammaQuantile {
public:
    //! An invalid object: every call gives missing.
    MCGammaQuantile() = default;
    //! Tabulates the quantile of shape α and rate β (about 370 Boost inversions).
    MCGammaQuantile(double shape, double rate);

    double GetShape() const { return fShape; }
    double GetRate() const { return fRate; }

    //! The quantile at p.
    double operator()(double p) const;

    //! True when the parameters were finite and > 0.
    bool IsValid() const { return fbValid; }

private:
    //! The plain Boost inverse, for the cases the table does not cover.
    double Fallback(double p) const;

    double fShape = 0.0;        //!< α
    double fRate = 0.0;         //!< β
    double fLnGammaShape = 0.0; //!< ln Γ(α), for the density
    bool fbValid = false;       //!< parameters usable
    MCQuantileTable fTable;     //!< y = ln x of the unit-rate quantile against s
};

//! Quantile of the Beta distribution with shapes a and b, the same function as
//! MCDistFun::IdfBeta(p, a, b).
class MCBetaQuantile {
public:
    //! An invalid object: every call gives missing.
    MCBetaQuantile() = default;
    //! Tabulates the quantile of shapes a and b (about 370 Boost inversions).
    MCBetaQuantile(double a, double b);

    double GetA() const { return fA; }
    double GetB() const { return fB; }

    //! The quantile at p.
    double operator()(double p) const;

    //! True when the parameters were finite and > 0.
    bool IsValid() const { return fbValid; }

private:
    //! The plain Boost inverse, for the cases the table does not cover.
    double Fallback(double p) const;

    double fA = 0.0;           //!< first shape
    double fB = 0.0;           //!< second shape
    double fLnBeta = 0.0;      //!< ln B(a, b), for the density
    bool fbValid = false;      //!< parameters usable
    bool fbClosedForm = false; //!< Boost inverts these shapes in closed form: no table
    MCQuantileTable fTable;    //!< y = ln(x/(1 − x)) against s
};

//! Quantile of the normal distribution, the same function as MCDistFun::IdfNorm(p, mean, sd).
class MCNormalQuantile {
public:
    //! An invalid object: every call gives missing.
    MCNormalQuantile() = default;
    MCNormalQuantile(double mean, double sd);

    //! mean + sd·Φ⁻¹(p); missing at p = 0 and p = 1.
    double operator()(double p) const;
    bool IsValid() const { return fbValid; }

private:
    double fMean = 0.0;   //!< mean
    double fSd = 1.0;     //!< standard deviation
    bool fbValid = false; //!< parameters usable
};

} // namespace MCMath_800
