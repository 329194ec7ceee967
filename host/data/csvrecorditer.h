// The component's view of a CSV file: a MultiPassRecordIter over the rows of the file, each
// turned into a Record through the file's DataDictionary.
//
// When the dictionary kept the records' values while it read the file (HasCache), every pass
// is served from memory and the file is not touched again. Otherwise the file is read again for
// every pass, which keeps memory independent of the number of rows (one row and one record at a
// time); each pass then costs one read of the file, which the operating system's cache usually
// serves. Nothing here throws into the component: a row that cannot be read ends the pass
// with HasMore true and NextRecord null, and GetError tells the host what happened.
#pragma once

#include "data/csvreader.h"
#include "data/datadictionary.h"
#include "mccommon/hostinterfaces.h"

#include <fstream>
#include <memory>
#include <string>
#include <vector>

namespace MCHost {

class CsvRecordIter : public MCCommon_800::MultiPassRecordIter {
public:
    //! Progress of the current pass: the pass number (from 1), bytes read, the file's size.
    //! A pass served from memory counts the rows handed out as that fraction of the file.
    using PassProgress =
        std::function<void(int pass, std::uint64_t bytesRead, std::uint64_t fileBytes)>;

    //! Iterates over the rows of `dictionary`'s file; the dictionary must outlive the
    //! iterator. Without the dictionary's cache, the file is opened at the first HasMore.
    explicit CsvRecordIter(const DataDictionary& dictionary);

    bool HasMore() override;
    //! The next record, or null when the row could not be read (GetError says why).
    const MCXML_800::Record* NextRecord() override;
    //! Starts the next pass from the first data row: 0 on success, -1 when the file cannot be
    //! opened again (never when the pass is served from memory).
    int Restart() override;

    //! Called every few thousand rows and at the end of each pass.
    void SetProgress(PassProgress progress) { fProgress = std::move(progress); }
    //! The message of the failure that ended a pass ("" when none).
    const std::string& GetError() const { return fError; }
    //! Passes begun (1 before any Restart).
    int GetPassCount() const { return fPass; }
    //! Records handed out in the current pass.
    std::int64_t GetRecordsRead() const { return fNRead; }

private:
    //! Opens the file and skips the header; false (with fError) on failure.
    bool Open();
    //! Reads the next row into fvCells unless one is waiting; sets fbAhead, fbEnd or fError.
    //! From the dictionary's cache: sets fbAhead or fbEnd.
    void ReadAhead();
    //! Counts the record about to be handed out and reports progress now and then.
    const MCXML_800::Record* Counted();
    void Report();

    const DataDictionary& fDictionary;   //!< the file and its fields
    const bool fbCached;                 //!< passes are served from the dictionary's cache
    std::int64_t fNextRow = 0;           //!< from the cache: the next row of this pass
    std::ifstream fIn;                   //!< the open file
    std::unique_ptr<CsvReader> fpReader; //!< reads fIn
    std::uint64_t fFileBytes = 0;        //!< the file's size, for progress
    std::vector<std::string> fvCells;    //!< the row read ahead
    long fRowLine = 0;                   //!< its line
    bool fbOpened = false;               //!< the file is open for this pass
    bool fbAhead = false;                //!< fvCells holds an unread row
    bool fbEnd = false;                  //!< the pass reached the end of the file
    std::string fError;                  //!< failure of this pass
    MCXML_800::Record fRecord;           //!< the record handed out
    int fPass = 1;                       //!< passes begun
    std::int64_t fNRead = 0;             //!< records handed out in this pass
    PassProgress fProgress;              //!< progress callback, may be empty
};

} // namespace MCHost
