#include "component/mcspassert.h"

#include <atomic>

namespace MCMCSP_800 {

namespace {

thread_local std::string tLastAssertion;

void RecordAssertion(const char* text, const char* /*file*/, int /*line*/) {
    tLastAssertion = text ? text : "";
}

std::atomic<AssertionHandler> gHandler{&RecordAssertion};

} // namespace

AssertionHandler SetAssertionHandler(AssertionHandler handler) {
    return gHandler.exchange(handler ? handler : &RecordAssertion);
}

std::string GetLastAssertion() { return tLastAssertion; }

void ClearLastAssertion() { tLastAssertion.clear(); }

void ReportAssertion(const char* text, const char* file, int line) {
    RecordAssertion(text, file, line);
    const AssertionHandler handler = gHandler.load();
    if (handler != &RecordAssertion) {
        handler(text, file, line);
    }
}

} // namespace MCMCSP_800
