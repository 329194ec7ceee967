// The component's entry: the version banner, the two factories the host registers, the
// behaviour that the fitting and simulation algorithms share toward the host, and the status
// display functions.
#pragma once

#include "mccommon/display.h"
#include "mccommon/hostinterfaces.h"
#include "mccommon/mcstatus.h"
#include "mcmath/mccancelinfo.h"

#include <ostream>
#include <string>
#include <vector>

namespace MCMCSP_800 {

using MCCommon_800::MCStatus;
using MCCommon_800::MCWarnings;

//! Status codes the component reports (the texts are the host's).
namespace MCSPStatus {
inline constexpr long kCancelled = 1;
inline constexpr long kModelNotBuilt = 6;
inline constexpr long kNoData = 390002;
inline constexpr long kBadStream = 390003;
inline constexpr long kDistDropped = 390004;
inline constexpr long kLowExpectedOrException = 390005;
inline constexpr long kNoFit = 390006;
inline constexpr long kNormalGeneratorFailed = 390007;
inline constexpr long kMergeFailed = 390010;
inline constexpr long kNoValidCase = 390011;
inline constexpr long kRootSearchFailed = 390012;
inline constexpr long kPoorBestFit = 390013;
inline constexpr long kAttemptsExhausted = 390014;
inline constexpr long kCorrelationAdjusted = 390015;
inline constexpr long kScatterPlotsLimited = 390016;
//! A planned input correlation lies outside the range its two distributions can attain.
inline constexpr long kCorrelationUnreachable = 390017;
} // namespace MCSPStatus

//! "Simulation Component Ver. 1.0" followed by the copyright notice.
const std::string& GetComponentVersionText();

//! The factory the host registers for plan creation. It creates nothing: the host constructs
//! DFCAlgorithm directly.
class SPCFactory : public MCCommon_800::IMCFactory {
public:
    MCCommon_800::IMCAlgorithm* CreateMCAlgorithm(MCXML_800::MCSettings& settings,
                                                  MCXML_800::MCVarList& variables) override;
    MCStatus GetStatus() const override { return fStatus; }
    const std::vector<MCStatus>& GetWarnings() const { return fWarnings.GetWarnings(true); }

private:
    MCStatus fStatus;     //!< status of the last operation
    MCWarnings fWarnings; //!< warnings collected by the factory
};

//! The factory the host registers for simulation. It creates nothing: the host constructs
//! SECAlgorithm directly.
class SECFactory : public MCCommon_800::IMCFactory {
public:
    MCCommon_800::IMCAlgorithm* CreateMCAlgorithm(MCXML_800::MCSettings& settings,
                                                  MCXML_800::MCVarList& variables) override;
    MCStatus GetStatus() const override { return fStatus; }
    const std::vector<MCStatus>& GetWarnings() const { return fWarnings.GetWarnings(true); }

private:
    MCStatus fStatus;     //!< status of the last operation
    MCWarnings fWarnings; //!< warnings collected by the factory
};

//! What DFCAlgorithm and SECAlgorithm do alike for the host: the model-built flag, the stored
//! status, warnings, cancellation, export checks and the version. `Derived` provides
//! `StoreProgressListener(p)` and `StoreCancelPointer(p)`, which hand a non-null pointer to
//! its own settings copy.
template <class Derived> class MCAlgorithmCommon : public MCCommon_800::IMCAlgorithm {
public:
    bool IsModelBuilt() const override { return fbModelBuilt; }

    //! The component scores nothing itself.
    MCStatus Score(const MCXML_800::Record& /*record*/, std::vector<double>& /*out*/,
                   std::vector<std::vector<double>>& /*outSets*/) const override {
        return MCStatus();
    }

    //! Checks that there is something to export and somewhere to write it; writes nothing.
    MCStatus ExportModel(std::ostream& os, MCXML_800::MCApplicInfo4XML* /*info*/) override {
        return CheckExport(os);
    }

    MCStatus GetStatus() const override { return fStatus; }

    void SetProgressListener(MCCommon_800::ProgressListener* listener) override {
        if (listener) {
            static_cast<Derived*>(this)->StoreProgressListener(listener);
        }
    }

    void SetCancelPtr(MCCommon_800::MCQueryCancel* cancel) override {
        if (cancel) {
            fCancelInfo.SetCancelPtr(cancel);
            static_cast<Derived*>(this)->StoreCancelPointer(cancel);
        }
    }

    //! Raises the cancel flag; the running passes poll it. Safe from any thread.
    void Cancel() override { fCancelInfo.SetCancel(); }

    std::string GetComponentVersion() const override { return GetComponentVersionText(); }

    const std::vector<MCStatus>& GetWarnings() const override {
        return fWarnings.GetWarnings(true);
    }

protected:
    //! 6 when the model is not built, 390003 when the stream is not good, else success.
    MCStatus CheckExport(const std::ostream& os) const {
        if (!fbModelBuilt) {
            return MCStatus(MCSPStatus::kModelNotBuilt, false);
        }
        if (!os.good()) {
            return MCStatus(MCSPStatus::kBadStream, false);
        }
        return MCStatus();
    }

    //! The GetOutputStats rule: `results` goes out when the model is built and `results` is
    //! not null; otherwise `out` is null and the status is 390002. The status is stored.
    template <class Results> MCStatus HandOutResults(Results* results, Results*& out) {
        MCStatus status(MCSPStatus::kNoData, false);
        out = nullptr;
        if (fbModelBuilt && results) {
            status = MCStatus();
            out = results;
        }
        fStatus = status;
        return status;
    }

    bool fbModelBuilt = false;             //!< true once BuildModel has succeeded
    MCStatus fStatus;                      //!< status of the last operation
    MCWarnings fWarnings;                  //!< warnings of the run
    MCMath_800::MCCancelInfo fCancelInfo;  //!< cancel flag and the host's cancel query
};

} // namespace MCMCSP_800

namespace MCSPComponentDisplay_800 {

//! Prints `title`, "IsError" and "error code" of `status`, then `title` again.
void DisplayStatus(const std::string& title, const MCCommon_800::MCStatus& status);
//! Prints `title` with the number of statuses, then per status its index, "IsError",
//! "error code" and the title.
void DisplayVStatus(const std::string& title, const std::vector<MCCommon_800::MCStatus>& statuses);

} // namespace MCSPComponentDisplay_800
