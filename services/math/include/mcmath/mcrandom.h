// Random streams of the simulation: a seeded uniform stream (MCURandom) and the normal
// generator drawn from it (MCRandomValues), both reproducible bit for bit on every platform.
//
// The stream. MCURandom runs the 64-bit Mersenne Twister MT19937-64 (Matsumoto & Nishimura
// 1998; Nishimura 2000), boost::random::mt19937_64, seeded with the 32-bit seed by the
// standard initialisation of that engine (the same sequence as std::mt19937_64(seed)). Each
// draw takes the next 64-bit word w of the engine and builds the double from its bits, never
// through a library distribution, whose algorithm may differ between libraries and versions:
//   - GetRandom, half-open stream (the usual): u = ⌊w / 2^11⌋ · 2^-53, a multiple of 2^-53 in
//     [0, 1 − 2^-53]; all 53 bits of the mantissa are random.
//   - GetRandom, open stream: u = (⌊w / 2^12⌋ + 0.5) · 2^-52, an odd multiple of 2^-53 in
//     [2^-53, 1 − 2^-53]; never 0 or 1.
// So seed 629111597 always gives the same sequence of doubles; the first values are pinned in
// the tests. A copy of a stream continues from the same state: a worker that copies a
// stream draws the same values as the original would have.
//
// Normal draws. MCRandomValues draws each standard normal value with Boost.Random's
// normal_distribution<double> from the stream's 64-bit words: the ziggurat method (Marsaglia &
// Tsang 2000, "The Ziggurat Method for Generating Random Variables", J. Stat. Softw. 5(8)) with
// 128 layers, whose tail beyond 3.44 is sampled by Marsaglia's exponential rejection. Most
// values take one word (8 bits choose the layer and the sign, the rest the abscissa); the
// wedge test and the tail take further words, 1.04 words per value on average. It is exact (no
// approximation of Φ⁻¹), several times faster than inverting Φ, and Boost.Random gives the same
// values for a given engine on every platform, so a seed fixes the normal draws everywhere (a
// Boost upgrade that changed the algorithm would show in the values the tests pin). A vector of
// dimension n draws z_0, …, z_(n−1) in that order and is x = m + scale · F·z with F the factor of
// the covariance below; a lower-triangular F (the Cholesky factor) is applied as such, n(n + 1)/2
// products.
#pragma once

#include "mcmath/mcsymmatrix.h"

#include <boost/random/mersenne_twister.hpp>

#include <cstdint>
#include <vector>

namespace MCMath_800 {

//! A source of random 64-bit words lent by a host that brings its own generator.
class IMCRandomSource {
public:
    virtual ~IMCRandomSource() = default;
    //! The next word of the host's stream; every bit must be random.
    virtual std::uint64_t GetWord() = 0;
};

//! A uniform random stream whose sequence is fixed by its seed. The simulation owns one
//! stream per algorithm and one per worker; a stream is used by one thread at a time.
class MCURandom {
public:
    //! The seed of a default-constructed stream.
    static constexpr std::uint32_t kDefaultSeed = 629111597u;

    //! A stream seeded with `seed` when bUseSeed is true; with bUseSeed false it is seeded
    //! from std::random_device (not reproducible; GetSeed tells the seed drawn, so the run can
    //! be repeated). bHalfOpen true gives values in [0, 1), false in (0, 1). With a source,
    //! the words come from the host's source (not owned; a copy of the stream shares it) and
    //! the seed only records a value for GetSeed.
    explicit MCURandom(std::uint32_t seed = kDefaultSeed, bool bUseSeed = true,
                       bool bHalfOpen = true, IMCRandomSource* source = nullptr);

    //! Restarts the stream from `seed`.
    void SetSeed(std::uint32_t seed);
    //! The seed the stream was last started from.
    std::uint32_t GetSeed() const { return fSeed; }

    //! The next uniform value: [0, 1) or (0, 1) as constructed (formulas above).
    double GetRandom();
    //! The next 64-bit word of the stream, for generators built on it.
    std::uint64_t GetWord() { return fpSource ? fpSource->GetWord() : fEngine(); }
    //! True for the half-open stream [0, 1).
    bool IsHalfOpen() const { return fbHalfOpen; }

private:
    boost::random::mt19937_64 fEngine; //!< the generator, advanced by every draw
    std::uint32_t fSeed;               //!< the seed the engine last started from
    bool fbHalfOpen;                   //!< [0, 1) when true, (0, 1) when false
    IMCRandomSource* fpSource;         //!< the host's words instead of the engine, not owned
};

//! Normal and multivariate normal values drawn from an MCURandom (stream layout above). Set
//! the stream, choose the distribution with a SetParamNormal, then draw. One generator per
//! thread; GetRandom allocates nothing once the caller's vector has its size. A copy keeps
//! the setting and the stream pointer: bind it to its own stream with SetURNGPtr.
class MCRandomValues {
public:
    MCRandomValues() = default;

    //! The stream to draw from (not owned); null disables drawing.
    void SetURNGPtr(MCURandom* stream) { fpURNG = stream; }
    MCURandom* GetURNGPtr() const { return fpURNG; }

    //! One standard normal value per draw. Always true.
    bool SetParamNormal();
    //! n independent standard normal values per draw; false (and nothing set) when n < 1.
    bool SetParamNormal(int n);
    //! The multivariate normal with mean vector `means` and covariance scale²·C, C the given
    //! matrix (a correlation matrix in the simulation): x = means + scale·F·z. F is the
    //! Cholesky factor L of C (Eigen's LLT, C = L·Lᵀ) when C is positive definite. A positive
    //! semi-definite C (a correlation of exactly ±1, as the search for copula correlations
    //! asks at its ends) has no Cholesky factor; it gets F = Pᵀ·L·D^(1/2) from Eigen's
    //! pivoted LDLᵀ (C = Pᵀ·L·D·Lᵀ·P), accepted when no pivot is below −1e-12 times the largest
    //! diagonal entry and F·Fᵀ reproduces C within 1e-10 of it. False (and nothing set) when
    //! the sizes disagree, n < 1, a mean or entry is not finite, scale is not finite and > 0,
    //! or C is not positive semi-definite.
    bool SetParamNormal(const std::vector<double>& means, double scale,
                        const MCSymMatrix& correlation);

    //! One value of a one-dimensional setting; missing when there is no stream or the
    //! setting has another dimension.
    double GetRandom();
    //! One vector: `values` becomes the n values of the setting. False (values untouched)
    //! when there is no stream or no setting.
    bool GetRandom(std::vector<double>& values);
    //! The dimension of the setting, 0 when none is set.
    int GetDimension() const { return fN; }

private:
    //! The next standard normal value of the stream (ziggurat, usually one word).
    double NextStdNormal();

    MCURandom* fpURNG = nullptr; //!< the stream, not owned
    int fN = 0;                  //!< dimension of the setting, 0 when none
    bool fbIndependent = true;   //!< identity covariance, zero means: x = z
    double fScale = 1.0;         //!< common standard deviation factor
    std::vector<double> fMeans;  //!< mean vector, n entries
    std::vector<double> fFactor; //!< F, n x n row by row, F·Fᵀ = C
    bool fbLowerFactor = false;  //!< F is lower triangular: row i has entries 0 … i only
    std::vector<double> fZ;      //!< the standard normal draws of one vector
};

} // namespace MCMath_800
