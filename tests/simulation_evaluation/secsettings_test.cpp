// Run settings: the defaults the simulation reads, the bit-set queries, the setter rules
// (percentile lists replaced, tornado flags raised by their deltas, the thread limit kept at
// one or more), value semantics with shared host objects, and the diagnostic listing.
#include "simulation_evaluation/secsettings.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <climits>
#include <sstream>
#include <string>
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

std::string Listing(const SECSettings& settings) {
    std::ostringstream os;
    settings.Display(os);
    return os.str();
}

//! True when `text` holds `line` as a whole line.
bool HasLine(const std::string& text, const std::string& line) {
    std::istringstream in(text);
    for (std::string l; std::getline(in, l);) {
        if (l == line) {
            return true;
        }
    }
    return false;
}

int CountLinesStartingWith(const std::string& text, const std::string& prefix) {
    std::istringstream in(text);
    int n = 0;
    for (std::string l; std::getline(in, l);) {
        n += l.rfind(prefix, 0) == 0 ? 1 : 0;
    }
    return n;
}

} // namespace

TEST(SECSettingsDefaults, ValuesTheSimulationReads) {
    const SECSettings settings;
    EXPECT_EQ(settings.GetSeed(), 629111597u);
    EXPECT_NEAR_REL(settings.GetCiLevel(), 0.95, 0.0);
    EXPECT_EQ(settings.GetMaxThreadNum(), 1);
    EXPECT_EQ(settings.GetMemCacheKB(), 1024);
    EXPECT_TRUE(settings.GetUseTargCatProbs());
    EXPECT_FALSE(settings.ScatterplotDisplay());
    EXPECT_FALSE(settings.UseTornadoStddev());
    EXPECT_FALSE(settings.UseTornadoDeltaMean());
    EXPECT_FALSE(settings.TornadoVariance());
    EXPECT_EQ(settings.GetLowerRefLine(), -1.7976931348623157e308);
    EXPECT_EQ(settings.GetUpperRefLine(), 1.7976931348623157e308);
    EXPECT_EQ(settings.GetProgressListener(), nullptr);
    EXPECT_EQ(settings.GetIterProgressListener(), nullptr);
    EXPECT_EQ(settings.GetRecProgressListener(), nullptr);
    EXPECT_EQ(settings.GetCancelPointer(), nullptr);
    EXPECT_EQ(settings.GetThreadFactory(), nullptr);
    EXPECT_TRUE(settings.GetWarningMessages().IsEmpty());
    EXPECT_TRUE(settings.IsValidSettings().IsOK());
}

TEST(SECSettingsDefaults, ListingShowsTheDefaultWords) {
    const std::string text = Listing(SECSettings());
    EXPECT_EQ(text.rfind("Start of display SECSettings object\n", 0), 0u);
    EXPECT_NE(text.find("End of display SECSettings object\n"), std::string::npos);
    for (const char* line : {
             "Random seed: 629111597",
             "Confidence interval level: 0.95",
             "The maximum number of threads: 1",
             "The memory cache limit in KB: 1024",
             "Distribution display = PDF(Probability Density Functions)",
             "CDF order = Ascending",
             "Continuous PDF view = Curve",
             "Categorical group = Cats",
             "Boxplot overlay group = Targets",
             "Ordinal correlation = Pearson",
             "Number of Sensitivity Iterations not defined",
             "Progress Listener is undefined",
             "Procedure Cancel is undefined",
             "Thread Factory is undefined",
         }) {
        EXPECT_TRUE(HasLine(text, line)) << line;
    }
    // Reference-line positions are listed only when their default flag is off.
    EXPECT_EQ(text.find("Lower reference line:"), std::string::npos);
    EXPECT_EQ(text.find("Upper reference line:"), std::string::npos);
}

// ---- Bit-set queries ---------------------------------------------------------------------

struct FlagCase {
    const char* name;
    int stored;
    int asked;
    bool expected;
};

class SECSettingsFlagSet : public ::testing::TestWithParam<FlagCase> {};

TEST_P(SECSettingsFlagSet, AllFourQueriesTestTheBitwiseAnd) {
    const FlagCase& c = GetParam();
    SECSettings settings;
    settings.SetCDFOrder(c.stored);
    settings.SetContinuousPDFView(c.stored);
    settings.SetCategoricalGroup(c.stored);
    settings.SetBoxplotOverlayGroup(c.stored);
    EXPECT_EQ(settings.HasCDFOrder(c.asked), c.expected);
    EXPECT_EQ(settings.HasContinuousPDFView(c.asked), c.expected);
    EXPECT_EQ(settings.HasCategoricalGroup(c.asked), c.expected);
    EXPECT_EQ(settings.HasBoxplotOverlayGroup(c.asked), c.expected);
    // The int setters store the set unchanged.
    EXPECT_EQ(static_cast<int>(settings.GetCDFOrder()), c.stored);
    EXPECT_EQ(static_cast<int>(settings.GetBoxplotOverlayGroup()), c.stored);
}

INSTANTIATE_TEST_SUITE_P(
    Bits, SECSettingsFlagSet,
    ::testing::Values(FlagCase{"OneHasOne", 1, 1, true}, FlagCase{"OneLacksTwo", 1, 2, false},
                      FlagCase{"TwoHasTwo", 2, 2, true}, FlagCase{"TwoLacksOne", 2, 1, false},
                      FlagCase{"BothHaveOne", 3, 1, true}, FlagCase{"BothHaveTwo", 3, 2, true},
                      FlagCase{"NoneHasNothing", 0, 1, false},
                      FlagCase{"AskingEitherOfTwo", 2, 3, true},
                      FlagCase{"AskingZero", 3, 0, false}),
    [](const ::testing::TestParamInfo<FlagCase>& p) { return std::string(p.param.name); });

// ---- Setter rules ------------------------------------------------------------------------

TEST(SECSettingsRules, PercentileListIsReplacedNotExtended) {
    SECSettings settings;
    settings.SetContinuousPCT(1.0, 99.0);
    EXPECT_EQ(settings.GetContinuousPCT(), (std::vector<double>{1.0, 99.0}));
    settings.SetContinuousPCT(5.0);
    EXPECT_EQ(settings.GetContinuousPCT(), (std::vector<double>{5.0}));
    settings.SetContinuousPCT(10.0, 90.0);
    EXPECT_EQ(settings.GetContinuousPCT(), (std::vector<double>{10.0, 90.0}));
}

TEST(SECSettingsRules, TornadoDeltasRaiseOnlyTheirOwnFlag) {
    SECSettings settings;
    settings.SetTornadoDeltaStddev(0.0); // a zero delta still marks the measure as set
    EXPECT_TRUE(settings.UseTornadoStddev());
    EXPECT_FALSE(settings.UseTornadoDeltaMean());

    SECSettings other;
    other.SetTornadoDeltaMean(2.5);
    EXPECT_TRUE(other.UseTornadoDeltaMean());
    EXPECT_FALSE(other.UseTornadoStddev());

    // Only a fresh object clears the flag.
    settings = SECSettings();
    EXPECT_FALSE(settings.UseTornadoStddev());
}

TEST(SECSettingsRules, ReferenceLineFlagsAndPositionsAreIndependent) {
    SECSettings settings;
    settings.SetLowerRefLine(-3.0);
    settings.SetUpperRefLine(7.0);
    EXPECT_TRUE(settings.DefaultLowerRefLine());
    EXPECT_TRUE(settings.DefaultUpperRefline());
    EXPECT_FALSE(HasLine(Listing(settings), "Lower reference line: -3"));

    settings.SetDefaultLowerRefLine(false);
    EXPECT_EQ(settings.GetLowerRefLine(), -3.0);
    const std::string text = Listing(settings);
    EXPECT_TRUE(HasLine(text, "Lower reference line: -3"));
    EXPECT_EQ(text.find("Upper reference line:"), std::string::npos);
}

struct ThreadCase {
    const char* name;
    int set;
    int stored;
};

class SECSettingsThreadLimit : public ::testing::TestWithParam<ThreadCase> {};

// The run divides its case limit by the thread limit: a limit below one is stored as one.
TEST_P(SECSettingsThreadLimit, IsAtLeastOne) {
    SECSettings settings;
    settings.SetMaxThreadNum(GetParam().set);
    EXPECT_EQ(settings.GetMaxThreadNum(), GetParam().stored);
}

INSTANTIATE_TEST_SUITE_P(Limits, SECSettingsThreadLimit,
                         ::testing::Values(ThreadCase{"Zero", 0, 1}, ThreadCase{"Negative", -4, 1},
                                           ThreadCase{"Lowest", INT_MIN, 1},
                                           ThreadCase{"One", 1, 1}, ThreadCase{"Eight", 8, 8},
                                           ThreadCase{"Largest", INT_MAX, INT_MAX}),
                         [](const ::testing::TestParamInfo<ThreadCase>& p) {
                             return std::string(p.param.name);
                         });

// ---- Value semantics -----------------------------------------------------------------------

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

    SECSettings copy(original);
    SECSettings assigned;
    assigned = original;
    for (const SECSettings* s : {&copy, &assigned}) {
        EXPECT_EQ(s->GetProgressListener(), &overall);
        EXPECT_EQ(s->GetIterProgressListener(), &iter);
        EXPECT_EQ(s->GetRecProgressListener(), &rec);
        EXPECT_EQ(s->GetCancelPointer(), &cancel);
        EXPECT_EQ(s->GetThreadFactory(), &factory);
        EXPECT_EQ(s->GetThreadIterFactory(), &factory);
        EXPECT_TRUE(s->GetWarningMessages().HasCode(390015));
    }

    // Changing the original leaves the copies as they were.
    original.SetContinuousCustom({9.0});
    original.SetPTILES({});
    original.SetPlanFile("other.xml");
    original.SetProgressListener(nullptr);
    original.GetWarningMessages().ClearWarnings();
    for (const SECSettings* s : {&copy, &assigned}) {
        EXPECT_EQ(s->GetContinuousCustom(), (std::vector<double>{1.0, 2.0}));
        EXPECT_EQ(s->GetPTILES(), (std::vector<int>{5, 95}));
        EXPECT_EQ(s->GetPlanFile(), "plan.xml");
        EXPECT_EQ(s->GetProgressListener(), &overall);
        EXPECT_EQ(s->GetWarningMessages().GetWarnings().size(), 1u);
    }
}

// ---- Listing -----------------------------------------------------------------------------

TEST(SECSettingsDisplay, UnrecognizedValuesAndFlagLines) {
    SECSettings settings;
    settings.SetDistributionDisplay(static_cast<DistDisplay>(4));
    settings.SetCDFOrder(3);
    settings.SetContinuousPDFView(4);
    settings.SetCategoricalGroup(0);
    settings.SetBoxplotOverlayGroup(6);
    settings.SetOrdCorrelation(static_cast<OrdinalCorrelations>(-1));
    const std::string text = Listing(settings);

    EXPECT_TRUE(HasLine(text, "Distribution display = unrecognized"));
    EXPECT_TRUE(HasLine(text, "Ordinal correlation = unrecognized"));
    // One line per bit that is set.
    EXPECT_EQ(CountLinesStartingWith(text, "CDF order = "), 2);
    EXPECT_TRUE(HasLine(text, "CDF order = Ascending"));
    EXPECT_TRUE(HasLine(text, "CDF order = Descending"));
    // Bits outside the table, or no bit at all, are unrecognized.
    EXPECT_EQ(CountLinesStartingWith(text, "Continuous PDF view = "), 1);
    EXPECT_TRUE(HasLine(text, "Continuous PDF view = unrecognized"));
    EXPECT_TRUE(HasLine(text, "Categorical group = unrecognized"));
    EXPECT_EQ(CountLinesStartingWith(text, "Boxplot overlay group = "), 2);
    EXPECT_TRUE(HasLine(text, "Boxplot overlay group = Iters"));
    EXPECT_TRUE(HasLine(text, "Boxplot overlay group = unrecognized"));
}

TEST(SECSettingsDisplay, DefinedPointersAndIterationCount) {
    NullListener listener;
    MCThread_800::MCStdThreadFactory factory;
    SECSettings settings;
    settings.SetProgressListener(&listener);
    settings.SetThreadFactory(&factory);
    settings.SetNSensIters(3);
    const std::string text = Listing(settings);
    EXPECT_TRUE(HasLine(text, "Progress Listener is defined"));
    EXPECT_TRUE(HasLine(text, "Thread Factory is defined"));
    EXPECT_TRUE(HasLine(text, "Procedure Cancel is undefined"));
    EXPECT_TRUE(HasLine(text, "Number of Sensitivity Iterations: 3"));
    EXPECT_EQ(text.find("not defined"), std::string::npos);
}
