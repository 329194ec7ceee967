// A data sink that writes the simulated cases to a CSV file: one row per case with the input
// values, the target values (and category probabilities, when the score delivers them) and,
// when the run has several sensitivity iterations, the iteration.
//
// The rows go to a temporary file beside the destination; Commit renames it into place, so a
// run that fails or is cancelled leaves no partial file. Numbers are written in their shortest
// round-trip form, missing values as empty cells, and the values of a column with labels
// (a categorical input or target) as the label of their category code.
#pragma once

#include "common/atomicfile.h"
#include "mccommon/scoring.h"

#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace MCHost {

//! A column of the case file.
struct SinkColumn {
    std::string fName;                 //!< header text
    std::vector<std::string> fvLabels; //!< labels by category code; empty for numbers
};

class CsvCaseSink : public MCXML_800::SECAppDataProcess {
public:
    //! Cases will be written to `path`; `inputs` describes the input values of each case, in
    //! the order the simulation delivers them.
    CsvCaseSink(std::string path, std::vector<SinkColumn> inputs, char delimiter = ',');
    ~CsvCaseSink() override;

    //! Labels for the values of the target `target` (a categorical target's category codes).
    //! Takes effect for the header written by BeginData.
    void SetTargetLabels(const std::string& target, std::vector<std::string> labels);

    //! Opens the temporary file and writes the header. Only the first call counts.
    void BeginData(const std::vector<std::string>& targetNames, int nProbabilities,
                   int nIterations) override;
    //! Writes one row. A case whose number of values differs from the header is a fault of
    //! the caller: it is not written and makes Commit fail.
    void AddCase(const std::vector<double>& inputs, const std::vector<double>& targets,
                 int iteration) override;

    //! Finishes the file and renames it into place. False, with GetError set and no file left
    //! behind, when BeginData never came, a case was malformed or writing failed.
    bool Commit();
    //! Drops the temporary file.
    void Abort();
    const std::string& GetError() const { return fError; }
    std::int64_t GetNCases() const { return fNCases; }

private:
    //! Writes one cell: a label, a number or an empty cell.
    void WriteValue(double value, const std::vector<std::string>& labels);
    void WriteText(const std::string& text);

    std::string fPath;                 //!< destination
    std::vector<SinkColumn> fvInputs;  //!< input columns
    std::vector<SinkColumn> fvTargets; //!< target and probability columns
    std::vector<std::pair<std::string, std::vector<std::string>>> fvTargetLabels; //!< given
    char fDelimiter;                            //!< field separator
    bool fbIterations = false;                  //!< an iteration column is written
    std::unique_ptr<AtomicFileWriter> fpWriter; //!< open after BeginData
    std::mutex fMutex;                          //!< one writer at a time
    std::int64_t fNCases = 0;                   //!< rows written
    std::string fError;                         //!< first failure
};

} // namespace MCHost
