// The fitting settings: rejected setter calls leave everything unchanged, the weight variable,
// the listing of a fresh object, and the results object built from the settings.
#include "component/mcspassert.h"
#include "distribution_fitting/dfcoutputstats.h"
#include "distribution_fitting/dfcsettings.h"
#include "mccommon/display.h"
#include "mccommon/mcmv.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <sstream>
#include <string>

using namespace MCMCSP_800;
using namespace MCSPConst;

namespace {

//! Two factors (variables 1 and 2) and one covariate (variable 4).
DFCSettings Populated() {
    DFCSettings settings;
    EXPECT_EQ(settings.AddFactor(1, 3, {kDistCategorical}, kLevelCategorical, false), 1);
    EXPECT_EQ(settings.AddFactor(2, 2, {kDistCategorical}, kLevelOrdinal, true), 2);
    EXPECT_EQ(settings.AddCovariate(4, {kDistNormal, kDistGamma}, kLevelContinuous, false), 1);
    return settings;
}

//! Everything the setters change, as one comparable text.
std::string State(const DFCSettings& settings) {
    std::ostringstream os;
    settings.Display(os);
    os << "weight " << settings.GetFrequencyWeightVar();
    for (int v = -1; v < 8; ++v) {
        os << " role" << v << "=" << settings.GetVarRole(v);
    }
    return os.str();
}

struct RejectedCall {
    const char* name;
    std::function<bool(DFCSettings&)> call; //!< true when the call reported a rejection
    const char* diagnostic;
};

class RejectedSetters : public ::testing::TestWithParam<RejectedCall> {};

TEST_P(RejectedSetters, ReportAndLeaveTheSettingsUnchanged) {
    DFCSettings settings = Populated();
    const std::string before = State(settings);
    ClearLastAssertion();
    EXPECT_TRUE(GetParam().call(settings));
    EXPECT_EQ(GetLastAssertion(), GetParam().diagnostic);
    EXPECT_EQ(State(settings), before);
}

// The call of each row returns true when it reported a rejection.
#define MC_CALL(expr) [](DFCSettings& s) { return expr; }
// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, RejectedSetters, ::testing::Values(
    RejectedCall{"FactorNegativeIndex",
                 MC_CALL(s.AddFactor(-1, 2, {}, kLevelCategorical, false) == -1),
                 "DFCSettings::AddFactor: varIndex >= 0"},
    RejectedCall{"FactorNoLevels", MC_CALL(s.AddFactor(6, 0, {}, kLevelCategorical, false) == -1),
                 "DFCSettings::AddFactor: nLevels >= 1"},
    RejectedCall{"FactorTwice", MC_CALL(s.AddFactor(1, 2, {}, kLevelCategorical, false) == -1),
                 "DFCSettings::AddFactor: varIndex is new"},
    RejectedCall{"CovariateThatIsAFactor",
                 MC_CALL(s.AddCovariate(2, {kDistNormal}, kLevelContinuous, false) == -1),
                 "DFCSettings::AddCovariate: varIndex is new"},
    RejectedCall{"CovariateNegativeIndex",
                 MC_CALL(s.AddCovariate(-3, {}, kLevelContinuous, false) == -1),
                 "DFCSettings::AddCovariate: varIndex >= 0"},
    RejectedCall{"SizesOfWrongLength", MC_CALL(!s.SetFactorNCategs({4})),
                 "DFCSettings::SetFactorNCategs: fFactors.size() == factorNCategs.size()"},
    RejectedCall{"SizeZero", MC_CALL(!s.SetFactorNCategs({4, 0})),
                 "DFCSettings::SetFactorNCategs: factorNCategs[ i ] >= 1"},
    RejectedCall{"InfosOfWrongLength", MC_CALL(!s.SetFactorVarInfors({DFCSettings::VarInfoElem()})),
                 "DFCSettings::SetFactorNCategs: fFactors.size() == factorNCategs.size()"},
    RejectedCall{"WeightNegative", MC_CALL(!s.SetFrequencyWeightVar(-1)),
                 "varIndex >= 0 in DFCSettings::SetFrequencyWeightVar"},
    // A rejected weight must not become the weight: the covariate would weigh every record.
    RejectedCall{"WeightThatIsACovariate", MC_CALL(!s.SetFrequencyWeightVar(4)),
                 "Variable must be new in DFCSettings::SetFrequencyWeightVar"}),
    [](const ::testing::TestParamInfo<RejectedCall>& param) { return param.param.name; });
// clang-format on

TEST(DFCSettingsFields, SetFactorsStopsAtTheFirstRejection) {
    DFCSettings settings;
    EXPECT_TRUE(settings.SetFactors({}));
    EXPECT_EQ(settings.GetNVars(), 0);
    EXPECT_FALSE(settings.SetFactors({3, 5, -1, 7}));
    EXPECT_EQ(settings.GetFactors(), (std::vector<int>{3, 5}));
    EXPECT_EQ(settings.GetFactorSizes(), (std::vector<int>{1, 1}));
    // Factors added this way allow nothing until their information is replaced.
    EXPECT_FALSE(settings.GetFactorInfoElems()[0].IsDistAllowed(kDistCategorical));
    EXPECT_EQ(settings.GetVarRole(7), DFCSettings::kRoleFree);
}

TEST(DFCSettingsFields, WeightKeepsItsRoleWhenReplaced) {
    DFCSettings settings;
    EXPECT_TRUE(settings.SetFrequencyWeightVar(2));
    EXPECT_TRUE(settings.SetFrequencyWeightVar(3));
    EXPECT_EQ(settings.GetFrequencyWeightVar(), 3);
    EXPECT_EQ(settings.AddCovariate(2, {}, kLevelContinuous, false), -1);
    // A large index costs no memory for the role table.
    EXPECT_EQ(settings.AddCovariate(2000000000, {kDistNormal}, kLevelContinuous, false), 1);
}

TEST(DFCSettingsDisplay, FreshObjectListsItsDefaults) {
    DFCSettings negative;
    negative.SetNCases(-5);
    EXPECT_EQ(negative.GetNCases(), 0);
    std::ostream* before = MCDisplay_800::GetOutStream();
    std::ostringstream os;
    DFCSettings().Display(os);
    EXPECT_EQ(MCDisplay_800::GetOutStream(), before);
    const std::string text = os.str();
    for (const char* line :
         {"Start of display DFCSettings object\n",
          "The max iterations use for distribution fitting: 100\n",
          "The number of bins use for distribution fitting: 100\n",
          "The maximum number of threads: 1\n", "The memory cache limit in KB: 1048576\n",
          "The Type of Fit Test for scale variables = AnderDarling\n",
          "Progress Listener is undefined\n", "Thread Iterator Factory is undefined\n",
          "End of display DFCSettings object\n"}) {
        EXPECT_NE(text.find(line), std::string::npos) << line;
    }
}

// ------------------------------------------------------------------------------------------
// The results object of a fresh run

TEST(DFCOutputStatsFresh, OneRecordPerFieldWithTwelveUntestedElements) {
    MCXML_800::MCVarList vars;
    for (const char* name : {"w", "f1", "f2", "x3", "x4"}) {
        vars.Add(std::make_unique<MCXML_800::MCScaleVar>(name));
    }
    const DFCSettings settings = Populated();
    DFCOutputStats results(settings, vars);
    ASSERT_EQ(results.GetFactorDistInfo().size(), 2U);
    ASSERT_EQ(results.GetCovarDistInfo().size(), 1U);
    EXPECT_EQ(results.GetFactorDistInfo()[1].fFittedVarName, "f2");
    EXPECT_EQ(results.GetFactorDistInfo()[1].fMeasureLevel, kLevelOrdinal);
    const auto& cov = results.GetCovarDistInfo()[0];
    EXPECT_EQ(cov.fFittedVarName, "x4");
    EXPECT_TRUE(cov.fDistBestType == kDistUnknown && cov.fDistBestADType == kDistUnknown &&
                cov.fDistBestKSType == kDistUnknown);
    EXPECT_TRUE(MCCommon_800::MCMV::IsMissing(cov.fBestFitStat));
    ASSERT_EQ(cov.fDistElements.size(), 12U);
    for (int k = 0; k < kNFitDistTypes; ++k) {
        const auto& element = cov.fDistElements[static_cast<std::size_t>(k)];
        EXPECT_EQ(element.fDistType, k);
        EXPECT_EQ(element.fDistName, DistType2String(static_cast<DistType>(k)));
        EXPECT_EQ(element.fbDistAllowed, k == kDistNormal || k == kDistGamma);
        EXPECT_TRUE(MCCommon_800::MCMV::IsMissing(element.fKSPValue));
    }
    EXPECT_EQ(cov.fDistElements[kDistNegbinomial].fDistParamNames,
              (std::vector<std::string>{"thresh", "prob", "type"}));
    EXPECT_TRUE(results.GetCrstabsMatrix().empty());
    EXPECT_TRUE(results.GetStatus().IsOK());

    // A copy is independent of the original but refers to the same settings.
    DFCOutputStats copy(results);
    copy.GetCovarDistInfo()[0].fDistBestType = kDistNormal;
    EXPECT_EQ(results.GetCovarDistInfo()[0].fDistBestType, kDistUnknown);
    EXPECT_EQ(&copy.GetSettings(), &settings);
}

} // namespace
