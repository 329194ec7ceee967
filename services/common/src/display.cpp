#include "mccommon/display.h"

#include <atomic>
#include <iostream>

namespace MCDisplay_800 {

namespace {

std::atomic<std::ostream*> gOutStream{nullptr};

std::ostream& Out() {
    std::ostream* os = gOutStream.load();
    return os ? *os : std::cout;
}

template <typename T>
void PrintList(const std::string& label, const std::vector<T>& values) {
    std::ostream& os = Out();
    os << label;
    for (const T& v : values) {
        os << ' ' << v;
    }
    os << '\n';
}

} // namespace

std::ostream* GetOutStream() { return &Out(); }

std::ostream* SetOutStream(std::ostream* os) {
    std::ostream* previous = gOutStream.exchange(os);
    return previous ? previous : &std::cout;
}

void DisplayText(const std::string& text) { Out() << text << '\n'; }
void DisplayB(const std::string& label, bool value) {
    Out() << label << ' ' << (value ? "true" : "false") << '\n';
}
void DisplayI(const std::string& label, long long value) { Out() << label << ' ' << value << '\n'; }
void DisplayD(const std::string& label, double value) { Out() << label << ' ' << value << '\n'; }
void DisplayS(const std::string& label, const std::string& value) {
    Out() << label << ' ' << value << '\n';
}
void DisplayDV(const std::string& label, const std::vector<double>& values) {
    PrintList(label, values);
}
void DisplayIV(const std::string& label, const std::vector<int>& values) {
    PrintList(label, values);
}
void DisplaySV(const std::string& label, const std::vector<std::string>& values) {
    PrintList(label, values);
}
void DisplayDVV(const std::string& label, const std::vector<std::vector<double>>& values) {
    DisplayText(label);
    for (const auto& row : values) {
        PrintList(" ", row);
    }
}
void DisplaySVV(const std::string& label, const std::vector<std::vector<std::string>>& values) {
    DisplayText(label);
    for (const auto& row : values) {
        PrintList(" ", row);
    }
}

DisplayFrame::DisplayFrame(std::string start, std::string end) : fEnd(std::move(end)) {
    DisplayText(start);
}

DisplayFrame::~DisplayFrame() { DisplayText(fEnd); }

} // namespace MCDisplay_800
