#include "simulation_evaluation/secsettings.h"

#include "mccommon/display.h"

#include <cstdint>
#include <string>

namespace MCMCSP_800 {

namespace {

using namespace MCDisplay_800;

//! "label = word": how an enumerated setting is listed.
void DisplayWord(const std::string& label, const std::string& word) {
    DisplayText(label + " = " + word);
}

//! One "label = word" line per known flag (1 and 2) of a bit set, and one "label =
//! unrecognized" line when the set holds other bits or none at all.
template <typename Flag>
void DisplayFlagSet(const std::string& label, std::int32_t bits, const std::string& (*word)(Flag)) {
    constexpr std::int32_t kKnownBits = 1 | 2;
    for (std::int32_t bit = 1; bit <= 2; bit <<= 1) {
        if ((bits & bit) != 0) {
            DisplayWord(label, word(static_cast<Flag>(bit)));
        }
    }
    if ((bits & ~kKnownBits) != 0 || (bits & kKnownBits) == 0) {
        DisplayWord(label, "unrecognized");
    }
}

//! "<name> is defined" or "<name> is undefined".
void DisplayPointer(const std::string& name, const void* p) {
    DisplayText(name + (p ? " is defined" : " is undefined"));
}

} // namespace

void SECSettings::Display(std::ostream& os) const {
    ScopedOutStream redirect(os);
    DisplayFrame frame("Start of display SECSettings object", "End of display SECSettings object");

    DisplayS("Plan file:", fPlanFile);
    DisplayB("Reproducible:", fbReproducible);
    DisplayI("Random seed:", fSeed);
    if (fNSensIters < 1) {
        DisplayText("Number of Sensitivity Iterations not defined");
    } else {
        DisplayI("Number of Sensitivity Iterations:", fNSensIters);
    }
    DisplayB("Use target category probabilities:", fbUseTargCatProbs);

    DisplayWord("Distribution display", GetDistDisplayDisplayWord(fDistributionDisplay));
    DisplayFlagSet("CDF order", fCDFOrder, &GetDistOrderDisplayWord);
    DisplayB("Continuous mean reference line:", fbContinuousMean);
    DisplayB("Continuous median reference line:", fbContinuousMedian);
    DisplayDV("Continuous percentile reference lines:", fvContinuousPCT);
    DisplayI("Continuous sigmas:", fContinuousSigmas);
    DisplayDV("Continuous custom positions:", fvContinuousCustom);
    DisplayFlagSet("Continuous PDF view", fContinuousPDFView, &GetDistViewDisplayWord);
    DisplayB("Continuous overlay:", fbContinuousOverlay);

    DisplayB("Categorical predicted value:", fbCategoricalPredValue);
    DisplayB("Categorical predicted probability:", fbCategoricalPredProbability);
    DisplayFlagSet("Categorical group", fCategoricalGroup, &GetDistGroupDisplayWord);

    DisplayB("Scatterplot display:", fbScatterplotDisplay);
    DisplayI("Scatterplot row size:", fScatterplotRowsize);
    DisplayB("Boxplot display:", fbBoxplotDisplay);
    DisplayB("Boxplot overlay targets:", fbBoxplotOverlayTargets);
    DisplayFlagSet("Boxplot overlay group", fBoxplotOverlayGroup, &GetBoxplotGroupDisplayWord);

    DisplayB("Tornado display:", fbTornadoDisplay);
    DisplayB("Tornado correlation:", fbTornadoCorrelation);
    DisplayB("Use tornado delta in standard deviations:", fbUseTornadoStddev);
    DisplayD("Tornado delta in standard deviations:", fTornadoDeltaStddev);
    DisplayB("Use tornado delta of the mean:", fbUseTornadoDeltaMean);
    DisplayD("Tornado delta of the mean:", fTornadoDeltaMean);
    DisplayB("Tornado contribution to variance:", fbTornadoVariance);
    DisplayB("Quantile summaries and first-order indices:", fbQuantilesAndIndices);
    DisplayB("Tornado all charts:", fbTornadoAllCharts);
    DisplayWord("Ordinal correlation", GetOrdinalCorrelationsDisplayWord(fOrdCorrelation));

    DisplayB("Descriptive display:", fbDescriptiveDisplay);
    DisplayD("Confidence interval level:", fCiLevel);
    DisplayB("Percentile display:", fbPercentileDisplay);
    DisplayI("Number of tiles:", fNTILES);
    DisplayIV("Percentiles:", fvPTILES);
    DisplayB("Print associations:", fbPrintAssociations);

    DisplayB("Default lower reference line:", fbDefaultLowerRefLine);
    if (!fbDefaultLowerRefLine) {
        DisplayD("Lower reference line:", fLowerRefLine);
    }
    DisplayB("Default upper reference line:", fbDefaultUpperRefline);
    if (!fbDefaultUpperRefline) {
        DisplayD("Upper reference line:", fUpperRefLine);
    }

    DisplayS("Viz style sheet name:", fVizStyleSheetName);
    DisplayS("Viz style sheet location:", fVizStyleSheetLocation);

    DisplayPointer("Progress Listener", fpProgressListener);
    DisplayPointer("Iteration Progress Listener", fpIterProgressListener);
    DisplayPointer("Record Progress Listener", fpRecProgressListener);
    DisplayPointer("Procedure Cancel", fpCancel);
    DisplayI("The maximum number of threads:", fMaxThreadNum);
    DisplayI("The memory cache limit in KB:", fMemCacheKB);
    DisplayPointer("Thread Factory", fpThreadFactory);
    DisplayPointer("Thread Iterator Factory", fpThreadIterFactory);
    DisplayI("Number of warning messages:", static_cast<long long>(fWarnings.GetWarnings().size()));
}

} // namespace MCMCSP_800
