// SECReporter: the progress report through which a running simulation answers the host's
// progress listeners: which sensitivity iteration is running ("iterNum") and how many cases
// have been simulated so far ("recordCount"). The simulation driver sets it and hands it to
// the listener; the class is a value.
#pragma once

#include "mccommon/hostinterfaces.h"

#include <string>

namespace MCMCSP_800 {

class SECReporter : public MCCommon_800::ProgressReport {
public:
    SECReporter() = default;
    SECReporter(const SECReporter&) = default;
    SECReporter& operator=(const SECReporter&) = default;
    ~SECReporter() override = default;

    void SetIterNum(int iterNum) { fIterNum = iterNum; }
    void SetRecordCount(int recordCount) { fRecordCount = recordCount; }

    //! "iterNum": the iteration number; "recordCount": the record count; -1 for any other
    //! name (an empty name is asserted against).
    int DiscreteMeasure(const std::string& measureName) const override;
    //! No real-valued measure is offered: asserts and gives the missing value.
    double ScaleMeasure(const std::string& measureName) const override;

private:
    int fIterNum = 0;     //!< sensitivity iteration being run
    int fRecordCount = 0; //!< cases simulated so far
};

} // namespace MCMCSP_800
