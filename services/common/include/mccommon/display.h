// Diagnostic display primitives: each prints one labelled line to the current display stream
// (std::cout until redirected). Used only by the Display operations of the component.
#pragma once

#include <ostream>
#include <string>
#include <vector>

namespace MCDisplay_800 {

//! The current display stream.
std::ostream* GetOutStream();
//! Redirects the display stream to `os` (null restores std::cout); returns the previous one.
std::ostream* SetOutStream(std::ostream* os);

void DisplayText(const std::string& text);
void DisplayB(const std::string& label, bool value);
void DisplayI(const std::string& label, long long value);
void DisplayD(const std::string& label, double value);
void DisplayS(const std::string& label, const std::string& value);
void DisplayDV(const std::string& label, const std::vector<double>& values);
void DisplayIV(const std::string& label, const std::vector<int>& values);
void DisplaySV(const std::string& label, const std::vector<std::string>& values);
void DisplayDVV(const std::string& label, const std::vector<std::vector<double>>& values);
void DisplaySVV(const std::string& label, const std::vector<std::vector<std::string>>& values);

//! Prints `start` now and `end` when it goes out of scope: the frame of one Display.
class DisplayFrame {
public:
    DisplayFrame(std::string start, std::string end);
    ~DisplayFrame();
    DisplayFrame(const DisplayFrame&) = delete;
    DisplayFrame& operator=(const DisplayFrame&) = delete;

private:
    std::string fEnd; //!< the closing line
};

//! Redirects the display stream to `os` for its lifetime, then restores the previous stream.
class ScopedOutStream {
public:
    explicit ScopedOutStream(std::ostream& os) : fPrevious(SetOutStream(&os)) {}
    ~ScopedOutStream() { SetOutStream(fPrevious); }
    ScopedOutStream(const ScopedOutStream&) = delete;
    ScopedOutStream& operator=(const ScopedOutStream&) = delete;

private:
    std::ostream* fPrevious; //!< stream to restore
};

} // namespace MCDisplay_800
