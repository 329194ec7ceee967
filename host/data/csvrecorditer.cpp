#include "data/csvrecorditer.h"

#include "common/hosterror.h"

#include <filesystem>
#include <system_error>

namespace MCHost {

namespace {

//! Rows between two progress reports.
constexpr std::int64_t kProgressRows = 4096;

} // namespace

CsvRecordIter::CsvRecordIter(const DataDictionary& dictionary)
    : fDictionary(dictionary), fbCached(dictionary.HasCache()),
      fRecord(dictionary.GetFields().size()) {
    if (fbCached) {
        fFileBytes = dictionary.GetFileBytes();
    }
}

bool CsvRecordIter::Open() {
    fbOpened = true;
    fpReader.reset();
    fIn.close();
    fIn.clear();
    const std::string& path = fDictionary.GetPath();
    fIn.open(path, std::ios::in | std::ios::binary);
    if (!fIn.is_open()) {
        fError = LocatedMessage(
            path, 0, "cannot open the data file again for pass " + std::to_string(fPass));
        return false;
    }
    std::error_code ec;
    fFileBytes = std::filesystem::file_size(path, ec);
    fpReader = std::make_unique<CsvReader>(fIn, path, fDictionary.GetDelimiter(),
                                           fDictionary.HasDecimalComma());
    try {
        if (!fpReader->ReadRecord(fvCells)) {
            fError = LocatedMessage(path, 0, "the header row has gone (did the file change?)");
            return false;
        }
    } catch (const HostError& e) {
        fError = e.what();
        return false;
    }
    return true;
}

void CsvRecordIter::ReadAhead() {
    if (fbAhead || fbEnd || !fError.empty()) {
        return;
    }
    if (fbCached) {
        if (fNextRow < fDictionary.GetNRows()) {
            fbAhead = true;
        } else {
            fbEnd = true;
            Report();
        }
        return;
    }
    if (!fbOpened && !Open()) {
        return;
    }
    try {
        if (fpReader->ReadRecord(fvCells)) {
            fbAhead = true;
            fRowLine = fpReader->GetRecordLine();
        } else {
            fbEnd = true;
            Report();
        }
    } catch (const HostError& e) {
        fError = e.what();
    } catch (const std::exception& e) {
        fError = LocatedMessage(fDictionary.GetPath(), 0, e.what());
    }
}

bool CsvRecordIter::HasMore() {
    ReadAhead();
    // A failure is reported as a record that cannot be fetched.
    return fbAhead || !fError.empty();
}

const MCXML_800::Record* CsvRecordIter::NextRecord() {
    ReadAhead();
    if (!fError.empty() || !fbAhead) {
        return nullptr;
    }
    fbAhead = false;
    if (fbCached) {
        fDictionary.GetCachedRow(fNextRow++, fRecord);
        return Counted();
    }
    try {
        fDictionary.ConvertRow(fvCells, fRowLine, fRecord);
    } catch (const HostError& e) {
        fError = e.what();
        return nullptr;
    } catch (const std::exception& e) {
        fError = LocatedMessage(fDictionary.GetPath(), fRowLine, e.what());
        return nullptr;
    }
    return Counted();
}

const MCXML_800::Record* CsvRecordIter::Counted() {
    ++fNRead;
    if (fNRead % kProgressRows == 0) {
        Report();
    }
    return &fRecord;
}

int CsvRecordIter::Restart() {
    ++fPass;
    fNRead = 0;
    fbAhead = false;
    fbEnd = false;
    fError.clear();
    if (fbCached) {
        fNextRow = 0;
        return 0;
    }
    return Open() ? 0 : -1;
}

void CsvRecordIter::Report() {
    if (!fProgress) {
        return;
    }
    if (fbCached) {
        const std::int64_t nRows = fDictionary.GetNRows();
        const std::uint64_t done =
            fNextRow >= nRows ? fFileBytes
                              : static_cast<std::uint64_t>(static_cast<double>(fFileBytes) *
                                                           static_cast<double>(fNextRow) /
                                                           static_cast<double>(nRows));
        fProgress(fPass, done, fFileBytes);
    } else if (fpReader) {
        fProgress(fPass, fpReader->GetBytesRead(), fFileBytes);
    }
}

} // namespace MCHost
