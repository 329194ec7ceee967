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
// Complements: Complement(q) is the quantile at 1 − q given the upper-tail probability q
// itself, so that a draw from the upper tail (q = Φ(−z) for a normal score z > 0) keeps the
// relative accuracy of q; 1 − Φ(z) rounded to a double holds only 1e-16/q of it, which at z = 8
// moves a Gamma quantile by 0.5%.
//
// The objects are plain values (about 6 KB for Gamma and Beta): copy one into each worker.
//
// MCNormalScoreTable: a quantile composed with the normal distribution function,
// g(z) = Q(Φ(z)), tabulated in the normal score z for the simulation's copula, where every
// input value is g of a normal draw. See the note above the class.
#pragma once

#include <array>
#include <cmath>
#include <cstddef>
#include <functional>
#include <limits>
#include <vector>

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
    //! The quantile at 1 − q from the upper-tail probability q (see the note above). q = 1
    //! gives 0, q = 0 missing (the upper end is infinite), NaN and q outside [0, 1] missing.
    double Complement(double q) const;

    //! True when the parameters were finite and > 0.
    bool IsValid() const { return fbValid; }

private:
    //! The quantile at p = 1 − q for 0 < p, q < 1, each given with its own accuracy.
    double Evaluate(double p, double q) const;
    //! The plain Boost inverse, for the cases the table does not cover: from p in the lower
    //! half, from q in the upper half.
    double Fallback(double p, double q) const;

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
    //! The quantile at 1 − q from the upper-tail probability q (see the note above). q = 1
    //! gives 0, q = 0 gives 1, NaN and q outside [0, 1] missing.
    double Complement(double q) const;

    //! True when the parameters were finite and > 0.
    bool IsValid() const { return fbValid; }

private:
    //! The quantile at p = 1 − q for 0 < p, q < 1, each given with its own accuracy.
    double Evaluate(double p, double q) const;
    //! The plain Boost inverse, for the cases the table does not cover: from p in the lower
    //! half, from q in the upper half.
    double Fallback(double p, double q) const;

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

// ------------------------------------------------------------------------------------------
// A quantile in the normal score. The copula of the simulation maps each normal draw z of an
// input to x = g(z) = Q(Φ(z)), which costs Φ (an erfc) and the quantile Q (for the Gamma and
// Beta an incomplete gamma or beta function inside a Halley step) per value. g is smooth and
// its derivatives follow from the density f of x alone:
//     g'(z) = φ(z)/f(g(z)),   g''(z) = g'(z)·(−z − ℓ(g(z))·g'(z)),   ℓ = f'/f,
// so the table stores, at nodes z_i = z_0 + i·h over |z| ≤ kZMax, a coordinate y = ψ(x) of the
// value with dy/dz and d²y/dz², and joins neighbouring nodes by the quintic Hermite polynomial
// that matches all three at both ends (the interpolation error is
// h⁶·y⁽⁶⁾(ξ)·(t(1 − t))³/720 at t = (z − z_i)/h, largest at the middle of an interval; see
// e.g. Burden & Faires, Numerical Analysis, §3.4, for Hermite interpolation). One draw then
// costs a polynomial of degree 5 and, for the log and logistic coordinates, one exp.
//
// Coordinates (Scale): linear, x = y, for bounded values; log, x = o + e^y, for values bounded
// below by o (Gamma, Exponential, Weibull), so that the lower tail, where x − o falls like
// Φ(z)^(1/k), keeps its relative accuracy and the interpolated function is nearly quadratic in
// z; logistic, x = o + w/(1 + e^(−y)), for values in (o, o + w) (Beta). Where x itself is as
// smooth (the bulk of a Gamma or a Beta), an interval of a log or logistic table interpolates
// x directly, with x' and x'' from y', y'', which saves the exp: the build tries that piece
// first for every interval and keeps it where it passes the check below. A kink of g (the mode
// of a Triangular distribution, where the density has a corner) is made a node, and the
// pieces on its two sides use the one-sided derivatives there, so both stay smooth.
//
// Verification. When built, the table compares every interval's middle with the exact g there
// (the caller's function, the same one that gives the nodes). An interval passes when
//     |ĝ(z_m) − g(z_m)| ≤ kTolerance/2 · max(|g(z_m)|, absolute scale)
// (half the tolerance, so that the rest of the interval, where the error kernel is smaller,
// stays within kTolerance = 1e-12 relative; the absolute scale, for instance the distribution's
// standard deviation, stands in where the value crosses or nears 0). The build starts with
// h = 1/16 and halves the step, reusing every value computed so far (the middles of one level
// are the new nodes of the next), while some interval fails, down to h = 1/128. Intervals
// that still fail, and those next to a node the exact function cannot give (an underflowed
// tail value, say), are left out: the table gives NaN there, as beyond |z| > kZMax (about 1
// draw in 10^15), and the caller then evaluates g exactly. So every value the table gives is
// within 1e-12 of g as the caller computes it.
//
// A table is a plain value (one 64-byte record per interval: 16 KB at h = 1/16, 128 KB at
// 1/128); building one costs 2·16/h + 1 evaluations of g at the final step h.
class MCNormalScoreTable {
public:
    //! How the tabulated y gives the value x (see the note above).
    enum class Scale {
        kLinear,  //!< x = y
        kLog,     //!< x = origin + e^y
        kLogistic //!< x = origin + width/(1 + e^(−y))
    };
    //! The exact function at one z: the value x = g(z), and y = ψ(x) with dy/dz and d²y/dz².
    struct Point {
        double fX = 0.0;   //!< g(z)
        double fY = 0.0;   //!< the coordinate y of g(z)
        double fDy = 0.0;  //!< dy/dz
        double fD2y = 0.0; //!< d²y/dz²
    };
    //! Computes the Point at z; `side` is −1 or +1 at a kink, for the left or right limit of
    //! the derivatives, else 0. False where the point cannot be computed (the table then
    //! leaves out the intervals that need it).
    using PointFunction = std::function<bool(double z, int side, Point& point)>;
    //! How the table maps y to values and what it checks against.
    struct Setup {
        Scale fScale = Scale::kLinear; //!< coordinate of the values
        double fOrigin = 0.0;          //!< o of the log and logistic scales
        double fWidth = 1.0;           //!< w of the logistic scale
        //! Stands in for |x| in the tolerance where the value nears 0 (see the note above).
        double fAbsScale = 0.0;
        //! The support: a piece that interpolates x directly is clamped to [fLower, fUpper],
        //! so that an interpolation error can never put a value outside it.
        double fLower = -std::numeric_limits<double>::infinity();
        double fUpper = std::numeric_limits<double>::infinity();
        //! The z of a kink of g, NaN when g has none.
        double fKink = std::numeric_limits<double>::quiet_NaN();
    };

    //! The table covers |z| ≤ kZMax (and a little more where a kink shifts the grid).
    static constexpr double kZMax = 8.0;
    //! The accuracy every value of the table keeps (see the note above).
    static constexpr double kTolerance = 1e-12;
    //! The first and the smallest node spacing.
    static constexpr double kFirstStep = 1.0 / 16.0;
    static constexpr double kFinestStep = 1.0 / 128.0;

    //! An empty table: every z gives NaN.
    MCNormalScoreTable() = default;

    //! Builds the table of `point` (see the note above). Returns IsReady().
    bool Build(const Setup& setup, const PointFunction& point);
    //! Forgets the table: every z gives NaN.
    void Clear() { *this = MCNormalScoreTable(); }

    //! ĝ(z), within kTolerance of g(z); NaN when z is NaN, lies outside the table or in an
    //! interval the table left out.
    double operator()(double z) const {
        const double t = (z - fZ0) * fInvStep;
        if (!(t >= 0.0 && t < fNIntervalsAsDouble)) {
            return std::numeric_limits<double>::quiet_NaN();
        }
        const auto i = static_cast<std::size_t>(t);
        const double u = t - static_cast<double>(i);
        const double* c = fvCoefficients.data() + kRecord * i;
        const double y = c[0] + u * (c[1] + u * (c[2] + u * (c[3] + u * (c[4] + u * c[5]))));
        return c[kPieceSlot] == 0.0 ? Clamp(y) : ValueOf(y);
    }

    //! True when at least one interval is usable.
    bool IsReady() const { return fNUsable > 0; }
    //! The node spacing h the build settled on; 0 for an empty table.
    double GetStep() const { return fStep; }
    //! The range [GetZMin, GetZMax) the intervals cover.
    double GetZMin() const { return fZ0; }
    double GetZMax() const { return fZ0 + fStep * fNIntervalsAsDouble; }
    //! Number of intervals, and of those that the table gives values for.
    int GetNIntervals() const { return static_cast<int>(fNIntervalsAsDouble); }
    int GetNUsable() const { return fNUsable; }
    //! The largest error found at the middles of the usable intervals, as a share of the
    //! tolerance there (≤ 0.5 by construction).
    double GetWorstMidpointError() const { return fWorstMidpoint; }

private:
    //! One record per interval: the coefficients of y = c0 + c1·u + … + c5·u⁵ in
    //! u = (z − z_i)/h ∈ [0, 1), then the piece's kind (0: y is x itself, 1: y is the table's
    //! coordinate), then padding to 64 bytes.
    static constexpr std::size_t kRecord = 8;
    static constexpr std::size_t kPieceSlot = 6;

    //! A value interpolated directly, kept inside [fLower, fUpper] (the support).
    double Clamp(double x) const { return x < fLower ? fLower : (x > fUpper ? fUpper : x); }
    //! The value of coordinate y on the table's scale.
    double ValueOf(double y) const {
        switch (fScale) {
        case Scale::kLog:
            return fOrigin + std::exp(y);
        case Scale::kLogistic:
            return fOrigin + fWidth / (1.0 + std::exp(-y));
        case Scale::kLinear:
        default:
            return Clamp(y);
        }
    }
    //! The point `p` of the table's coordinate in the coordinate y = x, for the pieces that
    //! interpolate x directly.
    Point InX(const Point& p) const;

    Scale fScale = Scale::kLinear;      //!< coordinate of the values
    double fOrigin = 0.0;               //!< o of the log and logistic scales
    double fWidth = 1.0;                //!< w of the logistic scale
    double fLower = 0.0;                //!< smallest value a piece in x gives
    double fUpper = 0.0;                //!< largest value a piece in x gives
    double fZ0 = 0.0;                   //!< z of the first node
    double fStep = 0.0;                 //!< h
    double fInvStep = 0.0;              //!< 1/h
    double fNIntervalsAsDouble = 0.0;   //!< number of intervals (0: empty table)
    int fNUsable = 0;                   //!< intervals with values
    double fWorstMidpoint = 0.0;        //!< largest midpoint error / tolerance
    std::vector<double> fvCoefficients; //!< kRecord per interval; NaN: left out
};

} // namespace MCMath_800
