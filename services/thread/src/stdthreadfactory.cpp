#include "mcthread/mcthread.h"

#include <algorithm>
#include <atomic>
#include <exception>
#include <mutex>
#include <thread>

namespace MCThread_800 {

namespace {

// Tasks are taken from a shared counter, so a thread that finishes early takes the next
// task; which thread runs a task does not matter because every task writes only its own
// results. The first exception a task throws is carried to the caller after all threads end.
class StdThreadGroup : public IMCThreadGroup {
public:
    explicit StdThreadGroup(int nThreads) : fNThreads(std::max(1, nThreads)) {}

    void Run(const std::vector<IMCThreadTask*>& tasks) override {
        std::atomic<std::size_t> next{0};
        std::exception_ptr firstError;
        std::mutex errorMutex;
        auto worker = [&]() {
            for (std::size_t i = next++; i < tasks.size(); i = next++) {
                if (!tasks[i]) {
                    continue;
                }
                try {
                    tasks[i]->RunTask();
                } catch (...) {
                    std::lock_guard<std::mutex> guard(errorMutex);
                    if (!firstError) {
                        firstError = std::current_exception();
                    }
                }
            }
        };
        const std::size_t nThreads = std::min<std::size_t>(static_cast<std::size_t>(fNThreads),
                                                           tasks.size());
        if (nThreads <= 1) {
            worker();
        } else {
            std::vector<std::thread> threads;
            threads.reserve(nThreads - 1);
            for (std::size_t t = 1; t < nThreads; ++t) {
                threads.emplace_back(worker);
            }
            worker();
            for (auto& th : threads) {
                th.join();
            }
        }
        if (firstError) {
            std::rethrow_exception(firstError);
        }
    }

private:
    int fNThreads; //!< most threads used at once
};

class StdLock : public IMCLock {
public:
    void Lock() override { fMutex.lock(); }
    void Unlock() override { fMutex.unlock(); }

private:
    std::mutex fMutex; //!< the lock
};

} // namespace

std::unique_ptr<IMCThreadGroup> MCStdThreadFactory::CreateThreadGroup(int nThreads) {
    return std::make_unique<StdThreadGroup>(nThreads);
}

std::unique_ptr<IMCLock> MCStdThreadFactory::CreateLock() { return std::make_unique<StdLock>(); }

} // namespace MCThread_800
