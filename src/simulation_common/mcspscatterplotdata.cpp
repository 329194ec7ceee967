#include "simulation_common/mcspscatterplotdata.h"

#include "component/mcspassert.h"
#include "component/mcspcomponent.h"
#include "mccommon/display.h"
#include "simulation_common/mcsphistogramdata.h"

#include <cmath>
#include <optional>

namespace MCMCSP_800 {

using MCCommon_800::MCStatus;

namespace {

//! An nx x ny matrix of zeros.
MCScatterPlotData::Matrix Zeros(int nx, int ny) {
    return MCScatterPlotData::Matrix(static_cast<std::size_t>(nx),
                                     std::vector<double>(static_cast<std::size_t>(ny), 0.0));
}

} // namespace

MCScatterPlotData::MCScatterPlotData() {
    InitChartData();
}

MCScatterPlotData::MCScatterPlotData(int nBinsX, int nBinsY, double minX, double minY, double maxX,
                                     double maxY, bool binning)
    : fNBinsX(nBinsX), fNBinsY(nBinsY), fMinX(minX), fMaxX(maxX), fMinY(minY), fMaxY(maxY),
      fbBinning(binning) {
    if (fbBinning) {
        MCSP_ASSERT(nBinsX >= 2 && maxX >= minX, "Binning OK for X");
        MCSP_ASSERT(nBinsY >= 2 && maxY >= minY, "Binning OK for Y");
    }
    // An axis that cannot be cut gets one cell of width 0, which takes every value.
    fBinWidthX = MCChartKernels::BinWidth(nBinsX, minX, maxX);
    fBinWidthY = MCChartKernels::BinWidth(nBinsY, minY, maxY);
    if (fBinWidthX == 0.0) {
        fNBinsX = 1;
    }
    if (fBinWidthY == 0.0) {
        fNBinsY = 1;
    }
    if (fbBinning) {
        fvvMeansX = Zeros(fNBinsX, fNBinsY);
        fvvMeansY = fvvMeansX;
        fvvWeightedCounts = fvvMeansX;
        fvvFreqCounts = fvvMeansX;
    }
    InitChartData();
}

void MCScatterPlotData::InitChartData() {
    fChartData = MCXML_800::MCVariateData();
    fChartData.fCounts.push_back(MCXML_800::MCXMLCounts{0.0});
    fChartData.fCoordinates.resize(3);
    for (MCXML_800::MCXMLCoordinates& axis : fChartData.fCoordinates) {
        axis.fKind = MCXML_800::MCXMLCoordinates::kValues;
    }
    fChartData.fCoordinates[2].fLabel = "frequency";
}

// Binned pairs update the weighted means of their cell, mean += (w / W') * (v - mean) for
// v = x and v = y, W' the cell's weight after the pair (West 1979, as in MCHistogramData).
bool MCScatterPlotData::UpdateData(double f, double g, double x, double y) {
    if (!MCSP_ASSERT(MCChartKernels::IsUsableWeight(f, g),
                     "MCScatterPlotData::UpdateData: f > 0 and g > 0") ||
        !MCSP_ASSERT(std::isfinite(x) && std::isfinite(y),
                     "MCScatterPlotData::UpdateData: values are finite")) {
        return false;
    }
    if (!fbBinning) {
        fChartData.fCounts.front().fCount += f;
        fChartData.fCoordinates[0].fValues.push_back(x);
        fChartData.fCoordinates[1].fValues.push_back(y);
        fChartData.fCoordinates[2].fValues.push_back(f);
        return true;
    }
    const double w = f * g;
    const int i = MCChartKernels::BinIndex(x, fMinX, fMaxX, fBinWidthX, fNBinsX);
    const int j = MCChartKernels::BinIndex(y, fMinY, fMaxY, fBinWidthY, fNBinsY);
    fNCases += 1.0;
    fTotalWeight += f;
    fWeightedCount += w;
    if (i >= 0 && i < fNBinsX && j >= 0 && j < fNBinsY) {
        const auto ui = static_cast<std::size_t>(i);
        const auto uj = static_cast<std::size_t>(j);
        double& weighted = fvvWeightedCounts[ui][uj];
        weighted += w;
        fvvFreqCounts[ui][uj] += f;
        const double r = w / weighted;
        fvvMeansX[ui][uj] += r * (x - fvvMeansX[ui][uj]);
        fvvMeansY[ui][uj] += r * (y - fvvMeansY[ui][uj]);
        return true;
    }
    OutlierBin& cell = fOutlierBins[{i, j}];
    cell.fWeightedCount += w;
    cell.fFreqCount += f;
    const double r = w / cell.fWeightedCount;
    cell.fMeanX += r * (x - cell.fMeanX);
    cell.fMeanY += r * (y - cell.fMeanY);
    return true;
}

MCStatus MCScatterPlotData::AddObjects(const std::vector<const MCScatterPlotData*>& others) {
    if (others.empty()) {
        return MCStatus();
    }
    // Raw pairs live only in the chart record and are not merged; the receiver keeps them.
    if (!fbBinning) {
        return MCStatus(MCSPStatus::kMergeFailed, false);
    }
    // Entries that are this object read a copy taken before the merge.
    std::optional<MCScatterPlotData> selfCopy;
    std::vector<const MCScatterPlotData*> list(others);
    for (const MCScatterPlotData*& entry : list) {
        if (!MCSP_ASSERT(entry != nullptr, "MCScatterPlotData::AddObjects: entry is not null")) {
            return MCStatus(MCSPStatus::kMergeFailed, false);
        }
        if (entry == this) {
            if (!selfCopy) {
                selfCopy.emplace(*this);
            }
            entry = &*selfCopy;
        }
    }

    // An empty receiver takes the first entry's layout (a raw first entry fails the merge);
    // every later entry that holds pairs, and every raw entry, must share it. Checked before
    // anything changes.
    const std::size_t first = fNCases == 0.0 ? 1 : 0;
    const MCScatterPlotData& layout = first == 1 ? *list.front() : *this;
    if (!layout.fbBinning) {
        return MCStatus(MCSPStatus::kMergeFailed, false);
    }
    for (std::size_t i = first; i < list.size(); ++i) {
        // A raw entry counts no pairs (they live in its chart record) yet cannot be merged.
        const bool holdsPairs = list[i]->fNCases != 0.0 || !list[i]->fbBinning;
        if (holdsPairs && !layout.IsCompatible(*list[i])) {
            return MCStatus(MCSPStatus::kMergeFailed, false);
        }
    }
    if (first == 1) {
        *this = *list.front();
    }
    MergeCompatible(list, first);
    return MCStatus();
}

// Two-pass weighted merge, cell by cell and for both means together: counts are summed first,
// then each mean becomes sum_i mean_i * W_i / sum_i W_i by rescaling this object's means to
// their share of the new weight and adding the others' shares.
void MCScatterPlotData::MergeCompatible(const std::vector<const MCScatterPlotData*>& others,
                                        std::size_t first) {
    const Matrix weightedBefore(fvvWeightedCounts);
    std::map<std::pair<int, int>, double> outlierWeightBefore;
    for (const auto& [index, cell] : fOutlierBins) {
        outlierWeightBefore.emplace(index, cell.fWeightedCount);
    }

    // First pass: counts. The total of full weights is merged too, so that the merged object
    // equals one that saw every pair.
    double nCases = fNCases;
    for (std::size_t k = first; k < others.size(); ++k) {
        const MCScatterPlotData& other = *others[k];
        if (other.fNCases == 0.0) {
            continue;
        }
        nCases += other.fNCases;
        fTotalWeight += other.fTotalWeight;
        fWeightedCount += other.fWeightedCount;
        for (std::size_t i = 0; i < fvvFreqCounts.size(); ++i) {
            for (std::size_t j = 0; j < fvvFreqCounts[i].size(); ++j) {
                fvvFreqCounts[i][j] += other.fvvFreqCounts[i][j];
                fvvWeightedCounts[i][j] += other.fvvWeightedCounts[i][j];
            }
        }
        for (const auto& [index, cell] : other.fOutlierBins) {
            OutlierBin& mine = fOutlierBins[index];
            mine.fFreqCount += cell.fFreqCount;
            mine.fWeightedCount += cell.fWeightedCount;
        }
    }
    if (nCases == fNCases) {
        return; // no entry held pairs
    }
    fNCases = nCases;

    // This object's means, rescaled to their share of the new weights.
    for (std::size_t i = 0; i < fvvMeansX.size(); ++i) {
        for (std::size_t j = 0; j < fvvMeansX[i].size(); ++j) {
            const double weighted = fvvWeightedCounts[i][j];
            const double before = weightedBefore[i][j];
            if (weighted > 0.0 && before > 0.0) {
                fvvMeansX[i][j] = fvvMeansX[i][j] * before / weighted;
                fvvMeansY[i][j] = fvvMeansY[i][j] * before / weighted;
            }
        }
    }
    for (auto& [index, cell] : fOutlierBins) {
        const auto found = outlierWeightBefore.find(index);
        if (found == outlierWeightBefore.end() || found->second <= 0.0) {
            cell.fMeanX = 0.0;
            cell.fMeanY = 0.0;
        } else if (cell.fWeightedCount > 0.0) {
            cell.fMeanX = cell.fMeanX * found->second / cell.fWeightedCount;
            cell.fMeanY = cell.fMeanY * found->second / cell.fWeightedCount;
        }
    }

    // Second pass: the others' shares.
    for (std::size_t k = first; k < others.size(); ++k) {
        const MCScatterPlotData& other = *others[k];
        if (other.fNCases == 0.0) {
            continue;
        }
        for (std::size_t i = 0; i < fvvMeansX.size(); ++i) {
            for (std::size_t j = 0; j < fvvMeansX[i].size(); ++j) {
                const double weighted = other.fvvWeightedCounts[i][j];
                if (weighted > 0.0) {
                    const double share = weighted / fvvWeightedCounts[i][j];
                    fvvMeansX[i][j] += other.fvvMeansX[i][j] * share;
                    fvvMeansY[i][j] += other.fvvMeansY[i][j] * share;
                }
            }
        }
        for (const auto& [index, cell] : other.fOutlierBins) {
            if (cell.fWeightedCount > 0.0) {
                OutlierBin& mine = fOutlierBins[index];
                const double share = cell.fWeightedCount / mine.fWeightedCount;
                mine.fMeanX += cell.fMeanX * share;
                mine.fMeanY += cell.fMeanY * share;
            }
        }
    }
}

bool MCScatterPlotData::IsCompatible(const MCScatterPlotData& other) const {
    return fbBinning == other.fbBinning && fNBinsX == other.fNBinsX && fNBinsY == other.fNBinsY &&
           fMinX == other.fMinX && fMinY == other.fMinY && fBinWidthX == other.fBinWidthX &&
           fBinWidthY == other.fBinWidthY;
}

const MCXML_800::MCVariateData&
MCScatterPlotData::GetMCVariateData(const std::string& xName, const std::string& xLabel,
                                    const std::string& xExtra, const std::string& yName,
                                    const std::string& yLabel, const std::string& yExtra) {
    MCXML_800::MCXMLCoordinates& xAxis = fChartData.fCoordinates[0];
    MCXML_800::MCXMLCoordinates& yAxis = fChartData.fCoordinates[1];
    xAxis.fLabel = xLabel;
    xAxis.fVarName = xName;
    xAxis.fExtra = xExtra;
    yAxis.fLabel = yLabel;
    yAxis.fVarName = yName;
    yAxis.fExtra = yExtra;
    if (!fbBinning || fChartData.fCounts.front().fCount != 0.0) {
        return fChartData;
    }
    fChartData.fCounts.front().fCount = fTotalWeight;
    MCXML_800::MCXMLCoordinates& frequency = fChartData.fCoordinates[2];
    for (std::size_t i = 0; i < fvvFreqCounts.size(); ++i) {
        for (std::size_t j = 0; j < fvvFreqCounts[i].size(); ++j) {
            if (fvvFreqCounts[i][j] > 0.0) {
                xAxis.fValues.push_back(fvvMeansX[i][j]);
                yAxis.fValues.push_back(fvvMeansY[i][j]);
                frequency.fValues.push_back(fvvFreqCounts[i][j]);
            }
        }
    }
    return fChartData;
}

void MCScatterPlotData::Display() const {
    using namespace MCDisplay_800;
    const DisplayFrame frame("MCScatterPlotData display start", "MCScatterPlotData display end");
    DisplayI("The number of bins for X", fNBinsX);
    DisplayI("The number of bins for Y", fNBinsY);
    DisplayD("The length of a bin for X", fBinWidthX);
    DisplayD("The length of a bin for Y", fBinWidthY);
    DisplayDVV("The means for X in each bin", fvvMeansX);
    DisplayDVV("The means for Y in each bin", fvvMeansY);
    DisplayDVV("N cases of each bin considering frequency weight only", fvvFreqCounts);
    DisplayDVV("The weighted (frequency and regression weight) N cases", fvvWeightedCounts);
    DisplayD("Minimum X value from constructor", fMinX);
    DisplayD("Maximum X value from constructor", fMaxX);
    DisplayD("Minimum Y value from constructor", fMinY);
    DisplayD("Maximum Y value from constructor", fMaxY);
    DisplayD("Weighted number of cases including both weights", fWeightedCount);
    DisplayD("Total frequency weight", fTotalWeight);
    DisplayD("The total unweighted number of cases", fNCases);
}

} // namespace MCMCSP_800
