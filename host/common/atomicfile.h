// Output files that appear whole or not at all: the text is written to a temporary file in the
// destination's folder and renamed over the destination only when everything was written, so
// an interrupted or failed run never leaves a half-written plan or case file behind.
//
// The temporary files of the writers alive in the process are known, so a signal that ends
// the process at once (SIGTERM, SIGHUP, a second Ctrl-C) removes them too; a group of outputs
// renamed inside one OutputCommitScope is left whole or not at all by such a signal.
#pragma once

#include <fstream>
#include <mutex>
#include <string>

namespace MCHost {

//! A file being written under a temporary name until Commit renames it to its destination.
//! Destroying an uncommitted writer removes the temporary file.
class AtomicFileWriter {
public:
    //! Opens a new temporary file beside `path`; IsOpen tells whether that worked.
    explicit AtomicFileWriter(std::string path);
    ~AtomicFileWriter();
    AtomicFileWriter(const AtomicFileWriter&) = delete;
    AtomicFileWriter& operator=(const AtomicFileWriter&) = delete;

    bool IsOpen() const { return fStream.is_open(); }
    //! The stream to write to.
    std::ostream& GetStream() { return fStream; }
    //! Flushes and closes the temporary file and renames it to the destination. False, with
    //! the temporary file removed and GetError set, when any write or the rename failed.
    bool Commit();
    //! Closes and removes the temporary file; the destination is left as it was.
    void Abort();
    //! What went wrong ("" when nothing did).
    const std::string& GetError() const { return fError; }
    const std::string& GetPath() const { return fPath; }

private:
    std::string fPath;     //!< destination
    std::string fTempPath; //!< temporary file beside it
    std::ofstream fStream; //!< open on the temporary file
    bool fbDone = false;   //!< committed or aborted
    std::string fError;    //!< failure message
};

//! While alive, holds back RemoveUncommittedFilesAndExit of other threads, so the renames of a
//! group of outputs (done inside the scope) all happen before the process can end.
class OutputCommitScope {
public:
    OutputCommitScope();
    OutputCommitScope(const OutputCommitScope&) = delete;
    OutputCommitScope& operator=(const OutputCommitScope&) = delete;

private:
    std::unique_lock<std::recursive_mutex> fLock; //!< the process's commit lock
};

//! For the signal watcher: waits for any OutputCommitScope of another thread to end, removes
//! the temporary file of every writer not yet committed or aborted, writes `message` to
//! standard error and ends the process with `status` (no destructors run).
[[noreturn]] void RemoveUncommittedFilesAndExit(int status, const char* message);

//! Writes `text` to `path` through an AtomicFileWriter. False with `error` set on failure.
bool WriteFileAtomically(const std::string& path, const std::string& text, std::string& error);

} // namespace MCHost
