#include "simulation_common/mcspscatterplotdata.h"

#include "component/mcspassert.h"
#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <random>
#include <tuple>

using namespace MCMCSP_800;

namespace {

using Cell = std::pair<int, int>;

//! 2 x 2 cells over x in [0, 10) and y in [0, 4).
MCScatterPlotData SmallGrid() {
    return MCScatterPlotData(2, 2, 0, 0, 10, 4, true);
}

//! The cell that received the single pair of `s`, on the grid or among the outliers.
Cell OnlyCellOf(const MCScatterPlotData& s) {
    const auto& counts = s.GetCellFreqCounts();
    for (std::size_t i = 0; i < counts.size(); ++i) {
        for (std::size_t j = 0; j < counts[i].size(); ++j) {
            if (counts[i][j] > 0.0) {
                return {static_cast<int>(i), static_cast<int>(j)};
            }
        }
    }
    return s.GetOutlierBinMap().empty() ? Cell{-99, -99} : s.GetOutlierBinMap().begin()->first;
}

struct CellCase {
    const char* name;
    double x, y;
    Cell expected;
};

class ScatterCellTest : public ::testing::TestWithParam<CellCase> {};

TEST_P(ScatterCellTest, PairLandsInItsCell) {
    const CellCase& c = GetParam();
    MCScatterPlotData s = SmallGrid();
    ASSERT_TRUE(s.UpdateData(1, 1, c.x, c.y));
    EXPECT_EQ(OnlyCellOf(s), c.expected);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Edges, ScatterCellTest, ::testing::Values(
    CellCase{"Inside", 7, 1, {1, 0}}, CellCase{"MaxX", 10, 1, {2, 0}},
    CellCase{"BelowBoth", -1, -1, {-1, -1}}, CellCase{"MaxY", 5, 4, {1, 2}},
    CellCase{"FarOff", 35, -9, {7, -5}}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

TEST(MCScatterPlotData, AnAxisThatCannotBeCutHasOneCell) {
    ClearLastAssertion();
    MCScatterPlotData s(2, 5, 0, 3, 10, 2, true); // y range reversed
    EXPECT_EQ(GetLastAssertion(), "Binning OK for Y");
    ASSERT_TRUE(s.UpdateData(1, 1, 7, -100));
    EXPECT_EQ(OnlyCellOf(s), (Cell{1, 0}));
    MCScatterPlotData t(1, 2, 0, 0, 10, 4, true);
    EXPECT_EQ(GetLastAssertion(), "Binning OK for X");
}

TEST(MCScatterPlotData, OutlierCellAveragesItsPairsAndBadPairsAreRefused) {
    MCScatterPlotData s = SmallGrid();
    ASSERT_TRUE(s.UpdateData(1, 1, 11, 5) && s.UpdateData(1, 1, 13, 5.5));
    EXPECT_FALSE(s.UpdateData(1, 1, 1, MCCommon_800::MCMV::Missing()));
    EXPECT_FALSE(s.UpdateData(1, 1, std::numeric_limits<double>::infinity(), 1));
    EXPECT_FALSE(s.UpdateData(1, 0, 1, 1));
    EXPECT_EQ(s.GetNCases(), 2.0);
    ASSERT_EQ(s.GetOutlierBinMap().size(), 1u);
    const auto& cell = s.GetOutlierBinMap().at({2, 2});
    EXPECT_EQ(cell.fFreqCount, 2.0);
    EXPECT_EQ(cell.fMeanX, 12.0);
    EXPECT_EQ(cell.fMeanY, 5.25);
}

// ---- Merging: k objects that split a stream of pairs equal one that saw all of it ----

struct SplitCase {
    const char* name;
    int parts, n;
    unsigned seed;
    double outlierShare;
};

class ScatterSplitTest : public ::testing::TestWithParam<SplitCase> {};

void ExpectSameScatter(const MCScatterPlotData& a, const MCScatterPlotData& b, double rel) {
    EXPECT_EQ(a.GetNCases(), b.GetNCases());
    EXPECT_EQ(a.GetTotalWeight(), b.GetTotalWeight()); // integer frequency weights
    EXPECT_NEAR_REL(a.GetWeightedCount(), b.GetWeightedCount(), rel);
    EXPECT_EQ(a.GetCellFreqCounts(), b.GetCellFreqCounts());
    for (std::size_t i = 0; i < a.GetMeansX().size(); ++i) {
        for (std::size_t j = 0; j < a.GetMeansX()[i].size(); ++j) {
            EXPECT_NEAR_REL(a.GetCellWeightedCounts()[i][j], b.GetCellWeightedCounts()[i][j], rel);
            EXPECT_NEAR_REL(a.GetMeansX()[i][j], b.GetMeansX()[i][j], rel) << i << "," << j;
            EXPECT_NEAR_REL(a.GetMeansY()[i][j], b.GetMeansY()[i][j], rel) << i << "," << j;
        }
    }
    ASSERT_EQ(a.GetOutlierBinMap().size(), b.GetOutlierBinMap().size());
    for (const auto& [cell, bin] : a.GetOutlierBinMap()) {
        const auto found = b.GetOutlierBinMap().find(cell);
        ASSERT_NE(found, b.GetOutlierBinMap().end());
        EXPECT_EQ(bin.fFreqCount, found->second.fFreqCount);
        EXPECT_NEAR_REL(bin.fWeightedCount, found->second.fWeightedCount, rel);
        EXPECT_NEAR_REL(bin.fMeanX, found->second.fMeanX, rel);
        EXPECT_NEAR_REL(bin.fMeanY, found->second.fMeanY, rel);
    }
}

TEST_P(ScatterSplitTest, MergedPartsEqualOnePass) {
    const SplitCase& c = GetParam();
    constexpr double kRel = 1e-12;
    // A 12 x 8 grid over x in [10, 22), y in [100, 104); outliers up to 2 cells off each side.
    auto make = [] { return MCScatterPlotData(12, 8, 10, 100, 22, 104, true); };
    std::mt19937_64 rng(c.seed);
    std::uniform_real_distribution<double> x(10, 22), y(100, 104), offX(8, 24), offY(99, 105);
    std::uniform_real_distribution<double> g(0.5, 2.0);
    std::uniform_int_distribution<int> f(1, 4), pick(0, c.parts - 1);
    std::bernoulli_distribution isOutlier(c.outlierShare);

    MCScatterPlotData whole = make();
    std::vector<MCScatterPlotData> parts(static_cast<std::size_t>(c.parts), make());
    for (int i = 0; i < c.n; ++i) {
        const bool off = isOutlier(rng);
        const double xi = off ? offX(rng) : x(rng), yi = off ? offY(rng) : y(rng);
        const double fi = f(rng), gi = g(rng);
        ASSERT_TRUE(whole.UpdateData(fi, gi, xi, yi));
        ASSERT_TRUE(parts[static_cast<std::size_t>(pick(rng))].UpdateData(fi, gi, xi, yi));
    }
    std::vector<const MCScatterPlotData*> all;
    for (const MCScatterPlotData& part : parts) {
        all.push_back(&part);
    }
    MCScatterPlotData master = make();
    ASSERT_TRUE(master.AddObjects(all).IsOK());
    ExpectSameScatter(master, whole, kRel);
    ASSERT_TRUE(parts[0].AddObjects({all.begin() + 1, all.end()}).IsOK());
    ExpectSameScatter(parts[0], whole, kRel);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Streams, ScatterSplitTest, ::testing::Values(
    SplitCase{"TwoParts", 2, 5000, 11, 0.1}, SplitCase{"FiveParts", 5, 5000, 12, 0.3},
    SplitCase{"SomePartsEmpty", 40, 30, 14, 0.2}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

struct MergeCase {
    const char* name;
    MCScatterPlotData other;
};

class ScatterMergeRuleTest : public ::testing::TestWithParam<MergeCase> {};

TEST_P(ScatterMergeRuleTest, IncompatibleFailsWith390010) {
    MCScatterPlotData receiver = SmallGrid(), other = GetParam().other;
    ASSERT_TRUE(receiver.UpdateData(1, 1, 1, 1));
    ASSERT_TRUE(other.UpdateData(1, 1, 2, 2));
    const MCScatterPlotData before(receiver);
    EXPECT_EQ(receiver.AddObjects({&other}).GetErrorCode(), 390010);
    ExpectSameScatter(receiver, before, 0.0);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Layouts, ScatterMergeRuleTest, ::testing::Values(
    MergeCase{"Raw", MCScatterPlotData(2, 2, 0, 0, 10, 4, false)},
    MergeCase{"OtherNx", MCScatterPlotData(3, 2, 0, 0, 15, 4, true)},
    MergeCase{"OtherNy", MCScatterPlotData(2, 4, 0, 0, 10, 8, true)},
    MergeCase{"OtherMinX", MCScatterPlotData(2, 2, 1, 0, 11, 4, true)},
    MergeCase{"OtherMinY", MCScatterPlotData(2, 2, 0, 1, 10, 5, true)},
    MergeCase{"OtherWidthX", MCScatterPlotData(2, 2, 0, 0, 12, 4, true)},
    MergeCase{"OtherWidthY", MCScatterPlotData(2, 2, 0, 0, 10, 6, true)}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

// Raw pairs are not binned (no outliers) and go into the record with their weights; raw and
// binned objects do not merge.
TEST(MCScatterPlotData, RawModeWritesPairsIntoTheRecordAndIsNotMerged) {
    MCScatterPlotData raw(2, 2, 0, 0, 10, 4, false);
    ASSERT_TRUE(raw.UpdateData(2, 1, 1, 10) && raw.UpdateData(1, 3, 20, -4));
    ASSERT_TRUE(raw.UpdateData(0.5, 1, 3, 30));
    EXPECT_TRUE(raw.GetOutlierBinMap().empty());
    const auto& record = raw.GetMCVariateData("in", "input", "", "out", "target", "");
    EXPECT_EQ(record.GetCount(), 3.5);
    ASSERT_EQ(record.fCoordinates.size(), 3u);
    EXPECT_EQ(record.fCoordinates[0].fValues, (std::vector<double>{1, 20, 3}));
    EXPECT_EQ(record.fCoordinates[1].fValues, (std::vector<double>{10, -4, 30}));
    EXPECT_EQ(record.fCoordinates[2].fValues, (std::vector<double>{2, 1, 0.5}));

    MCScatterPlotData binned = SmallGrid();
    ASSERT_TRUE(binned.UpdateData(1, 1, 1, 1));
    EXPECT_EQ(raw.AddObjects({&binned}).GetErrorCode(), 390010);
    EXPECT_EQ(raw.GetMCVariateData("", "", "", "", "", "").fCoordinates[0].fValues.size(), 3u);
    EXPECT_EQ(binned.AddObjects({&raw}).GetErrorCode(), 390010);
    EXPECT_EQ(binned.AddObjects({nullptr}).GetErrorCode(), 390010);
}

// Cells in x-major order, outliers not charted; the values are filled once, the texts on
// every call.
TEST(MCScatterPlotData, BinnedRecordIsFilledOnceTextsEveryCall) {
    MCScatterPlotData s = SmallGrid();
    for (const auto& [f, x, y] : {std::tuple{1, 7, 3}, {2, 1, 1}, {1, 8, 1}, {4, 50, 1}}) {
        ASSERT_TRUE(s.UpdateData(f, 1, x, y));
    }
    const auto& first = s.GetMCVariateData("x", "input", "xe", "y", "target", "ye");
    EXPECT_EQ(first.GetCount(), 8.0);
    EXPECT_EQ(first.fCoordinates[0].fValues, (std::vector<double>{1, 8, 7}));
    EXPECT_EQ(first.fCoordinates[1].fValues, (std::vector<double>{1, 1, 3}));
    EXPECT_EQ(first.fCoordinates[2].fValues, (std::vector<double>{2, 1, 1}));
    const auto& second = s.GetMCVariateData("x2", "in", "e2", "y2", "out", "f2");
    EXPECT_EQ(second.fCoordinates[0].fValues.size(), 3u);
    EXPECT_EQ(second.fCoordinates[0].fVarName, "x2");
    EXPECT_EQ(second.fCoordinates[1].fExtra, "f2");
}

} // namespace
