// Thread services: tasks, thread groups that run them, a lock, and the factory through which
// the host lends its threads to the component. The component never starts a thread itself.
#pragma once

#include <memory>
#include <vector>

namespace MCThread_800 {

//! A unit of parallel work. RunTask writes only the task's own results.
class IMCThreadTask {
public:
    virtual ~IMCThreadTask() = default;
    virtual void RunTask() = 0;
};

//! Runs a list of tasks on at most its number of threads.
class IMCThreadGroup {
public:
    virtual ~IMCThreadGroup() = default;
    //! Runs every task once and returns when all have finished. Null entries are skipped.
    virtual void Run(const std::vector<IMCThreadTask*>& tasks) = 0;
};

//! A mutual-exclusion lock lent by the host.
class IMCLock {
public:
    virtual ~IMCLock() = default;
    virtual void Lock() = 0;
    virtual void Unlock() = 0;
};

//! The host's factory of thread groups and locks.
class IMCThreadFactory {
public:
    virtual ~IMCThreadFactory() = default;
    //! A group running tasks on at most `nThreads` threads (at least one).
    virtual std::unique_ptr<IMCThreadGroup> CreateThreadGroup(int nThreads) = 0;
    //! A lock, or null when the host offers none.
    virtual std::unique_ptr<IMCLock> CreateLock() = 0;
};

//! A thread factory that the host also uses to iterate over data in parallel; for the
//! component it is a thread factory like any other.
class MCThreadIterFactory : public IMCThreadFactory {};

//! The standard factory: groups on std::thread, locks on std::mutex.
class MCStdThreadFactory : public MCThreadIterFactory {
public:
    std::unique_ptr<IMCThreadGroup> CreateThreadGroup(int nThreads) override;
    std::unique_ptr<IMCLock> CreateLock() override;
};

//! Holds `lock` locked for its lifetime; a null lock is allowed and does nothing.
class MCLockGuard {
public:
    explicit MCLockGuard(IMCLock* lock) : fpLock(lock) {
        if (fpLock) {
            fpLock->Lock();
        }
    }
    ~MCLockGuard() {
        if (fpLock) {
            fpLock->Unlock();
        }
    }
    MCLockGuard(const MCLockGuard&) = delete;
    MCLockGuard& operator=(const MCLockGuard&) = delete;

private:
    IMCLock* fpLock; //!< the lock held, not owned
};

} // namespace MCThread_800
