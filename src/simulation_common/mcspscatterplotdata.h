// MCScatterPlotData: the scatter plot of pairs (x, y) of simulated values, typically a target
// against an input.
//
// Two modes, chosen at construction. Binned: pairs are summarised on a grid of nx x ny equal
// cells over [min x, max x) x [min y, max y), each cell keeping the weighted means of x and y
// and its frequency and full-weight counts; pairs off the grid go to outlier cells keyed by
// their (x index, y index). Raw: every pair is written straight into the chart record (x, y and
// its frequency weight on axes 0, 1 and 2). Each pair comes with a frequency weight f and a
// regression weight g; w = f * g.
//
// As with MCHistogramData, each simulation worker fills its own object (UpdateData is constant
// time for pairs on the grid), the master merges them in thread order (AddObjects, binned mode
// only) and hands out the chart record (GetMCVariateData). The class is a value.
//
// Pairs the accumulator refuses (UpdateData returns false and nothing changes): a missing or
// infinite x or y, and weights that are not finite and positive.
#pragma once

#include "mccommon/chartdata.h"
#include "mccommon/mcstatus.h"

#include <map>
#include <string>
#include <utility>
#include <vector>

namespace MCMCSP_800 {

class MCScatterPlotData {
public:
    //! One outlier cell: the pairs whose cell lies off the grid.
    struct OutlierBin {
        double fMeanX = 0.0;         //!< weighted mean of x
        double fMeanY = 0.0;         //!< weighted mean of y
        double fFreqCount = 0.0;     //!< sum of f
        double fWeightedCount = 0.0; //!< sum of w
    };
    //! Outlier cells by (x index, y index), ordered by x index then y index.
    using OutlierBinMap = std::map<std::pair<int, int>, OutlierBin>;
    using Matrix = std::vector<std::vector<double>>;

    //! Raw mode, one bin per axis, widths 2, range [-1, 1] on both axes.
    MCScatterPlotData();
    //! Note the order: both minima, then both maxima. In binned mode nBinsX >= 2 with
    //! maxX >= minX, and the same for y, are asserted; an axis that cannot be cut (fewer than
    //! 2 bins, an empty, reversed, NaN or infinite range) gets one cell of width 0 that takes
    //! every value.
    MCScatterPlotData(int nBinsX, int nBinsY, double minX, double minY, double maxX, double maxY,
                      bool binning);
    virtual ~MCScatterPlotData() = default;
    MCScatterPlotData(const MCScatterPlotData&) = default;
    MCScatterPlotData& operator=(const MCScatterPlotData&) = default;
    MCScatterPlotData(MCScatterPlotData&&) = default;
    MCScatterPlotData& operator=(MCScatterPlotData&&) = default;

    //! Adds the pair (x, y) with frequency weight `f` and regression weight `g`. False, with
    //! nothing changed, for a missing or infinite coordinate or weights that are not finite and
    //! positive.
    bool UpdateData(double f, double g, double x, double y);

    //! Merges binned `others` into this binned object, which then equals one object that saw
    //! all their pairs. An empty receiver first becomes a copy of the first entry. Error 390010
    //! when this object or an entry is in raw mode (raw pairs are not merged), when a non-empty
    //! entry has another layout (cells, minima, widths) or an entry is null; nothing is changed
    //! then.
    MCCommon_800::MCStatus AddObjects(const std::vector<const MCScatterPlotData*>& others);

    //! The chart record. Every call sets the texts of axes 0 and 1; in binned mode the cells
    //! with a positive frequency count are appended once, in order of x index then y index,
    //! when the record's count is still 0. Outlier cells are not charted.
    const MCXML_800::MCVariateData&
    GetMCVariateData(const std::string& xName, const std::string& xLabel, const std::string& xExtra,
                     const std::string& yName, const std::string& yLabel,
                     const std::string& yExtra);

    //! Sum of the frequency weights of the binned pairs (raw pairs are not counted here).
    double GetTotalWeight() const { return fTotalWeight; }
    const OutlierBinMap& GetOutlierBinMap() const { return fOutlierBins; }

    bool IsBinned() const { return fbBinning; }
    int GetNBinsX() const { return fNBinsX; }
    int GetNBinsY() const { return fNBinsY; }
    double GetBinWidthX() const { return fBinWidthX; }
    double GetBinWidthY() const { return fBinWidthY; }
    const Matrix& GetMeansX() const { return fvvMeansX; }
    const Matrix& GetMeansY() const { return fvvMeansY; }
    const Matrix& GetCellFreqCounts() const { return fvvFreqCounts; }
    const Matrix& GetCellWeightedCounts() const { return fvvWeightedCounts; }
    //! Sum of the full weights of the binned pairs.
    double GetWeightedCount() const { return fWeightedCount; }
    //! Number of binned pairs accepted.
    double GetNCases() const { return fNCases; }

    //! Diagnostic print of the state through the display primitives.
    void Display() const;

private:
    //! Same mode, cells, minima and widths: the pairs of `other` can be merged.
    bool IsCompatible(const MCScatterPlotData& other) const;
    //! The merge proper, `others[first..]` into this; every entry is compatible and not this.
    void MergeCompatible(const std::vector<const MCScatterPlotData*>& others, std::size_t first);
    //! One counts entry with count 0 and three value axes, axis 2 labelled "frequency".
    void InitChartData();

    Matrix fvvMeansX;                    //!< weighted mean of x per cell, 0 until used
    Matrix fvvMeansY;                    //!< weighted mean of y per cell, 0 until used
    Matrix fvvWeightedCounts;            //!< sum of w per cell
    int fNBinsX = 1;                     //!< nx
    int fNBinsY = 1;                     //!< ny
    double fBinWidthX = 2.0;             //!< cell width in x, 0 with one cell
    double fBinWidthY = 2.0;             //!< cell width in y, 0 with one cell
    double fMinX = -1.0;                 //!< lower end of the grid in x
    double fMaxX = 1.0;                  //!< upper end of the grid in x
    double fMinY = -1.0;                 //!< lower end of the grid in y
    double fMaxY = 1.0;                  //!< upper end of the grid in y
    bool fbBinning = false;              //!< true: binned mode; false: raw mode
    Matrix fvvFreqCounts;                //!< sum of f per cell
    OutlierBinMap fOutlierBins;          //!< cells off the grid, by index pair
    double fWeightedCount = 0.0;         //!< sum of w of the binned pairs
    double fTotalWeight = 0.0;           //!< sum of f of the binned pairs
    double fNCases = 0.0;                //!< number of binned pairs
    MCXML_800::MCVariateData fChartData; //!< chart record
};

} // namespace MCMCSP_800
