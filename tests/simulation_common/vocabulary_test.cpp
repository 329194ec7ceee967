// The distribution vocabulary against the published tables of names, element names, parameter
// lists, categories and validity, written out here independently of the implementation.
#include "simulation_common/mcspconst.h"
#include "simulation_common/simulatespecs.h"

#include <gtest/gtest.h>

#include <climits>
#include <memory>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCXML_800::IMCVariable;

namespace {

struct VocabularyRow {
    int type;
    const char* name;
    const char* elementName;
    std::vector<std::string> parameters;
    int category;
};

const VocabularyRow kRows[] = {
    {0, "Binomial", "DistBinomial", {"n", "prob"}, 3},
    {1, "Negbinomial", "DistNegbinomial", {"thresh", "prob", "type"}, 3},
    {2, "Categorical", "DistCategorical", {"cats", "probs"}, 2},
    {3, "Lognormal", "DistLognormal", {"a", "b"}, 1},
    {4, "Normal", "DistNormal", {"mean", "stddev"}, 1},
    {5, "Poisson", "DistPoisson", {"mean"}, 3},
    {6, "Triangular", "DistTriangular", {"min", "max", "mode"}, 1},
    {7, "Uniform", "DistUniform", {"min", "max"}, 1},
    {8, "Weibull", "DistWeibull", {"a", "b", "c"}, 1},
    {9, "Gamma", "DistGamma", {"shape", "scale"}, 1},
    {10, "Beta", "DistBeta", {"shape1", "shape2"}, 1},
    {11, "Exponential", "DistExponential", {"scale"}, 1},
    {12, "Bernoulli", "DistBernoulli", {"prob"}, 3},
    {13, "Empirical", "DistEmpirical", {"min", "max", "stddev", "probs"}, 0},
    {14, "UserRanges", "DistUserRanges", {"min", "max", "probs"}, 1},
    {15, "Unknown", "Unknown", {}, 0},
};

DistType AsType(int t) {
    return static_cast<DistType>(t);
}

TEST(Vocabulary, EveryTypeRoundTripsThroughBothNames) {
    for (const VocabularyRow& row : kRows) {
        SCOPED_TRACE(row.name);
        const DistType t = AsType(row.type);
        EXPECT_EQ(DistType2String(t), row.name);
        EXPECT_EQ(DistType2EleString(t), row.elementName);
        EXPECT_EQ(String2DistType(row.name), t);
        EXPECT_EQ(String2DistType(row.elementName), t);
        std::vector<std::string> names{"stale"};
        GetDistributionParameterNames(t, names);
        EXPECT_EQ(names, row.parameters);
        EXPECT_EQ(SimInputSpecs::GetDistTypeCategory(t), row.category);
    }
}

TEST(Vocabulary, ValuesOutsideTheTableAreUnknown) {
    for (const int t : {-1, 16, 100, INT_MIN, INT_MAX}) {
        SCOPED_TRACE(t);
        EXPECT_EQ(DistType2String(AsType(t)), "Unknown");
        EXPECT_EQ(DistType2EleString(AsType(t)), "Unknown");
        EXPECT_EQ(GetDistTypeDisplayWord(AsType(t)), "unrecognized");
        EXPECT_EQ(SimInputSpecs::GetDistTypeCategory(AsType(t)), kLevelUnknown);
        std::vector<std::string> names{"stale"};
        GetDistributionParameterNames(AsType(t), names);
        EXPECT_TRUE(names.empty());
    }
    // Names compare exactly: case, blanks and partial names are unknown.
    for (const char* name : {"normal", "NORMAL", "distNormal", " Normal", "Normal ", "Dist", ""}) {
        EXPECT_EQ(String2DistType(name), kDistUnknown) << name;
    }
}

TEST(Vocabulary, MappingsAppendInOrder) {
    std::vector<std::string> names{"kept"};
    MapDistType2DistName({kDistGamma, AsType(42), kDistBinomial}, names);
    EXPECT_EQ(names, (std::vector<std::string>{"kept", "Gamma", "Unknown", "Binomial"}));

    std::vector<DistType> types{kDistBeta};
    MapDistName2DistType({"DistPoisson", "nope", "UserRanges"}, types);
    EXPECT_EQ(types,
              (std::vector<DistType>{kDistBeta, kDistPoisson, kDistUnknown, kDistUserRanges}));
}

TEST(Vocabulary, ValidityByLevelMatchesTheTable) {
    const std::vector<std::vector<int>> validByLevel = {
        {}, {3, 4, 6, 7, 8, 9, 10, 11}, {2}, {0, 1, 5, 12}, {}};
    for (int level = 0; level < static_cast<int>(validByLevel.size()); ++level) {
        for (int t = -1; t <= 16; ++t) {
            const auto& valid = validByLevel[static_cast<std::size_t>(level)];
            const bool expected = std::find(valid.begin(), valid.end(), t) != valid.end();
            EXPECT_EQ(SimInputSpecs::CheckValidDist(AsType(t), static_cast<MeasureLevel>(level)),
                      expected)
                << "type " << t << " level " << level;
        }
    }
}

TEST(Vocabulary, TypeListsMustShareOneKnownCategory) {
    // clang-format off
    const std::pair<std::vector<DistType>, bool> kLists[] = {
        {{}, true}, {{kDistNormal, kDistGamma, kDistBeta}, true},
        {{kDistUserRanges, kDistNormal}, true}, {{kDistBernoulli, kDistPoisson}, true},
        {{kDistNormal, kDistPoisson}, false}, {{kDistEmpirical}, false},
        {{kDistUnknown, kDistUnknown}, false}, {{kDistNormal, kDistUnknown}, false}};
    // clang-format on
    for (const auto& [types, valid] : kLists) {
        EXPECT_EQ(SimInputSpecs::CheckValidDist(types), valid) << types.size() << " types";
    }
}

// (measurement kind, is an MCCatVar, ordinal flag) -> level.
struct HostLevelCase {
    int kind;
    bool catVar, ordinal;
    MeasureLevel expected;
};

class HostLevel : public ::testing::TestWithParam<HostLevelCase> {};

TEST_P(HostLevel, KindAndOrdinalFlagDecide) {
    const HostLevelCase& c = GetParam();
    std::unique_ptr<IMCVariable> variable;
    if (c.catVar) {
        variable = std::make_unique<MCXML_800::MCCatVar>(
            "v", MCXML_800::MCCatNumEncoder(std::vector<double>{1, 2}), c.ordinal, c.kind);
    } else {
        variable = std::make_unique<MCXML_800::MCScaleVar>("v", c.kind);
    }
    EXPECT_EQ(GetMCSPMeasureLevel(variable.get()), c.expected);
}

// clang-format off
const HostLevelCase kHostLevels[] = {
    {1, false, false, kLevelContinuous}, {4, false, false, kLevelContinuous},
    {1, true, true, kLevelContinuous}, {2, false, false, kLevelCategorical},
    {3, false, false, kLevelCategorical}, {2, true, false, kLevelCategorical},
    {3, true, false, kLevelCategorical}, {2, true, true, kLevelOrdinal},
    {3, true, true, kLevelOrdinal}, {0, false, false, kLevelUnknown},
    {5, true, true, kLevelUnknown}, {-1, false, false, kLevelUnknown}};
// clang-format on
INSTANTIATE_TEST_SUITE_P(Kinds, HostLevel, ::testing::ValuesIn(kHostLevels));

TEST(Vocabulary, VariableIndicesFollowTheNames) {
    EXPECT_EQ(GetMCSPMeasureLevel(nullptr), kLevelUnknown);
    MCXML_800::MCVarList list;
    list.Add(std::make_unique<MCXML_800::MCScaleVar>("x"));
    list.Add(std::make_unique<MCXML_800::MCScaleVar>("y"));

    std::vector<int> indices{7, 7, 7, 7};
    GetMCVarIndices(nullptr, {"x"}, indices);
    EXPECT_EQ(indices, (std::vector<int>{7, 7, 7, 7}));
    GetMCVarIndices(&list, {"y", "missing", "x"}, indices);
    EXPECT_EQ(indices, (std::vector<int>{1, list.FindVariable("missing"), 0}));
}

TEST(Vocabulary, SupportedModelTypesCompareExactly) {
    for (const char* type :
         {"LR", "GLR", "GZLR", "BLR", "MLR", "OR", "COXREG", "TREE_PMML", "TREE_BOOSTED", "DA",
          "CLUSTER_TWOSTEP", "CLUSTER_KMEANS", "NNETWORK_MLP", "NNETWORK_RBF", "NNETWORK_SOM",
          "RULESET_DL", "Transformation"}) {
        EXPECT_TRUE(IsSupportModelType(type)) << type;
    }
    for (const char* type : {"lr", "TRANSFORMATION", "LR ", "TREE", ""}) {
        EXPECT_FALSE(IsSupportModelType(type)) << type;
    }
    // Display words fall back to "unrecognized" outside their tables.
    EXPECT_EQ(GetPMMLModelTypeDisplayWord(18), "unrecognized");
    EXPECT_EQ(GetDistViewDisplayWord(static_cast<DistView>(0)), "unrecognized");
}

} // namespace
