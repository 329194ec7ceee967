#include "mcthread/mcthread.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <stdexcept>
#include <thread>

using namespace MCThread_800;

namespace {

//! Counts its runs and the peak number of tasks running at once.
struct CountingTask : IMCThreadTask {
    CountingTask(std::atomic<int>& r, std::atomic<int>& p) : running(&r), peak(&p) {}
    void RunTask() override {
        const int now = ++*running;
        int seen = peak->load();
        while (now > seen && !peak->compare_exchange_weak(seen, now)) {
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
        ++runs;
        --*running;
    }
    std::atomic<int>* running;
    std::atomic<int>* peak;
    int runs = 0;
};

struct ThrowingTask : IMCThreadTask {
    void RunTask() override { throw std::runtime_error("task failed"); }
};

template <class Task> std::vector<IMCThreadTask*> Pointers(std::vector<Task>& tasks) {
    std::vector<IMCThreadTask*> ptrs;
    for (auto& t : tasks) {
        ptrs.push_back(&t);
    }
    return ptrs;
}

} // namespace

TEST(ThreadGroup, RunsEveryTaskOnceAndNeverMoreThanN) {
    MCStdThreadFactory factory;
    for (int n : {1, 2, 3}) {
        std::atomic<int> running{0};
        std::atomic<int> peak{0};
        std::vector<CountingTask> tasks(12, CountingTask(running, peak));
        std::vector<IMCThreadTask*> ptrs = Pointers(tasks);
        ptrs.insert(ptrs.begin() + 5, nullptr); // skipped, not an end mark
        factory.CreateThreadGroup(n)->Run(ptrs);
        for (const auto& t : tasks) {
            EXPECT_EQ(t.runs, 1);
        }
        EXPECT_LE(peak.load(), n);
        EXPECT_EQ(running.load(), 0);
    }
}

TEST(ThreadGroup, TaskExceptionReachesCallerAfterAllFinish) {
    std::atomic<int> running{0};
    std::atomic<int> peak{0};
    std::vector<CountingTask> tasks(4, CountingTask(running, peak));
    ThrowingTask bad;
    std::vector<IMCThreadTask*> ptrs = Pointers(tasks);
    ptrs.insert(ptrs.begin(), &bad);
    EXPECT_THROW(MCStdThreadFactory().CreateThreadGroup(2)->Run(ptrs), std::runtime_error);
    for (const auto& t : tasks) {
        EXPECT_EQ(t.runs, 1);
    }
}

TEST(ThreadGroup, LockSerialisesAndGuardAcceptsNull) {
    MCStdThreadFactory factory;
    auto lock = factory.CreateLock();
    ASSERT_NE(lock, nullptr);
    long counter = 0;
    struct AddTask : IMCThreadTask {
        AddTask(IMCLock* l, long* c) : lock(l), counter(c) {}
        void RunTask() override {
            for (int i = 0; i < 10000; ++i) {
                MCLockGuard guard(lock);
                ++*counter;
            }
        }
        IMCLock* lock;
        long* counter;
    };
    std::vector<AddTask> tasks(4, AddTask(lock.get(), &counter));
    factory.CreateThreadGroup(4)->Run(Pointers(tasks));
    EXPECT_EQ(counter, 40000);
    MCLockGuard none(nullptr);
}
