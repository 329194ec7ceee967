// A one-line progress bar on standard error for the long steps of the command (reading the
// data file, the passes of the fitting). It draws only when standard error is a terminal, so
// redirected output and logs stay clean.
#pragma once

#include <cstdint>
#include <ostream>
#include <string>

namespace MCHost {

class ProgressBar {
public:
    //! A bar that draws when `enabled` and standard error is a terminal.
    explicit ProgressBar(bool enabled = true);
    ~ProgressBar();
    ProgressBar(const ProgressBar&) = delete;
    ProgressBar& operator=(const ProgressBar&) = delete;

    //! Shows `label` with `done` of `total` (bytes, records); redraws only when the shown
    //! percentage or the label changes.
    void Show(const std::string& label, std::uint64_t done, std::uint64_t total);
    //! Clears the line.
    void Clear();
    bool IsActive() const { return fbActive; }

private:
    bool fbActive;          //!< drawing on a terminal
    bool fbShown = false;   //!< a bar is on the line
    int fLastPercent = -1;  //!< percentage last drawn
    std::string fLastLabel; //!< label last drawn
};

//! For a command's `catch (...)`: clears `progress` and prints the exception being handled as
//! one "mcsim: ..." line on `err` ("out of memory" for std::bad_alloc, the message of any
//! other std::exception). Returns the command's exit status: 2 for a UsageError, else 1.
int ReportCommandFailure(ProgressBar& progress, std::ostream& err);

} // namespace MCHost
