// SECPolyCorrTask: the thread task that would compute the polyserial and polychoric
// correlations of the targets with ordinal inputs for a slice of (target, input) pairs.
//
// The results keep a list of each per target (SECContinuousTargetInfo::fvPolyserialCorrs,
// fvPolychoricCorrs), but no step of the simulation creates this task yet: the lists stay
// empty and the task's run only reports success. It holds what a computation would need: the
// settings, the variable list and the results it writes to, a cancel record on the settings'
// cancel query, a status and warnings.
#pragma once

#include "mccommon/mcstatus.h"
#include "mcmath/mccancelinfo.h"
#include "mcthread/mcthread.h"
#include "simulation_evaluation/secoutputstats.h"
#include "simulation_evaluation/secsettings.h"

#include <utility>
#include <vector>

namespace MCMCSP_800 {

class SECPolyCorrTask : public MCThread_800::IMCThreadTask {
public:
    //! Pairs `first` to `last` (exclusive) of `pairs` (target, input indices) for `results`;
    //! `value` and `polychoric` parameterise the computation.
    SECPolyCorrTask(int first, int last, SECOutputStats* results,
                    std::vector<std::pair<int, int>> pairs, double value, bool polychoric)
        : fFirst(first), fLast(last), fpResults(results), fvPairs(std::move(pairs)),
          fValue(value), fbPolychoric(polychoric),
          fpSettings(results != nullptr ? results->GetSECSettings() : nullptr),
          fpVarList(results != nullptr ? results->GetMCVarList() : nullptr),
          fCancelInfo(fpSettings != nullptr ? fpSettings->GetCancelPointer() : nullptr) {}

    //! Nothing to compute yet: success.
    void RunTask() override { fStatus = MCCommon_800::MCStatus(); }

    MCCommon_800::MCStatus GetStatus() const { return fStatus; }
    const MCCommon_800::MCWarnings& GetWarnings() const { return fWarnings; }

private:
    int fFirst;                                   //!< first pair of the slice
    int fLast;                                    //!< one past the last pair
    SECOutputStats* fpResults;                    //!< results written to, not owned
    std::vector<std::pair<int, int>> fvPairs;     //!< (target, input) pairs
    double fValue;                                //!< parameter of the computation
    bool fbPolychoric;                            //!< polychoric rather than polyserial
    const SECSettings* fpSettings;                //!< run settings, not owned
    const MCXML_800::MCVarList* fpVarList;        //!< host's variables, not owned
    MCMath_800::MCCancelInfo fCancelInfo;         //!< on the settings' cancel query
    MCCommon_800::MCStatus fStatus;               //!< outcome of the run
    MCCommon_800::MCWarnings fWarnings;           //!< warnings of the run
};

} // namespace MCMCSP_800
