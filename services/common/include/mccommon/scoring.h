// The host's scoring services: a score computer evaluates a predictive model on one case of
// named input values; a data sink receives the simulated cases.
#pragma once

#include "mccommon/mcstatus.h"
#include "mccommon/records.h"
#include "mccommon/variables.h"

#include <memory>
#include <string>
#include <vector>

namespace MCXML_800 {

//! Evaluates one model on cases of named input values.
class IMCScoreComputer {
public:
    //! Kinds of model.
    enum PMMLModelType {
        kAssociation = 0, kClustering = 1, kGeneralRegression = 2, kMining = 3, kNaiveBayes = 4,
        kNeuralNetwork = 5, kRegression = 6, kRuleSet = 7, kSequence = 8, kSVM = 9,
        kTimeSeries = 10, kTree = 11, kNearestNeighbor = 12, kScoreCard = 13, kBaseline = 14,
        kBayesNetExtension = 15, kTransformsOnly = 16, kOther = 17
    };

    virtual ~IMCScoreComputer() = default;
    //! Lays out `output` (the names of the values ScoreRecord will fill) for cases shaped like
    //! `input`.
    virtual MCCommon_800::MCStatus PrepareOutputRecord(const ValueRecord& input,
                                                       ValueRecord& output) = 0;
    virtual PMMLModelType GetModelType() const = 0;
    //! Number of target variables of the model.
    virtual int GetNTargets() const = 0;
    //! Target variable `i`, null when absent.
    virtual const IMCVariable* GetTargetVariable(int i) const = 0;
    virtual std::string GetAlgorithmName() const = 0;
    //! Scores one case: reads `input`, fills the values already laid out in `output`.
    virtual MCCommon_800::MCStatus ScoreRecord(const ValueRecord& input, ValueRecord& output) = 0;
};

//! Creates score computers, one per simulator (so each worker scores on its own object).
class IMCSPScoreFactory {
public:
    virtual ~IMCSPScoreFactory() = default;
    virtual std::unique_ptr<IMCScoreComputer> CreateScoreComputer() = 0;
};

//! Receives the simulated cases of a run.
class SECAppDataProcess {
public:
    virtual ~SECAppDataProcess() = default;
    //! Called once before the first case: the target names, the number of category
    //! probabilities delivered per case, and the number of sensitivity iterations.
    virtual void BeginData(const std::vector<std::string>& targetNames, int nProbabilities,
                           int nIterations) = 0;
    //! One simulated case: its input values, the values read from its score, its iteration.
    virtual void AddCase(const std::vector<double>& inputs, const std::vector<double>& targets,
                         int iteration) = 0;
};

} // namespace MCXML_800
