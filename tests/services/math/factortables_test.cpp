#include "mcmath/mcfactortables.h"

#include "mccommon/mcmv.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <set>
#include <vector>

using MCCommon_800::MCMV;
using MCMath_800::MCFactorTables;
using MCXML_800::Record;

namespace {

// Three factors stored at record variables 4, 1 and 2 (not in order, to catch a table that
// reads the record by factor position), with 2, 3 and 4 levels.
const std::vector<int> kFactorVars{4, 1, 2};
const std::vector<int> kLevels{2, 3, 4};

// A record whose factor values are the codes plus an offset in (-0.5, 0.5) that rounds away.
Record MakeRecord(const std::vector<int>& codes, double offset) {
    Record r(std::vector<double>(5, 99.0));
    for (std::size_t k = 0; k < codes.size(); ++k) {
        r[static_cast<std::size_t>(kFactorVars[k])] = codes[k] + offset;
    }
    return r;
}

std::vector<std::vector<int>> AllCodeVectors() {
    std::vector<std::vector<int>> all;
    for (int a = 0; a < kLevels[0]; ++a) {
        for (int b = 0; b < kLevels[1]; ++b) {
            for (int c = 0; c < kLevels[2]; ++c) {
                all.push_back({a, b, c});
            }
        }
    }
    return all;
}

} // namespace

// With every combination present, the cell of (a, b, c) is the row-major position
// a·(3·4) + b·4 + c: the first factor varies slowest.
TEST(MCFactorTables, FullTableIsRowMajorWithFirstFactorSlowest) {
    MCFactorTables t;
    ASSERT_TRUE(t.SetModelEffectFactors(kFactorVars));
    std::vector<std::vector<int>> all = AllCodeVectors();
    std::mt19937_64 gen(3);
    std::shuffle(all.begin(), all.end(), gen);
    const double offsets[] = {0.0, 0.4, -0.4, 0.3};
    for (std::size_t i = 0; i < all.size(); ++i) {
        ASSERT_TRUE(t.UpdateAll(MakeRecord(all[i], offsets[i % 4])));
        ASSERT_TRUE(t.UpdateAll(MakeRecord(all[i], 0.1))); // seen twice: still one cell
    }
    ASSERT_EQ(t.CreateParameterIndices(0), 24);
    std::vector<int> codes;
    for (const std::vector<int>& v : AllCodeVectors()) {
        const int expected = v[0] * 12 + v[1] * 4 + v[2];
        const std::vector<int>& indices = t.GetParameterIndices(v, false);
        ASSERT_EQ(indices.size(), 1u);
        EXPECT_EQ(indices[0], expected);
        ASSERT_TRUE(t.GetParameterFactorValues(codes, 0, expected));
        EXPECT_EQ(codes, v);
    }
}

// With only some combinations seen, the cells are exactly those, numbered in lexicographic
// order; the mapping and its inverse agree for every code vector of the full grid.
TEST(MCFactorTables, PartialTableHoldsOnlyObservedCells) {
    MCFactorTables t;
    ASSERT_TRUE(t.SetModelEffectFactors(kFactorVars));
    std::mt19937_64 gen(11);
    std::bernoulli_distribution keep(0.4);
    std::set<std::vector<int>> seen; // ordered: the expected numbering
    for (const std::vector<int>& v : AllCodeVectors()) {
        if (keep(gen)) {
            seen.insert(v);
            ASSERT_TRUE(t.UpdateAll(MakeRecord(v, -0.2)));
        }
    }
    ASSERT_GT(seen.size(), 3u);
    constexpr int kFirst = 5;
    ASSERT_EQ(t.CreateParameterIndices(kFirst), static_cast<int>(seen.size()));
    const std::vector<std::vector<int>> order(seen.begin(), seen.end());
    std::vector<int> codes;
    for (const std::vector<int>& v : AllCodeVectors()) {
        const auto pos = std::find(order.begin(), order.end(), v);
        const int expected =
            pos == order.end() ? -1 : kFirst + static_cast<int>(pos - order.begin());
        EXPECT_EQ(t.GetParameterIndices(v, false)[0], expected);
        if (expected >= 0) {
            ASSERT_TRUE(t.GetParameterFactorValues(codes, 0, expected));
            EXPECT_EQ(codes, v);
        }
    }
    EXPECT_EQ(t.GetNCells(), static_cast<int>(seen.size()));
    EXPECT_FALSE(t.GetParameterFactorValues(codes, 0, kFirst - 1));
    EXPECT_TRUE(codes.empty());
    EXPECT_FALSE(t.GetParameterFactorValues(codes, 0, kFirst + t.GetNCells()));
    EXPECT_FALSE(t.GetParameterFactorValues(codes, 1, kFirst));
}

TEST(MCFactorTables, AddNewAppendsAfterTheNumberedCells) {
    MCFactorTables t;
    ASSERT_TRUE(t.SetModelEffectFactors({0, 1}));
    ASSERT_TRUE(t.UpdateCodes({1, 1}));
    ASSERT_TRUE(t.UpdateCodes({0, 2}));
    ASSERT_EQ(t.CreateParameterIndices(0), 2);
    EXPECT_EQ(t.GetParameterIndices({0, 0}, false)[0], -1);
    EXPECT_EQ(t.GetNCells(), 2);
    EXPECT_EQ(t.GetParameterIndices({0, 0}, true)[0], 2);
    EXPECT_EQ(t.GetParameterIndices({0, 0}, false)[0], 2);
    EXPECT_EQ(t.GetParameterIndices({0, -1}, true)[0], -1);
    EXPECT_EQ(t.GetParameterIndices({0}, true)[0], -1);
    // A new numbering restores the lexicographic order.
    ASSERT_EQ(t.CreateParameterIndices(0), 3);
    EXPECT_EQ(t.GetParameterIndices({0, 0}, false)[0], 0);
    EXPECT_EQ(t.GetParameterIndices({1, 1}, false)[0], 2);
}

// Records that do not give every factor a code add no cell.
struct BadRecordCase {
    const char* fName;
    double fValue; //!< value of the second factor
    bool fValid;
};

class FactorRecord : public ::testing::TestWithParam<BadRecordCase> {};

TEST_P(FactorRecord, OnlyRecordsWithEveryCodeCount) {
    const BadRecordCase& c = GetParam();
    MCFactorTables t;
    ASSERT_TRUE(t.SetModelEffectFactors(kFactorVars));
    Record r = MakeRecord({1, 0, 2}, 0.0);
    r[1] = c.fValue;
    EXPECT_EQ(t.UpdateAll(r), c.fValid);
    EXPECT_EQ(t.CreateParameterIndices(0), c.fValid ? 1 : 0);
}

INSTANTIATE_TEST_SUITE_P(Table, FactorRecord,
                         ::testing::Values(BadRecordCase{"Whole", 2.0, true},
                                           BadRecordCase{"SmallNegative", -0.4, true},
                                           BadRecordCase{"MinusHalf", -0.5, false},
                                           BadRecordCase{"Missing", MCMV::Missing(), false},
                                           BadRecordCase{"TooLarge", 1e12, false}),
                         [](const ::testing::TestParamInfo<BadRecordCase>& p) {
                             return p.param.fName;
                         });

TEST(MCFactorTables, CodesRoundHalfUpAndShortRecordsAreRefused) {
    EXPECT_EQ(MCFactorTables::CodeOf(2.4), 2);
    EXPECT_EQ(MCFactorTables::CodeOf(2.5), 3);
    EXPECT_EQ(MCFactorTables::CodeOf(-0.4), 0);
    EXPECT_EQ(MCFactorTables::CodeOf(-0.5), -1);
    MCFactorTables t;
    EXPECT_FALSE(t.SetModelEffectFactors({}));
    EXPECT_FALSE(t.SetModelEffectFactors({0, -1}));
    EXPECT_FALSE(t.UpdateAll(Record(std::vector<double>{1.0})));
    ASSERT_TRUE(t.SetModelEffectFactors({0, 3}));
    // Variable 3 is beyond the record: its value is missing.
    EXPECT_FALSE(t.UpdateAll(Record(std::vector<double>{1.0, 1.0})));
    EXPECT_FALSE(t.UpdateCodes({1}));
    EXPECT_EQ(t.CreateParameterIndices(0), 0);
}
