#include "common/atomicfile.h"

#include "common/hosterror.h"

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>

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

} // namespace

AtomicFileWriter::AtomicFileWriter(std::string path)
    : fPath(std::move(path)), fTempPath(TemporaryName(fPath)) {
    fStream.open(fTempPath, std::ios::out | std::ios::trunc | std::ios::binary);
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
