// The host's chart-data record: what a chart accumulator hands to the host's output layer.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace MCXML_800 {

//! One count entry of a chart record (the total frequency weight charted).
struct MCXMLCounts {
    double fCount = 0.0; //!< total frequency weight
};

//! One axis of a chart record.
struct MCXMLCoordinates {
    //! Axis kinds: values on a scale, or category texts.
    enum Kind { kNoKind = 0, kValues = 1, kCategories = 2 };

    int fKind = kNoKind;                  //!< kind code of the axis
    std::string fLabel;                   //!< axis label ("observed", "frequency", ...)
    std::string fVarName;                 //!< variable name shown on the axis
    std::string fExtra;                   //!< third text, the caller's to use
    std::vector<double> fValues;          //!< values along the axis
    std::vector<std::string> fCategories; //!< category texts along a categorical axis
};

//! A chart record: counts, axes and named summary statistics.
struct MCVariateData {
    std::vector<MCXMLCounts> fCounts;                        //!< count entries
    std::vector<MCXMLCoordinates> fCoordinates;              //!< axes in order
    std::vector<std::pair<std::string, double>> fStatistics; //!< named statistics in order
    double fMarker = 0.0; //!< host-defined numeric field, 0 unless a producer sets it

    bool HasCounts() const { return !fCounts.empty(); }
    //! The first count entry's count, 0 when there is none.
    double GetCount() const { return fCounts.empty() ? 0.0 : fCounts.front().fCount; }
    //! The statistic named `name`, or `fallback` when absent.
    double GetStatistic(const std::string& name, double fallback) const;
};

} // namespace MCXML_800
