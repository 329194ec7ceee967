// Signals for the command. The first Ctrl-C (SIGINT) asks the running algorithm to stop
// through the component's cancel path (IMCAlgorithm::Cancel, and the cancel query the
// algorithm polls) and the command checks IsCancelled between its steps; a second Ctrl-C,
// SIGTERM or SIGHUP ends the process at once with 128 + the signal, after removing the
// temporary files of the outputs not yet in place (common/atomicfile.h).
//
// The signals are taken by a watcher thread with sigtimedwait rather than by a handler, so
// the cancel call and the removal run as ordinary code. They are blocked in the thread that
// makes the watcher and so in every thread started after it (the thread factory's workers):
// create the watcher before any other thread.
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
    //! The work is done and its outputs are in place: a Ctrl-C from now on has nothing left to
    //! stop and is not acknowledged. Call inside the OutputCommitScope of the last outputs, so
    //! an interrupt comes either before the commit (and the command can still refuse it) or
    //! after it.
    void Finish() { fbFinished.store(true); }

private:
    void Watch();

    std::atomic<bool> fbInterrupted{false};         //!< an interrupt came
    std::atomic<bool> fbStop{false};                //!< the watcher should end
    std::atomic<bool> fbFinished{false};            //!< the work's outputs are in place
    std::mutex fMutex;                              //!< guards fpTarget
    MCCommon_800::IMCAlgorithm* fpTarget = nullptr; //!< cancelled on interrupt, not owned
    bool fbMasked = false;                          //!< the signals were blocked here
    std::thread fWatcher;                           //!< waits for the signals
};

} // namespace MCHost
