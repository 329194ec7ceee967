// MCBarChartData: the bar chart of one categorical quantity of a simulation (a categorical
// target or input whose values are already category positions 0 to k - 1).
//
// It sums the frequency weight of every value per category and hands the counts, or the
// proportions, to the host as a chart record (GenerateMCVariateData), built once. The host
// fills one object per quantity on one thread; there is no merge. The class is a value.
#pragma once

#include "mccommon/chartdata.h"

#include <string>
#include <vector>

namespace MCMCSP_800 {

class MCBarChartData {
public:
    //! `nCats` categories, counts 0; nCats > 0 is asserted and a non-positive count leaves no
    //! category, so that no value is accepted. `proportions` charts shares instead of counts.
    MCBarChartData(int nCats, bool proportions);
    virtual ~MCBarChartData() = default;
    MCBarChartData(const MCBarChartData&) = default;
    MCBarChartData& operator=(const MCBarChartData&) = default;
    MCBarChartData(MCBarChartData&&) = default;
    MCBarChartData& operator=(MCBarChartData&&) = default;

    //! Adds `freqWeight` to the category at position `value` (truncated). False, with nothing
    //! changed, unless 0 <= value < k and the weight is finite and positive.
    bool UpdateData(double freqWeight, double value);

    //! Sum of the frequency weights counted.
    double GetTotalWeight() const { return fTotal; }
    //! Count per category; proportions once the chart record has been built with them.
    const std::vector<double>& GetCategoryCounts() const { return fvCounts; }

    //! The chart record, built on the first call: axis 0 the texts of the categories with a
    //! positive count (from `categories`, one text per position), axis 1 their counts or
    //! proportions. With proportions the counts are divided by the total in place, once.
    const MCXML_800::MCVariateData&
    GenerateMCVariateData(const std::string& name, const std::vector<std::string>& categories);

    //! Diagnostic print of the state through the display primitives.
    void Display() const;

private:
    int fNCats = 0;                      //!< k, the number of categories
    std::vector<double> fvCounts;        //!< sum of frequency weights per category
    bool fbProportions = false;          //!< true: the record shows proportions
    double fTotal = 0.0;                 //!< sum of all frequency weights
    MCXML_800::MCVariateData fChartData; //!< chart record, built once
};

} // namespace MCMCSP_800
