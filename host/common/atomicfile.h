// Output files that appear whole or not at all: the text is written to a temporary file in the
// destination's folder and renamed over the destination only when everything was written, so
// an interrupted or failed run never leaves a half-written plan or case file behind.
#pragma once

#include <fstream>
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

//! Writes `text` to `path` through an AtomicFileWriter. False with `error` set on failure.
bool WriteFileAtomically(const std::string& path, const std::string& text, std::string& error);

} // namespace MCHost
