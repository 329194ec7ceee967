#include "cli/interrupt.h"

#include "cli/commandline.h"
#include "common/atomicfile.h"

#include <cerrno>
#include <csignal>
#include <ctime>

#include <pthread.h>
#include <unistd.h>

namespace MCHost {

namespace {

void Say(const char* text) {
    std::size_t n = 0;
    while (text[n] != '\0') {
        ++n;
    }
    ssize_t ignored = ::write(STDERR_FILENO, text, n);
    static_cast<void>(ignored);
}

sigset_t InterruptSet() {
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGINT);
    sigaddset(&set, SIGTERM);
    sigaddset(&set, SIGHUP);
    return set;
}

} // namespace

InterruptWatcher::InterruptWatcher() {
    const sigset_t set = InterruptSet();
    fbMasked = ::pthread_sigmask(SIG_BLOCK, &set, nullptr) == 0;
    if (fbMasked) {
        fWatcher = std::thread([this] { Watch(); });
    }
}

InterruptWatcher::~InterruptWatcher() {
    fbStop.store(true);
    if (fWatcher.joinable()) {
        // Wake the watcher at once rather than at the end of its wait (up to 0.1 s added to
        // every command's exit): a SIGINT sent to that thread alone, which it takes as the
        // stop since fbStop is set.
        ::pthread_kill(fWatcher.native_handle(), SIGINT);
        fWatcher.join();
    }
    if (fbMasked) {
        const sigset_t set = InterruptSet();
        ::pthread_sigmask(SIG_UNBLOCK, &set, nullptr);
    }
}

void InterruptWatcher::SetTarget(MCCommon_800::IMCAlgorithm* algorithm) {
    std::lock_guard<std::mutex> guard(fMutex);
    fpTarget = algorithm;
}

void InterruptWatcher::Watch() {
    const sigset_t set = InterruptSet();
    const timespec wait{0, 100 * 1000 * 1000};
    while (!fbStop.load()) {
        const int caught = ::sigtimedwait(&set, nullptr, &wait);
        if (caught <= 0 || fbStop.load()) {
            continue;
        }
        if (caught == SIGTERM) {
            RemoveUncommittedFilesAndExit(ExitStatus::kTerminated,
                                          "\nmcsim: terminated (SIGTERM); no unfinished output "
                                          "file is left\n");
        }
        if (caught == SIGHUP) {
            RemoveUncommittedFilesAndExit(ExitStatus::kHangup,
                                          "\nmcsim: hangup (SIGHUP); no unfinished output file "
                                          "is left\n");
        }
        if (fbInterrupted.load()) {
            RemoveUncommittedFilesAndExit(ExitStatus::kInterrupted,
                                          "\nmcsim: interrupted again, stopping now\n");
        }
        {
            // An interrupt during the last outputs' renames waits for them; after them the
            // work is done and there is nothing to stop.
            OutputCommitScope commits;
            if (fbFinished.load()) {
                continue;
            }
            fbInterrupted.store(true);
        }
        Say("\nmcsim: interrupted, stopping (press Ctrl-C again to quit at once)\n");
        std::lock_guard<std::mutex> guard(fMutex);
        if (fpTarget) {
            fpTarget->Cancel();
        }
    }
}

} // namespace MCHost
