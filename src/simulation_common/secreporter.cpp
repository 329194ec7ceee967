#include "simulation_common/secreporter.h"

#include "component/mcspassert.h"
#include "mccommon/mcmv.h"

namespace MCMCSP_800 {

int SECReporter::DiscreteMeasure(const std::string& measureName) const {
    MCSP_ASSERT(!measureName.empty(), "SECReporter::DiscreteMeasure: measureName is not empty");
    if (measureName == "iterNum") {
        return fIterNum;
    }
    if (measureName == "recordCount") {
        return fRecordCount;
    }
    return -1;
}

double SECReporter::ScaleMeasure(const std::string& /*measureName*/) const {
    MCSP_ASSERT(false, "SECReporter::ScaleMeasure: no scale measure is offered");
    return MCCommon_800::MCMV::Missing();
}

} // namespace MCMCSP_800
