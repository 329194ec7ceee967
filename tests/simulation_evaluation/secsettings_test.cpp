// Run settings: the defaults the simulation reads, the bit-set queries, the setter rules, value
// semantics with shared host objects, and the diagnostic listing.
#include "simulation_evaluation/secsettings.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;

namespace {

class NullListener : public MCCommon_800::ProgressListener {
public:
    void Report(const MCCommon_800::ProgressReport&) override {}
};

class NeverCancel : public MCCommon_800::MCQueryCancel {
public:
    bool IsCancelled() const override { return false; }
};

//! The lines of the listing of `settings`.
std::vector<std::string> Listing(const SECSettings& settings) {
    std::ostringstream os;
    settings.Display(os);
    std::istringstream in(os.str());
    std::vector<std::string> lines;
    for (std::string l; std::getline(in, l);) {
        lines.push_back(l);
    }
    return lines;
}

int Count(const std::vector<std::string>& lines, const std::string& line) {
    return static_cast<int>(std::count(lines.begin(), lines.end(), line));
}

int CountStartingWith(const std::vector<std::string>& lines, const std::string& prefix) {
    return static_cast<int>(std::count_if(
        lines.begin(), lines.end(), [&](const std::string& l) { return l.rfind(prefix, 0) == 0; }));
}

} // namespace

TEST(SECSettingsDefaults, ValuesAndListingOfAFreshObject) {
    const SECSettings settings;
    EXPECT_EQ(settings.GetSeed(), 629111597u);
    EXPECT_EQ(settings.GetCiLevel(), 0.95);
    EXPECT_TRUE(settings.GetMaxThreadNum() == 1 && settings.GetMemCacheKB() == 1024);
    EXPECT_TRUE(settings.GetUseTargCatProbs());
    EXPECT_FALSE(settings.ScatterplotDisplay() || settings.UseTornadoStddev() ||
                 settings.UseTornadoDeltaMean() || settings.TornadoVariance());
    EXPECT_EQ(settings.GetLowerRefLine(), -1.7976931348623157e308);
    EXPECT_EQ(settings.GetUpperRefLine(), 1.7976931348623157e308);
    EXPECT_TRUE(settings.GetWarningMessages().IsEmpty());
    EXPECT_TRUE(settings.IsValidSettings().IsOK());

    const std::vector<std::string> lines = Listing(settings);
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ(lines.front(), "Start of display SECSettings object");
    EXPECT_EQ(Count(lines, "End of display SECSettings object"), 1);
    for (const char* line :
         {"Random seed: 629111597", "Confidence interval level: 0.95",
          "The maximum number of threads: 1", "The memory cache limit in KB: 1024",
          "Distribution display = PDF(Probability Density Functions)", "CDF order = Ascending",
          "Continuous PDF view = Curve", "Categorical group = Cats",
          "Boxplot overlay group = Targets", "Ordinal correlation = Pearson",
          "Number of Sensitivity Iterations not defined", "Progress Listener is undefined",
          "Procedure Cancel is undefined", "Thread Factory is undefined"}) {
        EXPECT_EQ(Count(lines, line), 1) << line;
    }
    // Reference-line positions are listed only when their default flag is off.
    EXPECT_EQ(CountStartingWith(lines, "Lower reference line:") +
                  CountStartingWith(lines, "Upper reference line:"),
              0);
}

struct FlagCase {
    const char* fName;
    int fStored, fAsked;
    bool fExpected;
};

class SECSettingsFlagSet : public ::testing::TestWithParam<FlagCase> {};

TEST_P(SECSettingsFlagSet, AllFourQueriesTestTheBitwiseAnd) {
    const FlagCase& c = GetParam();
    SECSettings settings;
    settings.SetCDFOrder(c.fStored);
    settings.SetContinuousPDFView(c.fStored);
    settings.SetCategoricalGroup(c.fStored);
    settings.SetBoxplotOverlayGroup(c.fStored);
    EXPECT_EQ(settings.HasCDFOrder(c.fAsked), c.fExpected);
    EXPECT_EQ(settings.HasContinuousPDFView(c.fAsked), c.fExpected);
    EXPECT_EQ(settings.HasCategoricalGroup(c.fAsked), c.fExpected);
    EXPECT_EQ(settings.HasBoxplotOverlayGroup(c.fAsked), c.fExpected);
    // The int setters store the set unchanged.
    EXPECT_EQ(static_cast<int>(settings.GetCDFOrder()), c.fStored);
    EXPECT_EQ(static_cast<int>(settings.GetBoxplotOverlayGroup()), c.fStored);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Bits, SECSettingsFlagSet, ::testing::Values(
    FlagCase{"OneHasOne", 1, 1, true}, FlagCase{"OneLacksTwo", 1, 2, false},
    FlagCase{"TwoHasTwo", 2, 2, true}, FlagCase{"TwoLacksOne", 2, 1, false},
    FlagCase{"BothHaveOne", 3, 1, true}, FlagCase{"BothHaveTwo", 3, 2, true},
    FlagCase{"NoneHasNothing", 0, 1, false}, FlagCase{"AskingEitherOfTwo", 2, 3, true},
    FlagCase{"AskingZero", 3, 0, false}),
    [](const ::testing::TestParamInfo<FlagCase>& p) { return std::string(p.param.fName); });
// clang-format on

TEST(SECSettingsRules, PercentilesAreReplacedAndTornadoDeltasRaiseOnlyTheirOwnFlag) {
    SECSettings settings, other;
    settings.SetContinuousPCT(1.0, 99.0);
    settings.SetContinuousPCT(5.0); // replaced, not extended
    EXPECT_EQ(settings.GetContinuousPCT(), (std::vector<double>{5.0}));
    settings.SetContinuousPCT(10.0, 90.0);
    EXPECT_EQ(settings.GetContinuousPCT(), (std::vector<double>{10.0, 90.0}));
    settings.SetTornadoDeltaStddev(0.0); // a zero delta still marks the measure as set
    EXPECT_TRUE(settings.UseTornadoStddev() && !settings.UseTornadoDeltaMean());
    other.SetTornadoDeltaMean(2.5);
    EXPECT_TRUE(other.UseTornadoDeltaMean() && !other.UseTornadoStddev());
    settings = SECSettings(); // only a fresh object clears the flag
    EXPECT_FALSE(settings.UseTornadoStddev());
}

TEST(SECSettingsRules, ReferenceLineFlagsAndPositionsAreIndependent) {
    SECSettings settings;
    settings.SetLowerRefLine(-3.0);
    settings.SetUpperRefLine(7.0);
    EXPECT_TRUE(settings.DefaultLowerRefLine() && settings.DefaultUpperRefline());
    EXPECT_EQ(Count(Listing(settings), "Lower reference line: -3"), 0);
    settings.SetDefaultLowerRefLine(false);
    EXPECT_EQ(settings.GetLowerRefLine(), -3.0);
    const std::vector<std::string> lines = Listing(settings);
    EXPECT_EQ(Count(lines, "Lower reference line: -3"), 1);
    EXPECT_EQ(CountStartingWith(lines, "Upper reference line:"), 0);
}

// The run divides its case limit by the thread limit: a limit below one is stored as one.
TEST(SECSettingsRules, ThreadLimitIsAtLeastOne) {
    for (const auto& [set, stored] :
         {std::pair{0, 1}, {-4, 1}, {INT_MIN, 1}, {1, 1}, {8, 8}, {INT_MAX, INT_MAX}}) {
        SECSettings settings;
        settings.SetMaxThreadNum(set);
        EXPECT_EQ(settings.GetMaxThreadNum(), stored) << set;
    }
}

TEST(SECSettingsCopy, SharesHostObjectsAndCopiesEverythingElse) {
    NullListener overall, iter, rec;
    NeverCancel cancel;
    MCThread_800::MCStdThreadFactory factory;
    SECSettings original;
    original.SetProgressListener(&overall);
    original.SetIterProgressListener(&iter);
    original.SetRecProgressListener(&rec);
    original.SetCancelPointer(&cancel);
    original.SetThreadFactory(&factory);
    original.SetThreadIterFactory(&factory);
    original.SetContinuousCustom({1.0, 2.0});
    original.SetPTILES({5, 95});
    original.SetPlanFile("plan.xml");
    original.GetWarningMessages().AddWarning(MCCommon_800::MCStatus(390015, true));

    SECSettings copy(original), assigned;
    assigned = original;
    // Changing the original leaves the copies as they were.
    original.SetContinuousCustom({9.0});
    original.SetPTILES({});
    original.SetPlanFile("other.xml");
    original.SetProgressListener(nullptr);
    original.GetWarningMessages().ClearWarnings();
    for (const SECSettings* s : {&copy, &assigned}) {
        EXPECT_EQ(s->GetProgressListener(), &overall);
        EXPECT_EQ(s->GetIterProgressListener(), &iter);
        EXPECT_EQ(s->GetRecProgressListener(), &rec);
        EXPECT_EQ(s->GetCancelPointer(), &cancel);
        EXPECT_TRUE(s->GetThreadFactory() == &factory && s->GetThreadIterFactory() == &factory);
        EXPECT_TRUE(s->GetWarningMessages().HasCode(390015));
        EXPECT_EQ(s->GetWarningMessages().GetWarnings().size(), 1u);
        EXPECT_EQ(s->GetContinuousCustom(), (std::vector<double>{1.0, 2.0}));
        EXPECT_EQ(s->GetPTILES(), (std::vector<int>{5, 95}));
        EXPECT_EQ(s->GetPlanFile(), "plan.xml");
    }
}

TEST(SECSettingsDisplay, UnrecognizedValuesFlagLinesAndDefinedPointers) {
    NullListener listener;
    MCThread_800::MCStdThreadFactory factory;
    SECSettings settings;
    settings.SetDistributionDisplay(static_cast<DistDisplay>(4));
    settings.SetCDFOrder(3);
    settings.SetContinuousPDFView(4);
    settings.SetCategoricalGroup(0);
    settings.SetBoxplotOverlayGroup(6);
    settings.SetOrdCorrelation(static_cast<OrdinalCorrelations>(-1));
    settings.SetProgressListener(&listener);
    settings.SetThreadFactory(&factory);
    settings.SetNSensIters(3);
    const std::vector<std::string> lines = Listing(settings);
    // One line per bit that is set; bits outside the table, or no bit at all, are unrecognized.
    for (const auto& [line, count] :
         std::vector<std::pair<const char*, int>>{{"Distribution display = unrecognized", 1},
                                                  {"Ordinal correlation = unrecognized", 1},
                                                  {"CDF order = Ascending", 1},
                                                  {"CDF order = Descending", 1},
                                                  {"Continuous PDF view = unrecognized", 1},
                                                  {"Categorical group = unrecognized", 1},
                                                  {"Boxplot overlay group = Iters", 1},
                                                  {"Boxplot overlay group = unrecognized", 1},
                                                  {"Progress Listener is defined", 1},
                                                  {"Thread Factory is defined", 1},
                                                  {"Procedure Cancel is undefined", 1},
                                                  {"Number of Sensitivity Iterations: 3", 1}}) {
        EXPECT_EQ(Count(lines, line), count) << line;
    }
    EXPECT_EQ(CountStartingWith(lines, "CDF order = "), 2);
    EXPECT_EQ(CountStartingWith(lines, "Continuous PDF view = "), 1);
    EXPECT_EQ(CountStartingWith(lines, "Boxplot overlay group = "), 2);
    EXPECT_EQ(std::count_if(lines.begin(), lines.end(),
                            [](const std::string& l) { return l.find("not defined") != l.npos; }),
              0);
}
