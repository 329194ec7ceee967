// Cancellation record of a running step: a flag that any thread may raise, plus the host's
// cancel query, both polled before each record, case or pair.
#pragma once

#include "mccommon/hostinterfaces.h"

#include <atomic>

namespace MCMath_800 {

class MCCancelInfo {
public:
    explicit MCCancelInfo(MCCommon_800::MCQueryCancel* query = nullptr) : fpQuery(query) {}
    MCCancelInfo(const MCCancelInfo& other)
        : fpQuery(other.fpQuery), fbCancel(other.fbCancel.load()) {}
    MCCancelInfo& operator=(const MCCancelInfo& other) {
        fpQuery = other.fpQuery;
        fbCancel = other.fbCancel.load();
        return *this;
    }

    void SetCancelPtr(MCCommon_800::MCQueryCancel* query) { fpQuery = query; }
    MCCommon_800::MCQueryCancel* GetCancelPtr() const { return fpQuery; }
    //! Raises the flag; safe from any thread.
    void SetCancel() { fbCancel.store(true, std::memory_order_relaxed); }
    //! Lowers the flag, for a record that is reused for a new step.
    void ResetCancel() { fbCancel.store(false, std::memory_order_relaxed); }
    //! True when the running step should stop: the flag is raised or the host's query says
    //! so. A positive answer from the query raises the flag, so that IsCancel reports it.
    bool WillCancel() {
        if (fbCancel.load(std::memory_order_relaxed)) {
            return true;
        }
        if (fpQuery && fpQuery->IsCancelled()) {
            SetCancel();
            return true;
        }
        return false;
    }
    //! True after a step when it was cancelled.
    bool IsCancel() const { return fbCancel.load(std::memory_order_relaxed); }

private:
    MCCommon_800::MCQueryCancel* fpQuery; //!< the host's cancel query, not owned
    std::atomic<bool> fbCancel{false};   //!< raised by SetCancel or by the query
};

} // namespace MCMath_800
