#include "cli/interrupt.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
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
        if (::sigtimedwait(&set, nullptr, &wait) != SIGINT || fbStop.load()) {
            continue;
        }
        if (fbInterrupted.exchange(true)) {
            Say("\nmcsim: interrupted again, stopping now\n");
            std::_Exit(130);
        }
        Say("\nmcsim: interrupted, stopping (press Ctrl-C again to quit at once)\n");
        std::lock_guard<std::mutex> guard(fMutex);
        if (fpTarget) {
            fpTarget->Cancel();
        }
    }
}

} // namespace MCHost
