#include "mccommon/hostinterfaces.h"

namespace MCCommon_800 {

MCMemoryRecordIter::MCMemoryRecordIter(std::vector<MCXML_800::Record> records)
    : fRecords(std::move(records)) {}

const MCXML_800::Record* MCMemoryRecordIter::NextRecord() {
    if (fNext >= fRecords.size()) {
        return nullptr;
    }
    return &fRecords[fNext++];
}

int MCMemoryRecordIter::Restart() {
    fNext = 0;
    ++fPasses;
    return 0;
}

} // namespace MCCommon_800
