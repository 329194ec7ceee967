// The plan in memory: correlation cells and their listing, the correlation matrix from a
// symmetric matrix, stop-criteria lookup, the duplicate and iteration rules of inputs, model
// targets by level, and the checks against the host's variables.
#include "mccommon/mcmv.h"
#include "simulation_common/spcsettings.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <memory>
#include <sstream>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCXML_800::IMCVariable;

namespace {

using Rows = std::vector<std::vector<double>>;
using Names = std::vector<std::string>;

SimInputSpecs Input(const std::string& name, MeasureLevel level, int nDists = 1,
                    bool manual = true) {
    SimInputSpecs input(manual);
    input.SetVarName(name);
    input.SetVarLevel(level);
    for (int i = 0; i < nDists; ++i) {
        static_cast<void>(
            input.AddDistribution(level == kLevelCategorical ? kDistCategorical : kDistNormal));
    }
    return input;
}

std::string CellText(const std::vector<SPCSettings::CorrMatrixCell>& cells) {
    std::ostringstream os;
    for (const SPCSettings::CorrMatrixCell& cell : cells) {
        os << "(" << cell.fRowVar << "," << cell.fColVar << "," << cell.fValue << ")";
    }
    return os.str();
}

} // namespace

TEST(SPCSettingsCorrelation, FirstCellRegistersColumnThenRow) {
    SPCSettings plan;
    plan.SetCorrMatrixCell("x", "y", 0.3);
    EXPECT_EQ(plan.GetCorrVarList(), (Names{"y", "x"}));
    EXPECT_EQ(plan.GetCorrMatrix(), (Rows{{1.0}, {0.3, 1.0}}));

    std::vector<SPCSettings::CorrMatrixCell> cells{{"stale", "stale", 9.0}};
    plan.GetCorrMatrixCellCollection(cells);
    EXPECT_EQ(CellText(cells), "(y,y,1)(x,y,0.3)(x,x,1)");
}

TEST(SPCSettingsCorrelation, VariableWithItselfKeepsTheDiagonal) {
    SPCSettings plan;
    plan.SetCorrMatrixCell("x", "x", 0.5);
    EXPECT_EQ(plan.GetCorrVarList(), (Names{"x"}));
    EXPECT_EQ(plan.GetCorrMatrix(), (Rows{{1.0}}));
}

TEST(SPCSettingsCorrelation, CellsLandInTheLowerTriangleWhateverTheirOrder) {
    // Both orders of a pair name one cell; the later call wins.
    SPCSettings plan;
    plan.SetCorrMatrixCell("a", "b", 0.1);  // vars b, a
    plan.SetCorrMatrixCell("c", "a", -0.2); // c new: row 2, column of a = 1
    plan.SetCorrMatrixCell("b", "c", 0.7);  // row 2 (c), column 0 (b)
    plan.SetCorrMatrixCell("b", "a", 0.15); // the first pair again
    EXPECT_EQ(plan.GetCorrVarList(), (Names{"b", "a", "c"}));
    EXPECT_EQ(plan.GetCorrMatrix(), (Rows{{1.0}, {0.15, 1.0}, {0.7, -0.2, 1.0}}));
}

TEST(SPCSettingsCorrelation, MissingValueIsStoredAndListed) {
    SPCSettings plan;
    plan.SetCorrMatrixCell("u", "v", MCMV::Missing());
    std::vector<SPCSettings::CorrMatrixCell> cells;
    plan.GetCorrMatrixCellCollection(cells);
    ASSERT_EQ(cells.size(), 3u);
    EXPECT_TRUE(MCMV::IsMissing(cells[1].fValue));
}

TEST(SPCSettingsCorrelation, ShortAppendedRowIsWidenedNotOverrun) {
    SPCSettings plan;
    plan.SetCorrVarList({"a", "b", "c"});
    plan.AddCorrMatrixRow({1.0});
    plan.AddCorrMatrixRow({0.0, 1.0});
    plan.AddCorrMatrixRow({1.0}); // shorter than row 2 of the triangle
    plan.SetCorrMatrixCell("c", "b", 0.4);
    EXPECT_EQ(plan.GetCorrMatrix()[2], (std::vector<double>{1.0, 0.4}));
}

TEST(SPCSettingsCorrelation, RowsWithoutAVariableAreNotListed) {
    SPCSettings plan;
    plan.SetCorrVarList({"a"});
    plan.AddCorrMatrixRow({1.0});
    plan.AddCorrMatrixRow({0.5, 1.0});
    std::vector<SPCSettings::CorrMatrixCell> cells;
    plan.GetCorrMatrixCellCollection(cells);
    EXPECT_EQ(CellText(cells), "(a,a,1)");
}

TEST(SPCSettingsCorrelation, InitKeepsContinuousAndOrdinalInputsWithIdentity) {
    SPCSettings plan;
    plan.AddSimulationInput(Input("c", kLevelContinuous));
    plan.AddSimulationInput(Input("k", kLevelCategorical));
    plan.AddSimulationInput(Input("o", kLevelOrdinal, 0));
    plan.SetCorrMatrixCell("k", "c", 0.9);
    plan.InitCorrMatrix();
    EXPECT_EQ(plan.GetCorrVarList(), (Names{"c", "o"}));
    EXPECT_EQ(plan.GetCorrMatrix(), (Rows{{1.0, 0.0}, {0.0, 1.0}}));
}

TEST(SPCSettingsCorrelation, SymmetricMatrixLargerThanTheVariablesIsRefused) {
    SPCSettings plan;
    plan.SetCorrVarList({"a", "b"});
    plan.AddCorrMatrixRow({1.0});
    MCMath_800::MCSymMatrix m(3);
    EXPECT_FALSE(plan.SetDFCCorrMatrix(m));
    EXPECT_TRUE(plan.GetCorrMatrix().empty());
}

TEST(SPCSettingsCorrelation, SymmetricMatrixFillsFullRowsAndIdentityBeyond) {
    SPCSettings plan;
    plan.SetCorrVarList({"a", "b", "c"});
    MCMath_800::MCSymMatrix m(2);
    m.SetElem(0, 0, 1.0);
    m.SetElem(1, 1, 1.0);
    m.SetElem(1, 0, -0.25);
    ASSERT_TRUE(plan.SetDFCCorrMatrix(m));
    EXPECT_EQ(plan.GetCorrMatrix(), (Rows{{1.0, -0.25, 0.0}, {-0.25, 1.0, 0.0}, {0.0, 0.0, 1.0}}));
    // Full rows list the lower triangle only.
    std::vector<SPCSettings::CorrMatrixCell> cells;
    plan.GetCorrMatrixCellCollection(cells);
    EXPECT_EQ(CellText(cells), "(a,a,1)(b,a,-0.25)(b,b,1)(c,a,0)(c,b,0)(c,c,1)");
}

TEST(SPCSettingsStopCriteria, SingleMeanCriterionAnswersForAnyTarget) {
    SPCSettings plan;
    double threshold = 0.0;
    UnitType unit = kUnitValue;
    double level = 0.0;
    EXPECT_FALSE(plan.GetStopCriteriaMean("t", threshold, unit, level));

    plan.SetStopCriteriaMean("profit", 2.5, kUnitPercent, 0.9);
    ASSERT_TRUE(plan.GetStopCriteriaMean("other", threshold, unit, level));
    EXPECT_NEAR_REL(threshold, 2.5, 0.0);
    EXPECT_EQ(unit, kUnitPercent);
    EXPECT_NEAR_REL(level, 0.9, 0.0);

    // With two criteria the target name decides.
    plan.SetStopCriteriaMean("cost", 7.0, kUnitValue, 0.99);
    EXPECT_FALSE(plan.GetStopCriteriaMean("other", threshold, unit, level));
    ASSERT_TRUE(plan.GetStopCriteriaMean("cost", threshold, unit, level));
    EXPECT_NEAR_REL(threshold, 7.0, 0.0);
    EXPECT_EQ(plan.GetStopCriteriaPointValue().front().fStatistic, kStatisticMean);
}

TEST(SPCSettingsStopCriteria, SingleTailCriterionAnswersForAnyTarget) {
    SPCSettings plan;
    double threshold = 0.0;
    SideType side = kSideRight;
    TailType type = kTailValue;
    int frequency = 0;
    plan.SetStopCriteriaTails("a", 10.0, kSideLeft, kTailPercentile, 50);
    ASSERT_TRUE(plan.GetStopCriteriaTails("zzz", threshold, side, type, frequency));
    EXPECT_EQ(side, kSideLeft);
    EXPECT_EQ(type, kTailPercentile);
    EXPECT_EQ(frequency, 50);

    plan.SetStopCriteriaTails("b", 20.0, kSideRight, kTailValue, 5);
    EXPECT_FALSE(plan.GetStopCriteriaTails("zzz", threshold, side, type, frequency));
    ASSERT_TRUE(plan.GetStopCriteriaTails("b", threshold, side, type, frequency));
    EXPECT_NEAR_REL(threshold, 20.0, 0.0);
    EXPECT_EQ(frequency, 5);
}

TEST(SPCSettingsInputs, NamesAreUniqueAcrossSimulatedAndFixedInputs) {
    SPCSettings plan;
    plan.AddFixedInput("f", std::vector<double>{1.0}, "");
    plan.AddSimulationInput(Input("f", kLevelContinuous));
    plan.AddSimulationInput(Input("s", kLevelContinuous));
    plan.AddSimulationInput(Input("s", kLevelOrdinal));
    plan.AddFixedInput("s", std::vector<std::string>{"x"}, "");
    plan.AddFixedInput("f", 0.0, 10.0, 3, "");
    plan.AddFixedInput("one", 0.0, 1.0, 1, ""); // one value is no range
    ASSERT_EQ(plan.GetSimulationInput().size(), 1u);
    EXPECT_EQ(plan.GetSimInput("s")->GetMeasurementLevel(), kLevelContinuous);
    ASSERT_EQ(plan.GetFixedInput().size(), 1u);
    EXPECT_EQ(plan.GetFixedInput("f")->GetInputValueSize(), 1u);
    EXPECT_TRUE(plan.CheckExist("f"));
    EXPECT_FALSE(plan.CheckExist("F"));
}

TEST(SPCSettingsInputs, LastInputWithSeveralValuesDecidesTheIteration) {
    SPCSettings plan;
    EXPECT_EQ(plan.GetIterationIndex(), -1);
    EXPECT_EQ(plan.GetIterationType(), SPCSettings::kIterNone);

    plan.AddSimulationInput(Input("a", kLevelContinuous));
    plan.AddSimulationInput(Input("b", kLevelContinuous, 2, true));
    EXPECT_EQ(plan.GetIterationIndex(), 1);
    EXPECT_EQ(plan.GetIterationType(), SPCSettings::kIterManualInput);

    plan.AddFixedInput("f1", std::vector<double>{1.0}, "");
    plan.AddFixedInput("f2", 0.0, 1.0, 5, "");
    EXPECT_EQ(plan.GetIterationIndex(), 1);
    EXPECT_EQ(plan.GetIterationType(), SPCSettings::kIterFixedInput);

    plan.AddSimulationInput(Input("c", kLevelContinuous, 3, false));
    EXPECT_EQ(plan.GetIterationIndex(), 2);
    EXPECT_EQ(plan.GetIterationType(), SPCSettings::kIterAutofitInput);

    // A single value or distribution changes nothing.
    plan.AddFixedInput("f3", std::vector<std::string>{"x"}, "");
    EXPECT_EQ(plan.GetIterationType(), SPCSettings::kIterAutofitInput);
}

TEST(SPCSettingsModel, TargetsSplitByLevelOfTheFirstModelFile) {
    SPCSettings plan;
    EXPECT_TRUE(plan.GetContinuousModelTargets().empty());
    const MeasureLevel levels[] = {kLevelContinuous, kLevelCategorical, kLevelOrdinal,
                                   kLevelUnknown};
    const char* names[] = {"c", "k", "o", "u"};
    for (int i = 0; i < 4; ++i) {
        SPCSettings::ModelFileTarget target;
        target.fName = names[i];
        target.fMeasurementLevel = levels[i];
        plan.AddModelTarget(target);
    }
    SPCSettings::ModelFileElem second;
    second.fvTargets.resize(3);
    plan.AddModelFileInfo(second);

    const auto continuous = plan.GetContinuousModelTargets();
    const auto categorical = plan.GetCategoricalModelTargets();
    ASSERT_EQ(continuous.size(), 2u);
    ASSERT_EQ(categorical.size(), 2u);
    EXPECT_EQ(continuous[0]->fName, "c");
    EXPECT_EQ(continuous[1]->fName, "u");
    EXPECT_EQ(categorical[0]->fName, "k");
    EXPECT_EQ(categorical[1]->fName, "o");
}

namespace {

MCXML_800::MCVarList HostVariables() {
    MCXML_800::MCVarList vars;
    vars.Add(std::make_unique<MCXML_800::MCScaleVar>("x"));
    vars.Add(std::make_unique<MCXML_800::MCScaleVar>("y"));
    vars.Add(std::make_unique<MCXML_800::MCCatVar>(
        "k", MCXML_800::MCCatNumEncoder(std::vector<std::string>{"a", "b"})));
    vars.Add(std::make_unique<MCXML_800::MCCatVar>(
        "grade", MCXML_800::MCCatNumEncoder(std::vector<double>{1.0, 2.0}), true));
    vars.Add(std::make_unique<MCXML_800::MCScaleVar>("f"));
    return vars;
}

} // namespace

TEST(SPCSettingsVarInfo, ValidationNeedsInputsInTheDataAndPlanInputsAsFactors) {
    const MCXML_800::MCVarList vars = HostVariables();
    SPCSettings plan;
    plan.AddSimulationInput(Input("x", kLevelContinuous));
    plan.AddSimulationInput(Input("k", kLevelCategorical));
    plan.AddFixedInput("f", std::vector<double>{1.0}, "");
    plan.SetCorrMatrixCell("x", "x", 1.0);
    plan.SetCrstabsFactors({"k"});
    EXPECT_TRUE(plan.ValidateVarInfo(vars));

    SPCSettings factorIsFixed = plan;
    factorIsFixed.SetCrstabsFactors({"k", "f"});
    EXPECT_FALSE(factorIsFixed.ValidateVarInfo(vars));

    SPCSettings corrIsUnknown = plan;
    corrIsUnknown.SetCorrMatrixCell("y", "x", 0.5); // y is data, not a plan input
    EXPECT_FALSE(corrIsUnknown.ValidateVarInfo(vars));

    SPCSettings inputNotInData = plan;
    inputNotInData.AddFixedInput("absent", std::vector<double>{1.0}, "");
    EXPECT_FALSE(inputNotInData.ValidateVarInfo(vars));
}

TEST(SPCSettingsVarInfo, CompletionFillsUnknownLevelsOfTheFirstModelOnly) {
    SPCSettings plan;
    SPCSettings::ModelFileTarget target;
    for (const char* name : {"x", "k", "grade", "nowhere"}) {
        target.fName = name;
        plan.AddModelTarget(target);
    }
    target.fName = "y";
    target.fMeasurementLevel = kLevelCategorical; // already known: kept
    plan.AddModelTarget(target);
    SPCSettings::ModelFileElem second;
    second.fvTargets.push_back(SPCSettings::ModelFileTarget{});
    second.fvTargets.back().fName = "x";
    plan.AddModelFileInfo(second);

    plan.CompleteVarInfo(HostVariables());
    const auto& targets = plan.GetModelFileInfo()[0].fvTargets;
    EXPECT_EQ(targets[0].fMeasurementLevel, kLevelContinuous);
    EXPECT_EQ(targets[1].fMeasurementLevel, kLevelCategorical);
    EXPECT_EQ(targets[2].fMeasurementLevel, kLevelOrdinal);
    EXPECT_EQ(targets[3].fMeasurementLevel, kLevelUnknown);
    EXPECT_EQ(targets[4].fMeasurementLevel, kLevelCategorical);
    EXPECT_EQ(plan.GetModelFileInfo()[1].fvTargets[0].fMeasurementLevel, kLevelUnknown);
}
