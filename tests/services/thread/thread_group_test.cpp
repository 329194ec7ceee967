#include "mcthread/mcthread.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <stdexcept>
#include <thread>

using namespace MCThread_800;

namespace {

struct CountingTask : IMCThreadTask {
    std::atomic<int>* running;
    std::atomic<int>* peak;
    int runs = 0;
    void RunTask() override {
        const int now = ++*running;
        int seen = peak->load();
        while (now > seen && !peak->compare_exchange_weak(seen, now)) {
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
        ++runs;
        --*running;
    }
};

struct ThrowingTask : IMCThreadTask {
    void RunTask() override { throw std::runtime_error("task failed"); }
};

} // namespace

TEST(ThreadGroup, RunsEveryTaskOnceAndNeverMoreThanN) {
    MCStdThreadFactory factory;
    for (int n : {1, 2, 3}) {
        std::atomic<int> running{0};
        std::atomic<int> peak{0};
        std::vector<CountingTask> tasks(12);
        std::vector<IMCThreadTask*> ptrs;
        for (auto& t : tasks) {
            t.running = &running;
            t.peak = &peak;
            ptrs.push_back(&t);
        }
        ptrs.push_back(nullptr);
        factory.CreateThreadGroup(n)->Run(ptrs);
        for (const auto& t : tasks) {
            EXPECT_EQ(t.runs, 1);
        }
        EXPECT_LE(peak.load(), n);
        EXPECT_EQ(running.load(), 0);
    }
}

TEST(ThreadGroup, TaskExceptionReachesCallerAfterAllFinish) {
    MCStdThreadFactory factory;
    std::atomic<int> running{0};
    std::atomic<int> peak{0};
    std::vector<CountingTask> tasks(4);
    ThrowingTask bad;
    std::vector<IMCThreadTask*> ptrs{&bad};
    for (auto& t : tasks) {
        t.running = &running;
        t.peak = &peak;
        ptrs.push_back(&t);
    }
    EXPECT_THROW(factory.CreateThreadGroup(2)->Run(ptrs), std::runtime_error);
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
        IMCLock* lock;
        long* counter;
        void RunTask() override {
            for (int i = 0; i < 10000; ++i) {
                MCLockGuard guard(lock);
                ++*counter;
            }
        }
    };
    std::vector<AddTask> tasks(4, AddTask{});
    std::vector<IMCThreadTask*> ptrs;
    for (auto& t : tasks) {
        t.lock = lock.get();
        t.counter = &counter;
        ptrs.push_back(&t);
    }
    factory.CreateThreadGroup(4)->Run(ptrs);
    EXPECT_EQ(counter, 40000);
    MCLockGuard none(nullptr);
}
