#include "distribution_fitting/dfcdatahandler.h"

#include "component/mcspassert.h"
#include "distribution_fitting/dfcaccumstats.h"
#include "distribution_fitting/dfcalgorithm.h"

namespace MCMCSP_800 {

using MCCommon_800::MultiPassRecordIter;
using namespace MCSPConst;

namespace {

MCStatus HandlerError(long code) {
    return MCStatus(code, false);
}

} // namespace

// ------------------------------------------------------------------------------------------
// DFCDataHandler

DFCDataHandler::DFCDataHandler(MultiPassRecordIter* data, MCMath_800::MCCancelInfo* cancelInfo,
                               MCWarnings* warnings)
    : fpWarnings(warnings), fpData(data), fpCancelInfo(cancelInfo) {}

void DFCDataHandler::ResetAccumStats(int mode, bool separationCheck) {
    if (fpAccStats) {
        fpAccStats->Reset(mode, separationCheck);
    }
}

const std::vector<MCStatus>& DFCDataHandler::GetWarnings() const {
    static const std::vector<MCStatus> kNone;
    return fpWarnings ? fpWarnings->GetWarnings(true) : kNone;
}

MCStatus DFCDataHandler::RunPass(int derivFlag) {
    if (fpData) {
        if (fpData->Restart() != 0) {
            return HandlerError(MCMath_800::kOptStatusRestartFailed);
        }
        if (!MCSP_ASSERT(fpData->HasMore(), "DFCDataHandler::ComputeStatsForOptimizer: fpData == "
                                            "0 || fpData->HasMore()")) {
            return HandlerError(MCMath_800::kOptStatusNoStats);
        }
        while (fpData->HasMore()) {
            if (fpCancelInfo && fpCancelInfo->WillCancel()) {
                break;
            }
            const MCXML_800::Record* record = fpData->NextRecord();
            if (!record) {
                return HandlerError(MCMath_800::kOptStatusNoRecord);
            }
            // A rejected row (a missing value, say) is left out like any invalid record; only
            // an accumulator that reports an error ends the evaluation.
            if (fpAccStats->UpdateForRow(record->GetAll(), derivFlag) != 0) {
                const MCStatus rowStatus = fpAccStats->GetStatus();
                if (rowStatus.IsError()) {
                    return rowStatus;
                }
            }
        }
    }
    if (fpCancelInfo && fpCancelInfo->WillCancel()) {
        return HandlerError(MCSPStatus::kCancelled);
    }
    if (!fpAccStats->FinishComputations(derivFlag)) {
        const MCStatus status = fpAccStats->GetStatus();
        return status.IsError() ? status : HandlerError(MCMath_800::kOptStatusFailed);
    }
    return MCStatus();
}

MCStatus DFCDataHandler::ComputeStatsForOptimizer(int compFlags) {
    const bool derivatives =
        (compFlags & (MCMath_800::kOptCompScores | MCMath_800::kOptCompHessian)) != 0;
    const bool objective = (compFlags & MCMath_800::kOptCompObjective) != 0;
    if (!MCSP_ASSERT(fpAccStats != nullptr,
                     "DFCDataHandler::ComputeStatsForOptimizer: fpAccStats")) {
        fStatus = HandlerError(MCMath_800::kOptStatusNoStats);
        return fStatus;
    }
    if (!MCSP_ASSERT(objective || derivatives,
                     "DFCDataHandler::ComputeStatsForOptimizer: Valid compFlag")) {
        fStatus = HandlerError(MCMath_800::kOptStatusNoStats);
        return fStatus;
    }
    // A derivative pass completes the objective as well, so one pass serves every request;
    // a value pass followed by a derivative pass would feed each record to the accumulator
    // twice without a reset in between.
    fStatus = RunPass(derivatives ? 1 : 0);
    return fStatus;
}

// ------------------------------------------------------------------------------------------
// DFCOptimThreadTask

DFCOptimThreadTask::DFCOptimThreadTask(int covariate, DistType type, DFCAccumStats* accumStats,
                                       MCMath_800::IMCOptimizer* optimizer,
                                       MultiPassRecordIter* trainData)
    : fCovariate(covariate), fDistType(type), fpTrainData(trainData), fpOptimizer(optimizer),
      fpAccStats(accumStats) {}

void DFCOptimThreadTask::RunTask() {
    try {
        if (fpOptimizer) {
            if (fDistType != kDistBeta && fpTrainData && fpTrainData->Restart() != 0) {
                fStatus = HandlerError(MCMath_800::kOptStatusRestartFailed);
                return;
            }
            if (!fpTrainData || GetDebugOptimizerSwitches().fbDebugOptimizer) {
                fStatus = fpOptimizer->Optimize();
            }
            return;
        }
        if (fpAccStats && (fDistType == kDistNegbinomial || fDistType == kDistGamma)) {
            static_cast<void>(fpAccStats->SolveParameters());
            fStatus = fpAccStats->GetStatus();
        }
    } catch (...) {
        // Allocation failures above all; nothing may leave a worker thread.
        fStatus = HandlerError(MCSPStatus::kLowExpectedOrException);
    }
}

} // namespace MCMCSP_800
