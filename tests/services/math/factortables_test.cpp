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

using Codes = std::vector<int>;

// Three factors of 2, 3 and 4 levels at record variables 4, 1 and 2 (out of order, to catch a
// table that reads the record by factor position).
const Codes kFactorVars{4, 1, 2};

// A record whose factor values are the codes plus an offset in (-0.5, 0.5) that rounds away.
Record MakeRecord(const Codes& codes, double offset) {
    Record r(std::vector<double>(5, 99.0));
    for (std::size_t k = 0; k < codes.size(); ++k) {
        r[static_cast<std::size_t>(kFactorVars[k])] = codes[k] + offset;
    }
    return r;
}

// Every code vector of the 2 x 3 x 4 grid, in lexicographic order.
std::vector<Codes> AllCodeVectors() {
    std::vector<Codes> all;
    for (int k = 0; k < 24; ++k) {
        all.push_back({k / 12, k / 4 % 3, k % 4});
    }
    return all;
}

class FactorTable : public ::testing::TestWithParam<double> {};

// The cells are the combinations seen (in any order, any number of times), numbered
// lexicographically from the first index: with all present, (a, b, c) is at a·12 + b·4 + c.
// The mapping and its inverse agree for every code vector of the full grid.
TEST_P(FactorTable, HoldsTheObservedCellsInLexicographicOrder) {
    MCFactorTables t;
    ASSERT_TRUE(t.SetModelEffectFactors(kFactorVars));
    std::mt19937_64 gen(11);
    std::bernoulli_distribution keep(GetParam());
    std::vector<Codes> shuffled = AllCodeVectors();
    std::shuffle(shuffled.begin(), shuffled.end(), gen);
    std::set<Codes> seen;
    const double offsets[] = {0.0, 0.4, -0.4, 0.3};
    for (std::size_t i = 0; i < shuffled.size(); ++i) {
        if (keep(gen)) {
            seen.insert(shuffled[i]);
            ASSERT_TRUE(t.UpdateAll(MakeRecord(shuffled[i], offsets[i % 4])));
            ASSERT_TRUE(t.UpdateAll(MakeRecord(shuffled[i], -0.2))); // seen twice: one cell
        }
    }
    ASSERT_GT(seen.size(), 3u);
    constexpr int kFirst = 5;
    ASSERT_EQ(t.CreateParameterIndices(kFirst), static_cast<int>(seen.size()));
    const std::vector<Codes> order(seen.begin(), seen.end());
    Codes codes;
    for (const Codes& v : AllCodeVectors()) {
        const auto pos = std::find(order.begin(), order.end(), v);
        const int expected =
            pos == order.end() ? -1 : kFirst + static_cast<int>(pos - order.begin());
        if (seen.size() == 24) {
            EXPECT_EQ(expected, kFirst + v[0] * 12 + v[1] * 4 + v[2]);
        }
        ASSERT_EQ(t.GetParameterIndices(v, false).size(), 1u);
        EXPECT_EQ(t.GetParameterIndices(v, false)[0], expected);
        if (expected >= 0) {
            ASSERT_TRUE(t.GetParameterFactorValues(codes, 0, expected));
            EXPECT_EQ(codes, v);
        }
    }
    EXPECT_FALSE(t.GetParameterFactorValues(codes, 0, kFirst - 1));
    EXPECT_TRUE(codes.empty());
    EXPECT_FALSE(t.GetParameterFactorValues(codes, 0, kFirst + t.GetNCells()));
    EXPECT_FALSE(t.GetParameterFactorValues(codes, 1, kFirst));
}

INSTANTIATE_TEST_SUITE_P(ShareSeen, FactorTable, ::testing::Values(1.0, 0.4));

TEST(MCFactorTables, AddNewAppendsAfterTheNumberedCells) {
    MCFactorTables t;
    ASSERT_TRUE(t.SetModelEffectFactors({0, 1}));
    ASSERT_TRUE(t.UpdateCodes({1, 1}) && t.UpdateCodes({0, 2}));
    ASSERT_EQ(t.CreateParameterIndices(0), 2);
    EXPECT_EQ(t.GetParameterIndices({0, 0}, false)[0], -1);
    EXPECT_EQ(t.GetParameterIndices({0, 0}, true)[0], 2);
    EXPECT_EQ(t.GetParameterIndices({0, 0}, false)[0], 2);
    EXPECT_EQ(t.GetParameterIndices({0, -1}, true)[0], -1);
    EXPECT_EQ(t.GetParameterIndices({0}, true)[0], -1);
    // A new numbering restores the lexicographic order.
    ASSERT_EQ(t.CreateParameterIndices(0), 3);
    EXPECT_EQ(t.GetParameterIndices({0, 0}, false)[0], 0);
    EXPECT_EQ(t.GetParameterIndices({1, 1}, false)[0], 2);
}

// The code of a factor value rounds half up; records that do not give every factor a code add
// no cell.
class FactorCode : public ::testing::TestWithParam<std::pair<double, int>> {};

TEST_P(FactorCode, OnlyRecordsWithEveryCodeCount) {
    const auto [value, code] = GetParam();
    EXPECT_EQ(MCFactorTables::CodeOf(value), code);
    MCFactorTables t;
    ASSERT_TRUE(t.SetModelEffectFactors(kFactorVars));
    Record r = MakeRecord({1, 0, 2}, 0.0);
    r[1] = value;
    EXPECT_EQ(t.UpdateAll(r), code >= 0);
    EXPECT_EQ(t.CreateParameterIndices(0), code >= 0 ? 1 : 0);
}

INSTANTIATE_TEST_SUITE_P(Table, FactorCode,
                         ::testing::Values(std::make_pair(2.0, 2), std::make_pair(2.4, 2),
                                           std::make_pair(2.5, 3), std::make_pair(-0.4, 0),
                                           std::make_pair(-0.5, -1),
                                           std::make_pair(MCMV::Missing(), -1),
                                           std::make_pair(1e12, -1)));

TEST(MCFactorTables, BadFactorListsAndShortRecordsAreRefused) {
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

} // namespace
