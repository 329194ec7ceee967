// The interfaces through which a statistics host and the component meet: the algorithm and
// factory contract, multi-pass record iteration, progress reporting and cancellation.
#pragma once

#include "mccommon/mcstatus.h"
#include "mccommon/records.h"
#include "mccommon/variables.h"

#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace MCXML_800 {

//! Base of the host's settings objects handed to a factory.
class MCSettings {
public:
    virtual ~MCSettings() = default;
};

//! What the host tells an exported model about itself.
struct MCApplicInfo4XML {
    std::string fApplication; //!< application name
    std::string fVersion;     //!< application version
};

} // namespace MCXML_800

namespace MCCommon_800 {

//! Iterates over the records of a dataset, pass after pass.
class MultiPassRecordIter {
public:
    virtual ~MultiPassRecordIter() = default;
    //! True while records remain in this pass.
    virtual bool HasMore() = 0;
    //! The next record of this pass, null on a read failure. The record stays valid until the
    //! next call.
    virtual const MCXML_800::Record* NextRecord() = 0;
    //! Begins a new pass over the same records; 0 on success.
    virtual int Restart() = 0;
};

//! A multi-pass iterator over records held in memory.
class MCMemoryRecordIter : public MultiPassRecordIter {
public:
    MCMemoryRecordIter() = default;
    explicit MCMemoryRecordIter(std::vector<MCXML_800::Record> records);
    void Add(MCXML_800::Record record) { fRecords.push_back(std::move(record)); }
    bool HasMore() override { return fNext < fRecords.size(); }
    const MCXML_800::Record* NextRecord() override;
    int Restart() override;
    std::size_t Size() const { return fRecords.size(); }
    //! Number of passes begun so far (1 before any Restart).
    int GetPassCount() const { return fPasses; }

private:
    std::vector<MCXML_800::Record> fRecords; //!< records in order
    std::size_t fNext = 0;                   //!< position of the next record in this pass
    int fPasses = 1;                         //!< passes begun
};

//! Questions the host can ask about a running step (iteration number, records processed).
class ProgressReport {
public:
    virtual ~ProgressReport() = default;
    //! A whole-number measure by name; -1 when the name is not offered.
    virtual int DiscreteMeasure(const std::string& measureName) const = 0;
    //! A real-valued measure by name; missing when the name is not offered.
    virtual double ScaleMeasure(const std::string& measureName) const = 0;
};

//! Receives progress reports from a running step.
class ProgressListener {
public:
    virtual ~ProgressListener() = default;
    virtual void Report(const ProgressReport& report) = 0;
};

//! The host's cancel query: polled by running steps.
class MCQueryCancel {
public:
    virtual ~MCQueryCancel() = default;
    //! True when the host wants the running step to stop.
    virtual bool IsCancelled() const = 0;
};

//! The host's algorithm contract.
class IMCAlgorithm {
public:
    virtual ~IMCAlgorithm() = default;
    virtual MCStatus BuildModel(MultiPassRecordIter& data, MultiPassRecordIter* other) = 0;
    virtual bool IsModelBuilt() const = 0;
    virtual MCStatus Score(const MCXML_800::Record& record, std::vector<double>& out,
                           std::vector<std::vector<double>>& outSets) const = 0;
    virtual MCStatus ExportModel(std::ostream& os, MCXML_800::MCApplicInfo4XML* info) = 0;
    virtual MCStatus GetStatus() const = 0;
    virtual void SetProgressListener(ProgressListener* listener) = 0;
    virtual void SetCancelPtr(MCQueryCancel* cancel) = 0;
    virtual void Cancel() = 0;
    virtual std::string GetComponentVersion() const = 0;
    virtual const std::vector<MCStatus>& GetWarnings() const = 0;
    virtual void Display(std::ostream& os) const = 0;
};

//! The host's factory contract.
class IMCFactory {
public:
    virtual ~IMCFactory() = default;
    virtual IMCAlgorithm* CreateMCAlgorithm(MCXML_800::MCSettings& settings,
                                            MCXML_800::MCVarList& variables) = 0;
    virtual MCStatus GetStatus() const = 0;
};

} // namespace MCCommon_800
