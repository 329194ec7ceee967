// Ctrl-C for the command: the first interrupt asks the running algorithm to stop through the
// component's cancel path (IMCAlgorithm::Cancel, and the cancel query the algorithm polls);
// a second one ends the process at once.
//
// The signal is taken by a watcher thread with sigtimedwait rather than by a handler, so the
// cancel call runs as ordinary code. SIGINT is blocked in the thread that makes the watcher
// and so in every thread started after it (the thread factory's workers): create the watcher
// before any other thread.
#pragma once

#include "mccommon/hostinterfaces.h"

#include <atomic>
#include <mutex>
#include <thread>

namespace MCHost {

class InterruptWatcher : public MCCommon_800::MCQueryCancel {
public:
    InterruptWatcher();
    ~InterruptWatcher() override;
    InterruptWatcher(const InterruptWatcher&) = delete;
    InterruptWatcher& operator=(const InterruptWatcher&) = delete;

    //! The algorithm to cancel on an interrupt (null: none).
    void SetTarget(MCCommon_800::IMCAlgorithm* algorithm);
    //! True once an interrupt has come.
    bool IsCancelled() const override { return fbInterrupted.load(); }

private:
    void Watch();

    std::atomic<bool> fbInterrupted{false};         //!< an interrupt came
    std::atomic<bool> fbStop{false};                //!< the watcher should end
    std::mutex fMutex;                              //!< guards fpTarget
    MCCommon_800::IMCAlgorithm* fpTarget = nullptr; //!< cancelled on interrupt, not owned
    bool fbMasked = false;                          //!< SIGINT was blocked here
    std::thread fWatcher;                           //!< waits for SIGINT
};

} // namespace MCHost
