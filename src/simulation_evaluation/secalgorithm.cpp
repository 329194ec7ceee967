#include "simulation_evaluation/secalgorithm.h"

#include "component/mcspassert.h"
#include "mccommon/display.h"
#include "simulation_common/secreporter.h"
#include "simulation_evaluation/secsimulator.h"

#include <algorithm>

namespace MCMCSP_800 {

namespace {

//! Records a host-driven evaluation spends on finding the chart ranges.
constexpr int kStartupRecords = 2000;

} // namespace

SECAlgorithm::SECAlgorithm(const SECSettings& settings, const SPCSettings& plan,
                           const MCXML_800::MCVarList& variables)
    : fSettings(settings), fPlan(plan), fpVarList(&variables),
      fpStream(std::make_unique<MCMath_800::MCURandom>(settings.GetSeed(), true, true, nullptr)),
      fCaseLimit(plan.GetMaxCases()), fThreadLimit(settings.GetMaxThreadNum()),
      fCacheLimit(settings.GetMemCacheKB()), fpThreadFactory(settings.GetThreadFactory()) {
    fCancelInfo.SetCancelPtr(settings.GetCancelPointer());
}

SECAlgorithm::~SECAlgorithm() {
    fvSimulators.clear(); // the simulators draw from the stream: they go first
    fpStream.reset();
}

void SECAlgorithm::StoreProgressListener(MCCommon_800::ProgressListener* listener) {
    fSettings.SetProgressListener(listener);
}

void SECAlgorithm::StoreCancelPointer(MCCommon_800::MCQueryCancel* cancel) {
    fSettings.SetCancelPointer(cancel);
}

// ---- Contract ---------------------------------------------------------------------------------

MCStatus SECAlgorithm::BuildModel(MCCommon_800::MultiPassRecordIter& trainData,
                                  MCCommon_800::MultiPassRecordIter* /*unused*/) {
    fWarnings.ClearWarnings();
    const bool hasData = trainData.HasMore();
    MCSP_ASSERT(hasData, "SECAlgorithm::BuildModel: the training iterator has data");
    if (!fStatus.IsOK()) {
        return fStatus;
    }
    MCStatus status;
    if (!hasData) {
        status = MCStatus(MCSPStatus::kNoData, false);
    }
    if (!status.IsError()) {
        const MCStatus valid = fSettings.IsValidSettings();
        if (valid.IsWarning()) {
            fWarnings.AddWarning(valid);
        } else if (valid.IsError()) {
            status = valid;
        }
        fWarnings.AddWarnings(fSettings.GetWarningMessages());
    }
    if (!status.IsError()) {
        fbModelBuilt = true;
    }
    fStatus = status;
    return status;
}

void SECAlgorithm::Display(std::ostream& os) const {
    MCDisplay_800::ScopedOutStream redirect(os);
    MCDisplay_800::DisplayFrame frame("SECAlgorithm display start", "SECAlgorithm display end");
    fSettings.Display(os);
    fpVarList->Display();
    for (const auto& simulator : fvSimulators) {
        if (simulator) {
            simulator->Display();
        }
    }
}

MCStatus SECAlgorithm::GetOutputStats(SECOutputStats*& out) {
    SECOutputStats* results = nullptr;
    if (fvSimulators.size() == 1 && fvSimulators[0]) {
        (void)fvSimulators[0]->GetOutputStats(results);
    }
    return HandOutResults(results, out);
}

MCStatus SECAlgorithm::GetOutputStats(std::vector<SECOutputStats*>& out) {
    out.assign(fvSimulators.size(), nullptr);
    for (std::size_t i = 0; i < fvSimulators.size(); ++i) {
        if (!fvSimulators[i]) {
            continue;
        }
        const MCStatus status = fvSimulators[i]->GetOutputStats(out[i]);
        if (status.IsError()) {
            fStatus = status;
            return status;
        }
    }
    return MCStatus();
}

// ---- Component-driven run ---------------------------------------------------------------------

std::unique_ptr<SECSimulator> SECAlgorithm::CreateMaster(int iter) {
    auto simulator = std::make_unique<SECSimulator>(&fSettings, &fPlan, fpVarList, iter,
                                                    fpStream.get(), -1.0, nullptr);
    simulator->SetCancelInfo(&fCancelInfo);
    return simulator;
}

MCStatus SECAlgorithm::SimulateData(MCXML_800::IMCSPScoreFactory* factory,
                                    MCXML_800::SECAppDataProcess* sink) {
    if (!fbModelBuilt) {
        return MCStatus(MCSPStatus::kModelNotBuilt, false);
    }
    fvSimulators.clear();
    fSimulatedCases.store(0, std::memory_order_relaxed);
    MCStatus status;
    for (int iter = 0; iter == 0 || (iter < fNIterations && !status.IsError()); ++iter) {
        std::unique_ptr<SECSimulator> master = CreateMaster(iter);
        if (iter > 0) {
            // An iteration that varies a fixed or categorical input draws its correlated
            // inputs as the first did: the correlation model is the same.
            (void)master->AdoptCorrelationModel(*fvSimulators.front());
        }
        status = RunIteration(*master, factory, sink);
        fWarnings.AddWarnings(master->GetWarnings());
        if (iter == 0) {
            fNIterations = master->GetNSensIterations();
        }
        fvSimulators.push_back(std::move(master));
    }
    fSettings.SetProgressListener(nullptr);
    fSettings.SetIterProgressListener(nullptr);
    fSettings.SetRecProgressListener(nullptr);
    fStatus = status;
    return status;
}

MCStatus SECAlgorithm::RunIteration(SECSimulator& master, MCXML_800::IMCSPScoreFactory* factory,
                                    MCXML_800::SECAppDataProcess* sink) {
    std::unique_ptr<MCThread_800::IMCLock> lock;
    MCStatus status;
    try {
        // 1-3. Preparation of the master: correlation model, score computer, records, targets.
        status = master.PrepareForSimulation();
        if (!status.IsError()) {
            status = master.CreateScoreComputer(factory);
        }
        if (!status.IsError()) {
            status = master.PrepareScoring();
        }
        if (status.IsError()) {
            return status;
        }
        // 4. The iteration's progress.
        MCCommon_800::ProgressListener* iterListener = fSettings.GetIterProgressListener();
        if (master.GetNSensIterations() > 1 && iterListener != nullptr) {
            SECReporter reporter;
            reporter.SetIterNum(master.GetIteration());
            iterListener->Report(reporter);
        }
        // 5. The pilot fixes the chart ranges.
        status = master.RunPilot();
        if (status.IsError()) {
            return status;
        }
        // 6. The sink learns the layout of the cases.
        if (sink != nullptr) {
            if (master.GetIteration() == 0) {
                sink->BeginData(master.GetTargetNames(), master.GetNProbabilities(),
                                master.GetNSensIterations());
            }
            if (fpThreadFactory != nullptr) {
                lock = fpThreadFactory->CreateLock();
            }
        }
        // 7. Worker threads: a sink without a lock, a stop criterion, or categorical targets of a
        //    score without a predicted field allow only one.
        int nThreads = (sink != nullptr && !lock) ? 1 : std::max(1, fThreadLimit);
        if (fPlan.GetStopCriteriaPointValueSize() > 0 || fPlan.GetStopCriteriaTailsSize() > 0) {
            nThreads = 1;
        }
        if (!master.HasPredictedField() && master.HasCategoricalTarget()) {
            nThreads = 1;
        }
        // 8-9. Quotas, and workers seeded from the master's stream in thread order.
        const int caseLimit = std::max(0, fCaseLimit);
        std::vector<std::unique_ptr<SECSimulator>> workers;
        std::vector<MCThread_800::IMCThreadTask*> tasks;
        for (int i = 0; i < nThreads; ++i) {
            std::unique_ptr<SECSimulator> worker = master.CreateWorker(fpStream->GetRandom());
            worker->SetCaseQuota(caseLimit / nThreads + (i < caseLimit % nThreads ? 1 : 0));
            if (nThreads == 1 && master.GetNSensIterations() == 1) {
                worker->SetRecordProgressListener(fSettings.GetRecProgressListener());
            }
            worker->SetProgressCounter(&fSimulatedCases);
            const MCStatus created = worker->CreateScoreComputer(factory);
            if (created.IsError()) {
                return created;
            }
            worker->SetSink(sink, lock.get());
            tasks.push_back(worker.get());
            workers.push_back(std::move(worker));
        }
        // 10. The thread group.
        if (fpThreadFactory != nullptr) {
            std::unique_ptr<MCThread_800::IMCThreadGroup> group =
                fpThreadFactory->CreateThreadGroup(nThreads);
            group->Run(tasks);
        } else {
            for (MCThread_800::IMCThreadTask* task : tasks) {
                task->RunTask();
            }
        }
        // 11. Cancellation.
        const bool cancelled = fCancelInfo.IsCancel();
        MCStatus workerStatus;
        for (const auto& worker : workers) {
            const MCStatus s = worker->GetStatus();
            if (s.IsError() && workerStatus.IsOK()) {
                workerStatus = s;
            }
        }
        // 12-13. Merge in thread order, then complete. The results of a cancelled run are
        //        completed too, so the host can show what was done.
        status = master.MergeStatsFromThreads(workers);
        workers.clear();
        SECOutputStats* results = nullptr;
        if (master.GetOutputStats(results).IsOK() && results != nullptr) {
            results->SetThreadsUsed(nThreads);
        }
        if (!status.IsError()) {
            status = master.CompleteStats();
        }
        master.ReleaseScoreComputer();
        if (cancelled) {
            status = MCStatus(MCSPStatus::kCancelled, false);
        } else if (!status.IsError() && workerStatus.IsError()) {
            // A worker whose preparation failed or whose attempts ran out delivered fewer cases
            // than asked: the run did not succeed although results exist.
            status = workerStatus;
        }
    } catch (...) {
        status = MCStatus(MCSPStatus::kLowExpectedOrException, false);
    }
    return status;
}

// ---- Host-driven run --------------------------------------------------------------------------

MCStatus SECAlgorithm::CreateHostSimulator(int iter) {
    std::unique_ptr<SECSimulator> simulator = CreateMaster(iter);
    if (iter > 0 && !fvSimulators.empty() && fvSimulators.front()) {
        (void)simulator->AdoptCorrelationModel(*fvSimulators.front());
    }
    MCStatus status = simulator->PrepareForSimulation();
    if (!status.IsError()) {
        status = simulator->PrepareGeneration();
    }
    fWarnings.AddWarnings(simulator->GetWarnings());
    if (fvSimulators.size() <= static_cast<std::size_t>(iter)) {
        fvSimulators.resize(static_cast<std::size_t>(iter) + 1);
    }
    fvSimulators[static_cast<std::size_t>(iter)] = std::move(simulator);
    return status;
}

MCStatus SECAlgorithm::PrepareGeneration(int iter) {
    MCStatus status;
    if (iter < 0) {
        fvSimulators.clear();
        status = CreateHostSimulator(0);
        fNIterations = fvSimulators[0]->GetNSensIterations();
        for (int i = 1; i < fNIterations && !status.IsError(); ++i) {
            status = CreateHostSimulator(i);
        }
    } else if (static_cast<std::size_t>(iter) >= fvSimulators.size() ||
               !fvSimulators[static_cast<std::size_t>(iter)]) {
        status = CreateHostSimulator(iter);
    }
    fStatus = status;
    return status;
}

int SECAlgorithm::ResolveIteration(int iter, bool complete) const {
    const int n = static_cast<int>(fvSimulators.size());
    if (n <= 1) {
        return 0;
    }
    int index = iter;
    if (iter < 0) {
        const long long block = static_cast<long long>(fCaseLimit) + kStartupRecords;
        const long long quotient = block > 0 ? fCaseCounter / block : 0;
        index = static_cast<int>(complete ? (fCaseCounter >= block ? quotient - 1 : 0) : quotient);
    }
    return std::clamp(index, 0, n - 1);
}

MCStatus SECAlgorithm::SimulatePredictors(std::vector<double>& values, int iter) {
    const int index = ResolveIteration(iter, false);
    if (static_cast<std::size_t>(index) >= fvSimulators.size() ||
        !fvSimulators[static_cast<std::size_t>(index)]) {
        return fStatus = MCStatus(MCSPStatus::kNoData, false);
    }
    const MCStatus status =
        fvSimulators[static_cast<std::size_t>(index)]->SimulatePredictors(values);
    ++fCaseCounter;
    return status;
}

MCStatus SECAlgorithm::PrepareEvaluation(int iter) {
    fRecordCounter = 0;
    const int index = iter < 0 ? ResolveIteration(iter, false) : iter;
    MCStatus status;
    if (static_cast<std::size_t>(index) >= fvSimulators.size() ||
        !fvSimulators[static_cast<std::size_t>(index)]) {
        status = CreateHostSimulator(index);
    }
    fNIterations = static_cast<int>(fvSimulators.size());
    if (!status.IsError()) {
        SECSimulator& simulator = *fvSimulators[static_cast<std::size_t>(index)];
        simulator.ResetCaseValues();
        status = simulator.PrepareTargetInfo();
    }
    fStatus = status;
    return status;
}

MCStatus SECAlgorithm::UpdateStatsForRecord(const std::vector<double>& predictors,
                                            const std::vector<double>& targets, int iter) {
    const int index = ResolveIteration(iter, false);
    if (static_cast<std::size_t>(index) >= fvSimulators.size() ||
        !fvSimulators[static_cast<std::size_t>(index)]) {
        return fStatus = MCStatus(MCSPStatus::kNoData, false);
    }
    const MCStatus status = fvSimulators[static_cast<std::size_t>(index)]->UpdateStatsForRecord(
        predictors, targets, fRecordCounter);
    ++fCaseCounter;
    ++fRecordCounter;
    if (status.IsError()) {
        fStatus = status;
    }
    return status;
}

MCStatus SECAlgorithm::CompleteEvaluation(int iter) {
    const int index = ResolveIteration(iter, true);
    if (static_cast<std::size_t>(index) >= fvSimulators.size() ||
        !fvSimulators[static_cast<std::size_t>(index)]) {
        return fStatus = MCStatus(MCSPStatus::kNoData, false);
    }
    fStatus = fvSimulators[static_cast<std::size_t>(index)]->CompleteStats();
    return fStatus;
}

} // namespace MCMCSP_800
