// Ctrl-C for the command: the watcher turns SIGINT into one Cancel of the running algorithm,
// and its own shutdown, which wakes it with a signal, is not taken for an interrupt.
#include "cli/interrupt.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <csignal>
#include <thread>

#include <unistd.h>

namespace {

using MCCommon_800::MCStatus;

//! An algorithm that only counts its Cancel calls.
class CancelCounter : public MCCommon_800::IMCAlgorithm {
public:
    MCStatus BuildModel(MCCommon_800::MultiPassRecordIter&,
                        MCCommon_800::MultiPassRecordIter*) override {
        return MCStatus();
    }
    bool IsModelBuilt() const override { return false; }
    MCStatus Score(const MCXML_800::Record&, std::vector<double>&,
                   std::vector<std::vector<double>>&) const override {
        return MCStatus();
    }
    MCStatus ExportModel(std::ostream&, MCXML_800::MCApplicInfo4XML*) override {
        return MCStatus();
    }
    MCStatus GetStatus() const override { return MCStatus(); }
    void SetProgressListener(MCCommon_800::ProgressListener*) override {}
    void SetCancelPtr(MCCommon_800::MCQueryCancel*) override {}
    void Cancel() override { ++fNCancels; }
    std::string GetComponentVersion() const override { return std::string(); }
    const std::vector<MCStatus>& GetWarnings() const override { return fWarnings; }
    void Display(std::ostream&) const override {}

    std::atomic<int> fNCancels{0};

private:
    std::vector<MCStatus> fWarnings;
};

TEST(InterruptWatcher, SigintStopsTheTargetOnceAndShutdownIsNoInterrupt) {
    CancelCounter algorithm;
    {
        MCHost::InterruptWatcher watcher;
        watcher.SetTarget(&algorithm);
        ASSERT_EQ(::kill(::getpid(), SIGINT), 0);
        // The watcher takes the signal on its own thread; wait for it (bounded, not timed).
        for (int i = 0; i < 500 && !watcher.IsCancelled(); ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        EXPECT_TRUE(watcher.IsCancelled());
        watcher.SetTarget(nullptr);
    }
    EXPECT_EQ(algorithm.fNCancels.load(), 1);

    // A watcher that saw no interrupt ends without cancelling anything, and the signal that
    // woke it is not left pending for the process (which would end the test run).
    CancelCounter quiet;
    {
        MCHost::InterruptWatcher watcher;
        watcher.SetTarget(&quiet);
        EXPECT_FALSE(watcher.IsCancelled());
    }
    EXPECT_EQ(quiet.fNCancels.load(), 0);
}

} // namespace
