#include "simulation_common/mcspbarchartdata.h"

#include "component/mcspassert.h"
#include "mccommon/display.h"

#include <cmath>
#include <limits>

namespace MCMCSP_800 {

MCBarChartData::MCBarChartData(int nCats, bool proportions) : fbProportions(proportions) {
    MCSP_ASSERT(nCats > 0, "MCBarChartData constructor: nCats > 0");
    fNCats = nCats > 0 ? nCats : 0;
    fvCounts.assign(static_cast<std::size_t>(fNCats), 0.0);
}

bool MCBarChartData::UpdateData(double freqWeight, double value) {
    // NaN fails both comparisons, so a missing value is refused here too.
    if (!MCSP_ASSERT(value >= 0.0 && value < fNCats, "MCBarChartData::UpdateData: value OK")) {
        return false;
    }
    // A weight that is not finite and positive would corrupt the total (and the proportions).
    if (!MCSP_ASSERT(freqWeight > 0.0 && freqWeight <= std::numeric_limits<double>::max(),
                     "MCBarChartData::UpdateData: freqWeight > 0")) {
        return false;
    }
    fvCounts[static_cast<std::size_t>(value)] += freqWeight;
    fTotal += freqWeight;
    return true;
}

const MCXML_800::MCVariateData&
MCBarChartData::GenerateMCVariateData(const std::string& name,
                                      const std::vector<std::string>& categories) {
    MCSP_ASSERT(categories.size() == fvCounts.size(),
                "MCBarChartData::GenerateMCVariateData: categs size OK");
    if (fChartData.HasCounts()) {
        return fChartData;
    }
    // Nothing counted leaves the counts at 0 rather than 0 / 0.
    if (fbProportions && fTotal > 0.0) {
        for (double& count : fvCounts) {
            count /= fTotal;
        }
    }
    MCXML_800::MCVariateData record;
    record.fCounts.push_back(MCXML_800::MCXMLCounts{fTotal});

    MCXML_800::MCXMLCoordinates observed;
    observed.fKind = MCXML_800::MCXMLCoordinates::kCategories;
    if (!name.empty()) {
        observed.fLabel = "observed";
        observed.fVarName = name;
    }
    MCXML_800::MCXMLCoordinates frequency;
    frequency.fKind = MCXML_800::MCXMLCoordinates::kValues;
    frequency.fLabel = "frequency";
    for (std::size_t c = 0; c < fvCounts.size(); ++c) {
        if (fvCounts[c] > 0.0) {
            // A position without a text (too short a list) is charted with an empty text, so
            // that the two axes stay in step.
            observed.fCategories.push_back(c < categories.size() ? categories[c] : std::string());
            frequency.fValues.push_back(fvCounts[c]);
        }
    }
    record.fCoordinates.push_back(std::move(observed));
    record.fCoordinates.push_back(std::move(frequency));
    fChartData = std::move(record);
    return fChartData;
}

void MCBarChartData::Display() const {
    using namespace MCDisplay_800;
    const DisplayFrame frame("MCBarChartData display start", "MCBarChartData display end");
    DisplayI("The number of categories", fNCats);
    DisplayDV("N cases of each category considering frequency weight", fvCounts);
    DisplayD("Total frequency weight", fTotal);
}

} // namespace MCMCSP_800
