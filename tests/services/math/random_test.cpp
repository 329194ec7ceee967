#include "mcmath/mcrandom.h"
#include "mcmath/mcsymmatrix.h"

#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <Eigen/Dense>
#include <boost/random/mersenne_twister.hpp>
#include <boost/random/normal_distribution.hpp>

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <vector>

using MCCommon_800::MCMV;
using MCMath_800::IMCRandomSource;
using MCMath_800::MCRandomValues;
using MCMath_800::MCSymMatrix;
using MCMath_800::MCURandom;

namespace {

constexpr double kTwoPowMinus53 = 1.0 / 9007199254740992.0;

//! A host source that hands out a fixed list of words, then zeros.
class ListSource : public IMCRandomSource {
public:
    explicit ListSource(std::vector<std::uint64_t> words) : fWords(std::move(words)) {}
    std::uint64_t GetWord() override { return fNext < fWords.size() ? fWords[fNext++] : 0; }

private:
    std::vector<std::uint64_t> fWords;
    std::size_t fNext = 0;
};

MCSymMatrix Matrix(int n, const std::vector<double>& lower) {
    MCSymMatrix m(n);
    std::size_t k = 0;
    for (int i = 0; i < n; ++i) {
        for (int j = 0; j <= i; ++j) {
            m.SetElem(i, j, lower[k++]);
        }
    }
    return m;
}

//! A standard normal generator drawing from `stream`.
MCRandomValues StandardNormal(MCURandom& stream) {
    MCRandomValues normal;
    normal.SetURNGPtr(&stream);
    EXPECT_TRUE(normal.SetParamNormal());
    return normal;
}

// Regression: a change here changes every simulation run with the default seed.
TEST(MCURandom, IsTheStandardMersenneTwisterWithPinnedDefaultOutputs) {
    // The 10000th output of MT19937-64 from seed 5489 is fixed by the C++ standard
    // ([rand.predef]): the stream is the same engine on every platform.
    MCURandom standard(5489u);
    std::uint64_t w = 0;
    for (int i = 0; i < 10000; ++i) {
        w = standard.GetWord();
    }
    EXPECT_EQ(w, 9981545732273789042ULL);
    // Uniforms computed independently from the words of std::mt19937_64(629111597); normals
    // by a separate program calling boost::random::normal_distribution<double> on that
    // engine, Boost 1.74 (a new method or Boost ziggurat would change them).
    MCURandom uniforms, normals;
    MCRandomValues normal = StandardNormal(normals);
    const double expected[][2] = {{0.40956470070444084, -0.57274834836357313},
                                  {0.14201911697009295, 0.28232826328919891},
                                  {0.60955487052763202, 0.59888815007241947},
                                  {0.18792881150235941, -0.28301497125580438},
                                  {0.90282555026573597, -1.5225221611546746}};
    for (const auto& e : expected) {
        EXPECT_EQ(uniforms.GetRandom(), e[0]);
        EXPECT_EQ(normal.GetRandom(), e[1]);
    }
}

// [0, 1) takes the top 53 bits of a word, (0, 1) the top 52 bits and a final 1: the words 0 and
// 2^64 - 1 give the ends 0 and 1 - 2^-53, and 2^-53 and 1 - 2^-53.
TEST(MCURandom, DoublesAreBuiltFromTheTopBitsOfEachWord) {
    std::vector<std::uint64_t> words(1002);
    MCURandom engine(12345u);
    std::generate(words.begin() + 2, words.end(), [&engine] { return engine.GetWord(); });
    words[1] = ~std::uint64_t{0};
    ListSource a(words), b(words);
    MCURandom halfOpen(1u, true, true, &a);
    MCURandom open(1u, true, false, &b);
    for (const std::uint64_t w : words) {
        EXPECT_EQ(halfOpen.GetRandom(), static_cast<double>(w >> 11) * kTwoPowMinus53);
        EXPECT_EQ(open.GetRandom(), (2.0 * static_cast<double>(w >> 12) + 1.0) * kTwoPowMinus53);
    }
}

TEST(MCURandom, CopyReseedAndDrawnSeedReproduceTheStream) {
    MCURandom a(777u);
    for (int i = 0; i < 100; ++i) {
        (void)a.GetRandom();
    }
    MCURandom worker = a;
    for (int i = 0; i < 1000; ++i) {
        ASSERT_EQ(a.GetRandom(), worker.GetRandom());
    }
    MCURandom fresh(777u), drawn(0u, false), again(drawn.GetSeed());
    a.SetSeed(777u);
    for (int i = 0; i < 100; ++i) {
        ASSERT_EQ(a.GetRandom(), fresh.GetRandom());
        ASSERT_EQ(drawn.GetRandom(), again.GetRandom());
    }
}

TEST(MCRandomValues, NormalsAreBoostsZigguratOnTheStreamsWords) {
    // The generator must give exactly what Boost.Random's normal_distribution gives on the same
    // MT19937-64 words, whether the words come from the stream's engine or a host's source.
    for (const std::uint32_t seed : {1u, 629111597u, 4000000000u}) {
        MCURandom stream(seed);
        MCRandomValues normal = StandardNormal(stream);
        boost::random::mt19937_64 engine(seed);
        boost::random::normal_distribution<double> reference;
        for (int i = 0; i < 20000; ++i) {
            ASSERT_EQ(normal.GetRandom(), reference(engine)) << "seed " << seed << " draw " << i;
        }
    }
    boost::random::mt19937_64 engine(5u);
    std::vector<std::uint64_t> words(3000);
    std::generate(words.begin(), words.end(), engine);
    ListSource source(words);
    MCURandom hosted(0u, true, true, &source);
    MCRandomValues normal = StandardNormal(hosted);
    engine.seed(5u);
    boost::random::normal_distribution<double> reference;
    for (int i = 0; i < 2000; ++i) {
        ASSERT_EQ(normal.GetRandom(), reference(engine));
    }
}

TEST(MCRandomValues, NormalsFollowTheStandardNormalIntoTheTails) {
    // 10^6 draws: Kolmogorov-Smirnov against Φ under the DKW bound of false-failure rate 1e-6,
    // sqrt(ln(2e6)/(2n)); the share beyond the ziggurat's tail layer |z| = 3.4426, drawn by its
    // own method, is 2(1 − Φ(3.4426))·n ≈ 576 ± 24: 6 standard deviations.
    MCURandom stream(20261207u);
    MCRandomValues normal = StandardNormal(stream);
    const int n = 1000000;
    std::vector<double> z(n);
    int tail = 0;
    for (double& v : z) {
        v = normal.GetRandom();
        tail += std::fabs(v) > 3.4426 ? 1 : 0;
    }
    std::sort(z.begin(), z.end());
    double d = 0.0;
    for (int i = 0; i < n; ++i) {
        const double f = 0.5 * std::erfc(-z[static_cast<std::size_t>(i)] / std::sqrt(2.0));
        d = std::max({d, f - static_cast<double>(i) / n, static_cast<double>(i + 1) / n - f});
    }
    EXPECT_LT(d, std::sqrt(std::log(2e6) / (2.0 * n)));
    const double expectedTail = n * std::erfc(3.4426 / std::sqrt(2.0));
    EXPECT_NEAR(tail, expectedTail, 6.0 * std::sqrt(expectedTail));
}

TEST(MCRandomValues, VectorIsConsecutiveNormalsThroughTheCholeskyFactor) {
    // x = m + s·L·z with L = [[1, 0], [r, √(1 − r²)]], z the next normals of the stream; the
    // independent setting gives z itself.
    const double r = 0.6;
    MCURandom a(99u), b = a, c = a;
    MCRandomValues single = StandardNormal(a), pair = StandardNormal(b),
                   independent = StandardNormal(c);
    ASSERT_TRUE(pair.SetParamNormal({1.0, -2.0}, 3.0, Matrix(2, {1.0, r, 1.0})));
    ASSERT_TRUE(independent.SetParamNormal(2));
    std::vector<double> x, z;
    for (int i = 0; i < 100; ++i) {
        const double z0 = single.GetRandom();
        const double z1 = single.GetRandom();
        ASSERT_TRUE(pair.GetRandom(x));
        ASSERT_TRUE(independent.GetRandom(z));
        ASSERT_EQ(x.size(), 2u);
        EXPECT_NEAR_REL(x[0], 1.0 + 3.0 * z0, 1e-14);
        EXPECT_NEAR_TOL(x[1], -2.0 + 3.0 * (r * z0 + 0.8 * z1), 1e-14, 1e-14);
        EXPECT_EQ(z, (std::vector<double>{z0, z1}));
    }
}

TEST(MCRandomValues, SampleCorrelationMatchesTheRequestedMatrix) {
    // 200000 vectors: a sample correlation's standard error (1 − ρ²)/√n ≤ 0.0023, so 0.01 is
    // over four (fails for about 1 seed in 10^5); means within 5 standard errors, sd within 1%.
    const MCSymMatrix corr = Matrix(3, {1.0, 0.6, 1.0, -0.3, 0.2, 1.0});
    const Eigen::Vector3d means(1.0, -2.0, 5.0);
    const double scale = 2.0;
    MCURandom stream(629111597u);
    MCRandomValues gen = StandardNormal(stream);
    ASSERT_TRUE(gen.SetParamNormal({means[0], means[1], means[2]}, scale, corr));
    const int n = 200000;
    Eigen::MatrixXd sample(n, 3);
    std::vector<double> x;
    for (int k = 0; k < n; ++k) {
        ASSERT_TRUE(gen.GetRandom(x));
        sample.row(k) = Eigen::Vector3d(x[0], x[1], x[2]).transpose();
    }
    const Eigen::Vector3d mean = sample.colwise().mean();
    const Eigen::MatrixXd centred = sample.rowwise() - mean.transpose();
    const Eigen::Matrix3d cov = centred.transpose() * centred / (n - 1);
    for (int i = 0; i < 3; ++i) {
        EXPECT_NEAR(mean[i], means[i], 5.0 * scale / std::sqrt(n));
        EXPECT_NEAR(std::sqrt(cov(i, i)), scale, 0.01 * scale);
        for (int j = 0; j < i; ++j) {
            EXPECT_NEAR(cov(i, j) / std::sqrt(cov(i, i) * cov(j, j)), corr.GetElem(i, j), 0.01);
        }
    }
}

TEST(MCRandomValues, PerfectCorrelationIsUsable) {
    // The copula search asks for the normal pair at r = ±1; the matrix is only
    // semi-definite but the pair is well defined: x1 = ±x0.
    MCURandom stream(3u);
    MCRandomValues gen = StandardNormal(stream);
    std::vector<double> x;
    for (const double r : {1.0, -1.0}) {
        ASSERT_TRUE(gen.SetParamNormal({0.0, 0.0}, 1.0, Matrix(2, {1.0, r, 1.0}))) << r;
        for (int i = 0; i < 100; ++i) {
            ASSERT_TRUE(gen.GetRandom(x));
            EXPECT_NEAR_TOL(x[1], r * x[0], 0.0, 1e-12);
        }
    }
    // A 3x3 with two identical variables and a third correlated with both.
    ASSERT_TRUE(
        gen.SetParamNormal({0.0, 0.0, 0.0}, 1.0, Matrix(3, {1.0, 1.0, 1.0, 0.5, 0.5, 1.0})));
    ASSERT_TRUE(gen.GetRandom(x));
    EXPECT_NEAR_TOL(x[1], x[0], 0.0, 1e-12);
}

struct BadSetting {
    const char* fName;
    std::vector<double> fMeans;
    double fScale;
    MCSymMatrix fMatrix;
};

class MCRandomValuesBad : public ::testing::TestWithParam<BadSetting> {};

TEST_P(MCRandomValuesBad, IsRefusedAndLeavesNoSetting) {
    const auto& c = GetParam();
    MCURandom stream(1u);
    MCRandomValues gen = StandardNormal(stream);
    ASSERT_TRUE(gen.SetParamNormal(2));
    EXPECT_FALSE(gen.SetParamNormal(c.fMeans, c.fScale, c.fMatrix));
    std::vector<double> x = {42.0};
    EXPECT_FALSE(gen.GetRandom(x));
    EXPECT_EQ(x, std::vector<double>{42.0});
    EXPECT_EQ(gen.GetDimension(), 0);
}

const double kNaN = std::numeric_limits<double>::quiet_NaN();

// clang-format off
INSTANTIATE_TEST_SUITE_P(Settings, MCRandomValuesBad, ::testing::Values(
    BadSetting{"Indefinite", {0, 0, 0}, 1.0, Matrix(3, {1, 0.9, 1, 0.9, -0.9, 1})},
    BadSetting{"SizeMismatch", {0, 0}, 1.0, Matrix(3, {1, 0, 1, 0, 0, 1})},
    BadSetting{"Empty", {}, 1.0, MCSymMatrix()},
    BadSetting{"NaNEntry", {0, 0}, 1.0, Matrix(2, {1, kNaN, 1})},
    BadSetting{"NaNMean", {0, kNaN}, 1.0, Matrix(2, {1, 0.5, 1})},
    BadSetting{"ZeroScale", {0, 0}, 0.0, Matrix(2, {1, 0.5, 1})},
    BadSetting{"NegativeScale", {0, 0}, -1.0, Matrix(2, {1, 0.5, 1})},
    BadSetting{"NaNScale", {0, 0}, kNaN, Matrix(2, {1, 0.5, 1})},
    BadSetting{"CorrelationAboveOne", {0, 0}, 1.0, Matrix(2, {1, 1.01, 1})},
    BadSetting{"NegativeVariance", {0, 0}, 1.0, Matrix(2, {-1, 0, 1})}),
    [](const ::testing::TestParamInfo<BadSetting>& p) { return p.param.fName; });
// clang-format on

TEST(MCRandomValues, DrawingNeedsAStreamAndAMatchingSetting) {
    MCRandomValues gen;
    std::vector<double> x;
    EXPECT_FALSE(gen.GetRandom(x)); // nothing set
    ASSERT_TRUE(gen.SetParamNormal());
    EXPECT_TRUE(MCMV::IsMissing(gen.GetRandom())); // no stream
    EXPECT_FALSE(gen.GetRandom(x));
    MCURandom stream(1u);
    gen.SetURNGPtr(&stream);
    EXPECT_FALSE(MCMV::IsMissing(gen.GetRandom()));
    ASSERT_TRUE(gen.SetParamNormal(3));
    EXPECT_TRUE(MCMV::IsMissing(gen.GetRandom())); // one value of a 3-vector setting
    EXPECT_FALSE(gen.SetParamNormal(0));
    EXPECT_FALSE(gen.GetRandom(x));
}

} // namespace
