#include "common/atomicfile.h"

#include "common/hosterror.h"

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <set>

#include <unistd.h>

namespace MCHost {

namespace {

//! A name beside `path` that no other writer of this process uses: the process id keeps
//! concurrent runs apart, the counter keeps writers of one run apart.
std::string TemporaryName(const std::string& path) {
    static std::atomic<unsigned> counter{0};
    return path + ".tmp." + std::to_string(static_cast<long>(::getpid())) + "." +
           std::to_string(counter.fetch_add(1));
}

//! Guards the renames of a commit and the set of uncommitted temporary files. Recursive: a
//! writer's Commit takes it again inside a command's OutputCommitScope.
std::recursive_mutex& CommitMutex() {
    static std::recursive_mutex mutex;
    return mutex;
}

//! The temporary files of the writers not yet committed or aborted.
std::set<std::string>& Uncommitted() {
    static std::set<std::string> files;
    return files;
}

} // namespace

OutputCommitScope::OutputCommitScope() : fLock(CommitMutex()) {}

void RemoveUncommittedFilesAndExit(int status, const char* message) {
    // Kept locked until the process ends, so no rename follows the removal.
    CommitMutex().lock();
    for (const std::string& path : Uncommitted()) {
        std::remove(path.c_str());
    }
    std::fputs(message, stderr);
    std::fflush(stderr);
    std::_Exit(status);
}

AtomicFileWriter::AtomicFileWriter(std::string path)
    : fPath(std::move(path)), fTempPath(TemporaryName(fPath)) {
    {
        std::lock_guard<std::recursive_mutex> guard(CommitMutex());
        fStream.open(fTempPath, std::ios::out | std::ios::trunc | std::ios::binary);
        if (fStream.is_open()) {
            Uncommitted().insert(fTempPath);
        }
    }
    if (!fStream.is_open()) {
        fError = LocatedMessage(fPath, 0,
                                std::string("cannot create the file: ") + std::strerror(errno));
        fbDone = true;
    }
}

AtomicFileWriter::~AtomicFileWriter() {
    Abort();
}

bool AtomicFileWriter::Commit() {
    if (fbDone) {
        if (fError.empty()) {
            fError = LocatedMessage(fPath, 0, "the file was already closed");
        }
        return false;
    }
    fbDone = true;
    fStream.flush();
    const bool written = fStream.good();
    fStream.close();
    std::lock_guard<std::recursive_mutex> guard(CommitMutex());
    Uncommitted().erase(fTempPath);
    if (!written || fStream.fail()) {
        fError = LocatedMessage(fPath, 0, "writing the file failed (disk full?)");
        std::remove(fTempPath.c_str());
        return false;
    }
    if (std::rename(fTempPath.c_str(), fPath.c_str()) != 0) {
        fError = LocatedMessage(fPath, 0,
                                std::string("cannot replace the file: ") + std::strerror(errno));
        std::remove(fTempPath.c_str());
        return false;
    }
    return true;
}

void AtomicFileWriter::Abort() {
    if (fbDone) {
        return;
    }
    fbDone = true;
    fStream.close();
    std::lock_guard<std::recursive_mutex> guard(CommitMutex());
    Uncommitted().erase(fTempPath);
    std::remove(fTempPath.c_str());
}

bool WriteFileAtomically(const std::string& path, const std::string& text, std::string& error) {
    AtomicFileWriter writer(path);
    if (!writer.IsOpen()) {
        error = writer.GetError();
        return false;
    }
    writer.GetStream().write(text.data(), static_cast<std::streamsize>(text.size()));
    if (!writer.Commit()) {
        error = writer.GetError();
        return false;
    }
    return true;
}

} // namespace MCHost
