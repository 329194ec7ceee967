// Formula models: a small text file of `target = expression` lines that the simulation scores
// as a transformation model (model type TransformsOnly, algorithm "Transformation").
//
//   # a comment; blank lines are ignored
//   revenue = unit_price * volume                          continuous target
//   profit  = revenue - unit_cost * volume                 later lines may use earlier targets
//   category risk = profit < 0 ? 1 : 0 labels "ok" "loss"  categorical target: the expression
//                                                          gives the category index 0..k-1
//   levels channel "online" "store"                        a text input: its value becomes
//                                                          its index in the list (0, 1, ...)
//
// Expressions are muParser expressions (functions such as sqrt, exp, ln, log10, abs, min, max,
// the constants _pi and _e, comparisons, && and ||, and cond ? a : b) over the input names and
// the targets of the lines above. Division is checked: a zero divisor is an error of the case,
// not an infinity.
//
// The model is read once (FormulaModel::Load); the factory hands every simulator its own
// FormulaScoreComputer with its own parsers, so the workers score in parallel without sharing
// anything but the read-only model and the factory's first-error record.
#pragma once

#include "mccommon/scoring.h"

#include <cstdint>
#include <istream>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace MCHost {

//! One target line of a model file.
struct FormulaTarget {
    std::string fName;                 //!< the target's name
    std::string fExpression;           //!< its expression text
    long fLine = 0;                    //!< line in the model file
    bool fbCategorical = false;        //!< declared with `category`
    std::vector<std::string> fvLabels; //!< category labels, in index order
    std::vector<std::string> fvNames;  //!< names the expression uses, in first-use order
};

//! A `levels` line: the texts a text input may hold, in index order.
struct FormulaInputLevels {
    std::string fName;                 //!< the input's name
    std::vector<std::string> fvLabels; //!< its texts
    long fLine = 0;                    //!< line in the model file
};

//! A model file, read and syntax-checked.
class FormulaModel {
public:
    //! Reads the model file `path`. Throws HostError ("file:line: message") for a file that
    //! cannot be read, a malformed line, a syntax error in an expression, or a repeated name.
    static FormulaModel Load(const std::string& path);
    //! Reads a model from `in`, naming `fileName` in messages.
    static FormulaModel Parse(std::istream& in, const std::string& fileName);

    const std::string& GetFileName() const { return fFileName; }
    const std::vector<FormulaTarget>& GetTargets() const { return fvTargets; }
    const std::vector<FormulaInputLevels>& GetInputLevels() const { return fvLevels; }
    //! The names the expressions use that are not targets: the inputs the model needs, in
    //! first-use order.
    std::vector<std::string> GetInputNames() const;
    //! "" when every name an expression uses is one of `inputs` or a target of an earlier
    //! line and no target is named like an input; otherwise the message for the first
    //! problem ("file:line: ...").
    std::string CheckInputs(const std::vector<std::string>& inputs) const;

private:
    std::string fFileName;                    //!< named in messages
    std::vector<FormulaTarget> fvTargets;     //!< target lines in file order
    std::vector<FormulaInputLevels> fvLevels; //!< levels lines in file order
};

class FormulaScoreComputer;

//! Creates one FormulaScoreComputer per simulator and keeps the first error any of them
//! reported, so the host can print it after a run.
class FormulaScoreFactory : public MCXML_800::IMCSPScoreFactory {
public:
    explicit FormulaScoreFactory(FormulaModel model);
    ~FormulaScoreFactory() override;

    std::unique_ptr<MCXML_800::IMCScoreComputer> CreateScoreComputer() override;

    const FormulaModel& GetModel() const;
    //! The first error message of any computer ("" when none).
    std::string GetFirstError() const;
    //! Number of cases any computer failed to score.
    std::int64_t GetNErrors() const;

    //! Shared by the factory and its computers.
    struct Shared;

private:
    std::shared_ptr<Shared> fpShared; //!< the model and the error record
};

//! Scores cases with the expressions of a FormulaModel. The output record holds one real per
//! target, named after it, in model order: a continuous target's value, or a categorical
//! target's category index. An input that is missing makes the targets that depend on it
//! missing, which is not an error.
class FormulaScoreComputer : public MCXML_800::IMCScoreComputer {
public:
    explicit FormulaScoreComputer(std::shared_ptr<FormulaScoreFactory::Shared> shared);
    ~FormulaScoreComputer() override;

    //! Binds the expressions to the names of `input` and lays out `output` (cleared first).
    //! Error kScoreInput when an expression uses a name that is neither an input nor an
    //! earlier target, or a target is named like an input.
    MCCommon_800::MCStatus PrepareOutputRecord(const MCXML_800::ValueRecord& input,
                                               MCXML_800::ValueRecord& output) override;
    PMMLModelType GetModelType() const override { return kTransformsOnly; }
    int GetNTargets() const override;
    //! A scale variable for a continuous target, a nominal variable with the labels as its
    //! categories for a categorical one.
    const MCXML_800::IMCVariable* GetTargetVariable(int i) const override;
    std::string GetAlgorithmName() const override { return "Transformation"; }
    //! Evaluates every target for the case in `input` into `output`. On an error the targets
    //! from the failing one on are missing and the status is kScoreInput or kScoreEvaluation.
    MCCommon_800::MCStatus ScoreRecord(const MCXML_800::ValueRecord& input,
                                       MCXML_800::ValueRecord& output) override;

    //! The message of the last error of this computer ("" when none).
    const std::string& GetLastError() const { return fLastError; }

    //! Parsers and bindings, kept out of this header.
    struct Impl;

private:
    //! Records `message` here and in the factory, and returns the status `code`.
    MCCommon_800::MCStatus Fail(long code, const std::string& message);

    std::shared_ptr<FormulaScoreFactory::Shared> fpShared;             //!< model and error record
    std::unique_ptr<Impl> fpImpl;                                      //!< parsers, once prepared
    std::vector<std::unique_ptr<MCXML_800::IMCVariable>> fvTargetVars; //!< per target
    std::string fLastError;                                            //!< last failure
};

} // namespace MCHost
