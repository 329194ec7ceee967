#include "cli/statustext.h"

#include "common/hosterror.h"

namespace MCHost {

std::string StatusText(const MCCommon_800::MCStatus& status) {
    switch (status.GetErrorCode()) {
    case 0:
        return "success";
    case 1:
        return "the step was cancelled";
    case 6:
        return "export was requested before the model was built";
    case 303:
        return "the optimiser's data handler has no accumulator or no data";
    case 304:
        return "the optimiser failed to fetch a record";
    case 307:
        return "the optimiser failed to restart the records";
    case 390002:
        return "there is no data, or the data could not be read again";
    case 390003:
        return "an output stream failed, or too few start-up records";
    case 390004:
        return "a candidate distribution was dropped for a field";
    case 390005:
        return status.IsWarning() ? "an expected chi-square count is below 5"
                                  : "the computation ran out of memory or failed";
    case 390006:
        return "no distribution fits a field";
    case 390007:
        return "the normal generator failed for a case";
    case 390010:
        return "merging statistics failed, or the correlation matrix could not be repaired";
    case 390011:
        return "there were too few valid cases";
    case 390012:
        return "a likelihood root search found no root";
    case 390013:
        return "the best fit's p-value is below 0.05";
    case 390014:
        return "every attempt at a case fell outside the bounds or filters";
    case 390015:
        return "the correlation matrix was adjusted to be positive definite";
    case 390016:
        return "scatter plots were limited to 100";
    case 390017:
        return "a planned input correlation lies outside the range its two distributions can "
               "attain: the nearer end of that range was simulated (pairs listed above)";
    case HostStatus::kScoreInput:
        return "an input the model needs is absent or unusable";
    case HostStatus::kScoreEvaluation:
        return "evaluating a model expression failed";
    case HostStatus::kScoreNotPrepared:
        return "a case was scored before the model was prepared";
    default:
        return "status " + std::to_string(status.GetErrorCode());
    }
}

} // namespace MCHost
