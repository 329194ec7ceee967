// The contract both algorithms meet toward the host, through a minimal algorithm built on the
// shared base, plus the factories and the status display functions.
#include "component/mcspcomponent.h"
#include "mccommon/display.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <sstream>
#include <thread>

using namespace MCMCSP_800;
using MCCommon_800::MCQueryCancel;
using MCCommon_800::MultiPassRecordIter;
using MCCommon_800::ProgressListener;
using MCCommon_800::ProgressReport;

namespace {

struct FakeResults {
    int fValue = 42; //!< something to point at
};

//! The smallest algorithm on the shared base: BuildModel either succeeds at once or, when
//! asked to wait, polls the cancel record the way the data passes do.
class TestAlgorithm : public MCAlgorithmCommon<TestAlgorithm> {
public:
    MCStatus BuildModel(MultiPassRecordIter& /*data*/, MultiPassRecordIter* /*other*/) override {
        fbStarted = true;
        bool cancelled = fCancelInfo.WillCancel();
        while (fbWaitForCancel && !cancelled) {
            std::this_thread::yield();
            cancelled = fCancelInfo.WillCancel();
        }
        if (cancelled) {
            fStatus = MCStatus(MCSPStatus::kCancelled, false);
            return fStatus;
        }
        fbModelBuilt = true;
        fStatus = MCStatus();
        return fStatus;
    }
    MCStatus GetOutputStats(FakeResults*& out) { return HandOutResults(&fResults, out); }
    void Display(std::ostream& /*os*/) const override {}

    void StoreProgressListener(ProgressListener* listener) { fpListener = listener; }
    void StoreCancelPointer(MCQueryCancel* cancel) { fpCancel = cancel; }

    bool fbWaitForCancel = false;           //!< BuildModel runs until cancelled
    std::atomic<bool> fbStarted{false};     //!< BuildModel has begun
    ProgressListener* fpListener = nullptr; //!< what the settings copy would hold
    MCQueryCancel* fpCancel = nullptr;      //!< what the settings copy would hold
    FakeResults fResults;                   //!< the owned results
};

class NullListener : public ProgressListener {
public:
    void Report(const ProgressReport& /*report*/) override {}
};

class HostCancel : public MCQueryCancel {
public:
    bool IsCancelled() const override { return fbCancelled; }
    bool fbCancelled = false; //!< the host's answer
};

} // namespace

// Results before a build are refused and the refusal is remembered as the status; the export
// checks the build, then the stream, and writes nothing.
TEST(AlgorithmContract, ResultsAndExportNeedABuildAndAGoodStream) {
    TestAlgorithm algorithm;
    FakeResults* out = &algorithm.fResults;
    EXPECT_EQ(algorithm.GetOutputStats(out).GetErrorCode(), MCSPStatus::kNoData);
    EXPECT_EQ(out, nullptr);
    EXPECT_EQ(algorithm.GetStatus().GetErrorCode(), MCSPStatus::kNoData);
    std::ostringstream good;
    EXPECT_EQ(algorithm.ExportModel(good, nullptr).GetErrorCode(), MCSPStatus::kModelNotBuilt);

    MCCommon_800::MCMemoryRecordIter data;
    ASSERT_TRUE(algorithm.BuildModel(data, nullptr).IsOK());
    EXPECT_TRUE(algorithm.GetOutputStats(out).IsOK());
    EXPECT_EQ(out, &algorithm.fResults);
    EXPECT_TRUE(algorithm.GetStatus().IsOK());
    std::ostringstream bad;
    bad.setstate(std::ios::badbit);
    EXPECT_EQ(algorithm.ExportModel(bad, nullptr).GetErrorCode(), MCSPStatus::kBadStream);
    MCXML_800::MCApplicInfo4XML info{"host", "1"};
    EXPECT_TRUE(algorithm.ExportModel(good, &info).IsOK());
    EXPECT_TRUE(good.str().empty());
    std::vector<double> scores;
    std::vector<std::vector<double>> sets;
    EXPECT_TRUE(algorithm.Score(MCXML_800::Record(), scores, sets).IsOK());
}

// Null pointers leave earlier ones in place; the host's cancel query reaches the cancel record.
TEST(AlgorithmContract, NullPointersLeaveEarlierOnesInPlace) {
    TestAlgorithm algorithm;
    NullListener listener;
    HostCancel cancel;
    algorithm.SetProgressListener(&listener);
    algorithm.SetCancelPtr(&cancel);
    algorithm.SetProgressListener(nullptr);
    algorithm.SetCancelPtr(nullptr);
    EXPECT_EQ(algorithm.fpListener, &listener);
    EXPECT_EQ(algorithm.fpCancel, &cancel);
    cancel.fbCancelled = true;
    MCCommon_800::MCMemoryRecordIter data;
    EXPECT_EQ(algorithm.BuildModel(data, nullptr).GetErrorCode(), MCSPStatus::kCancelled);
    EXPECT_FALSE(algorithm.IsModelBuilt());
}

TEST(AlgorithmContract, CancelFromAnotherThreadStopsTheBuild) {
    TestAlgorithm algorithm;
    algorithm.fbWaitForCancel = true;
    MCCommon_800::MCMemoryRecordIter data;
    auto build = std::async(std::launch::async,
                            [&algorithm, &data] { return algorithm.BuildModel(data, nullptr); });
    while (!algorithm.fbStarted) {
        std::this_thread::yield();
    }
    algorithm.Cancel();
    EXPECT_EQ(build.get().GetErrorCode(), MCSPStatus::kCancelled);
    EXPECT_FALSE(algorithm.IsModelBuilt());
}

TEST(StatusDisplay, PrintsTitleFlagAndCode) {
    std::ostringstream os;
    {
        MCDisplay_800::ScopedOutStream redirect(os);
        MCSPComponentDisplay_800::DisplayStatus("run", MCStatus(390002, false));
        MCSPComponentDisplay_800::DisplayVStatus("warnings",
                                                 {MCStatus(390004, true), MCStatus(390013, true)});
    }
    EXPECT_EQ(os.str().rfind("run\nIsError true\nerror code 390002\nrun\n", 0), 0u);
    EXPECT_NE(os.str().find("\nindex 1\nIsError false\nerror code 390013\nwarnings\n"),
              std::string::npos);
}
