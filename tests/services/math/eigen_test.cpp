#include "mcmath/mceigen.h"
#include "mcmath/mcsymmatrix.h"

#include "mctolerance.h"

#include <Eigen/Cholesky>
#include <Eigen/Eigenvalues>

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <tuple>
#include <vector>

using MCMath_800::MCEigenValues;
using MCMath_800::MCSymMatrix;

namespace {

//! The matrix of dimension n from its lower triangle, row by row.
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

Eigen::MatrixXd Dense(const MCSymMatrix& m) {
    return Eigen::MatrixXd::NullaryExpr(
        m.GetNRows(), m.GetNRows(), [&m](Eigen::Index i, Eigen::Index j) {
            return m.GetElem(static_cast<int>(i), static_cast<int>(j));
        });
}

//! The simple repair the projections must beat: clip the eigenvalues at eps, rescale to a
//! unit diagonal.
Eigen::MatrixXd ClipAndRescale(const MCSymMatrix& m, double eps) {
    const Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd> s(Dense(m));
    const Eigen::MatrixXd c = s.eigenvectors() * s.eigenvalues().cwiseMax(eps).asDiagonal() *
                              s.eigenvectors().transpose();
    const Eigen::VectorXd d = c.diagonal().cwiseSqrt().cwiseInverse();
    return d.asDiagonal() * c * d.asDiagonal();
}

TEST(MCEigenValues, KnownSpectra) {
    // [[2, 1], [1, 2]]: 1 and 3. Equicorrelation ρ in 3 dimensions: 1 − ρ twice, 1 + 2ρ.
    // Tridiagonal (−1, 2, −1) of order 4: 2 − 2cos(kπ/5), k = 1..4.
    const double pi = std::acos(-1.0);
    const auto tri = [pi](int k) { return 2.0 - 2.0 * std::cos(k * pi / 5.0); };
    const std::pair<MCSymMatrix, std::vector<double>> cases[] = {
        {Matrix(2, {2, 1, 2}), {1.0, 3.0}},
        {Matrix(3, {1, 0.4, 1, 0.4, 0.4, 1}), {0.6, 0.6, 1.8}},
        {Matrix(4, {2, -1, 2, 0, -1, 2, 0, 0, -1, 2}), {tri(1), tri(2), tri(3), tri(4)}}};
    for (const auto& [matrix, expected] : cases) {
        const MCEigenValues eigen(matrix, 1e-12, 30);
        ASSERT_TRUE(eigen.IsValid());
        ASSERT_EQ(eigen.GetEigenValues().size(), expected.size());
        for (std::size_t i = 0; i < expected.size(); ++i) {
            EXPECT_NEAR_TOL(eigen.GetEigenValues()[i], expected[i], 1e-14, 1e-15);
        }
    }
}

TEST(MCEigenValues, HighamsExampleReachesThePublishedNearestCorrelationMatrix) {
    // Higham (2002), section 4: the nearest correlation matrix to [[1, 1, 0], [1, 1, 1],
    // [0, 1, 1]] has off-diagonal entries 0.7607, 0.1573, 0.7607 (four digits published).
    MCEigenValues eigen(Matrix(3, {1, 1, 1, 0, 1, 1}), 1e-12, 200);
    MCSymMatrix out;
    bool adjusted = false;
    ASSERT_TRUE(eigen.GetPDHMatrix(1e-6, out, adjusted));
    EXPECT_TRUE(adjusted);
    for (const auto& [i, j, expected] :
         {std::tuple{1, 0, 0.7607}, {2, 0, 0.1573}, {2, 1, 0.7607}}) {
        EXPECT_NEAR(out.GetElem(i, j), expected, 5e-5);
    }
    EXPECT_LT(eigen.GetIterations(), 200);
}

struct RepairCase {
    const char* fName;
    MCSymMatrix fMatrix;
};

class RepairOfIndefinite : public ::testing::TestWithParam<RepairCase> {};

TEST_P(RepairOfIndefinite, GivesANearbyPositiveDefiniteCorrelationMatrix) {
    const MCSymMatrix& q = GetParam().fMatrix;
    const double eps = 1e-6;
    // The simulation's settings: tolerance 1e-12, at most 30 projections.
    MCEigenValues eigen(q, 1e-12, 30);
    MCSymMatrix out;
    bool adjusted = false;
    ASSERT_TRUE(eigen.GetPDHMatrix(eps, out, adjusted));
    EXPECT_TRUE(adjusted);
    ASSERT_EQ(out.GetNRows(), q.GetNRows());
    for (int i = 0; i < q.GetNRows(); ++i) {
        EXPECT_EQ(out.GetElem(i, i), 1.0);
        for (int j = 0; j < i; ++j) {
            EXPECT_LE(std::fabs(out.GetElem(i, j)), 1.0);
        }
    }
    const Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd> spectrum(Dense(out));
    EXPECT_GT(spectrum.eigenvalues().minCoeff(), 0.5 * eps);
    EXPECT_EQ(Eigen::LLT<Eigen::MatrixXd>(Dense(out)).info(), Eigen::Success);
    // No farther from the input than clip-and-rescale, up to O(eps): rescaling pushes the
    // clipped eigenvalues a little below eps, a slightly larger set than the projections'.
    EXPECT_LE((Dense(out) - Dense(q)).norm(),
              (ClipAndRescale(q, eps) - Dense(q)).norm() + 10 * eps);
    // A positive definite matrix, such as the repaired one, is returned untouched.
    MCEigenValues again(out, 1e-12, 30);
    MCSymMatrix twice;
    ASSERT_TRUE(again.GetPDHMatrix(0.5 * eps, twice, adjusted));
    EXPECT_FALSE(adjusted);
    EXPECT_TRUE(twice == out);
    EXPECT_EQ(again.GetIterations(), 0);
}

// Incompatible signs of pairwise estimates; slightly indefinite, as copula estimates usually
// are; semi-definite (two identical variables); positive definite but numerically singular
// (smallest eigenvalue 1e-9 < eps); six variables with a block of contradicting correlations.
// clang-format off
INSTANTIATE_TEST_SUITE_P(Matrices, RepairOfIndefinite, ::testing::Values(
    RepairCase{"IncompatibleSigns", Matrix(3, {1, 0.9, 1, 0.9, -0.9, 1})},
    RepairCase{"SlightlyIndefinite", Matrix(3, {1, 0.95, 1, 0.7, 0.95, 1})},
    RepairCase{"SemiDefinite", Matrix(2, {1, 1, 1})},
    RepairCase{"NearlySingular", Matrix(2, {1, 1.0 - 1e-9, 1})},
    RepairCase{"SixVariables", Matrix(6, {1, 0.8, 1, 0.8, -0.7, 1, 0.1, 0.2, 0.3, 1, 0.5, 0.5, 0.5,
                                          -0.6, 1, 0.9, 0.9, 0.9, 0.1, 0.2, 1})}),
    [](const ::testing::TestParamInfo<RepairCase>& p) { return p.param.fName; });
// clang-format on

TEST(MCEigenValues, NoRepairForUnusableInput) {
    const double nan = std::numeric_limits<double>::quiet_NaN();
    MCSymMatrix out = Matrix(1, {7.0});
    bool adjusted = true;

    MCEigenValues withNaN(Matrix(2, {1, nan, 1}), 1e-12, 30);
    EXPECT_FALSE(withNaN.IsValid());
    EXPECT_FALSE(withNaN.GetPDHMatrix(1e-6, out, adjusted));
    EXPECT_FALSE(MCEigenValues(MCSymMatrix(), 1e-12, 30).GetPDHMatrix(1e-6, out, adjusted));
    MCEigenValues fine(Matrix(2, {1, 0.5, 1}), 1e-12, 30);
    for (const double eps : {0.0, 1.0, nan}) { // outside (0, 1)
        EXPECT_FALSE(fine.GetPDHMatrix(eps, out, adjusted)) << eps;
    }
    // Failures leave the caller's values alone.
    EXPECT_TRUE(out.GetNRows() == 1 && out.GetElem(0, 0) == 7.0 && adjusted);
}

} // namespace
