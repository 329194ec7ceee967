// The record layer of CSV files: splits a byte stream into records of fields following
// RFC 4180 (Shafranovich, 2005), one record at a time, so a file of any size is read in memory
// proportional to its longest record.
//
// Accepted beyond the RFC: line ends LF, CRLF or a lone CR (each counts as one line); a UTF-8
// byte-order mark at the start; a bare quote inside an unquoted field, kept as a character;
// empty lines between records, skipped. Refused, with the file and line in the message: a
// quoted field that never closes, a character other than a delimiter or a line end right
// after a closing quote, and a field longer than kMaxFieldBytes (almost always an unbalanced
// quote swallowing the rest of the file).
#pragma once

#include <cstdint>
#include <istream>
#include <string>
#include <vector>

namespace MCHost {

class CsvReader {
public:
    //! The longest field accepted, in bytes.
    static constexpr std::size_t kMaxFieldBytes = 1u << 20;

    //! Reads from `in` (which must outlive the reader), naming `fileName` in messages. A
    //! byte-order mark at the current position of `in` is skipped.
    CsvReader(std::istream& in, std::string fileName, char delimiter = ',');

    //! Reads the next record into `fields` (cleared first). False at the end of the input.
    //! Throws HostError for a malformed record.
    bool ReadRecord(std::vector<std::string>& fields);

    //! The line on which the last record read began (from 1).
    long GetRecordLine() const { return fRecordLine; }
    //! Bytes consumed from the stream since construction, the byte-order mark included.
    std::uint64_t GetBytesRead() const { return fBytesRead; }
    const std::string& GetFileName() const { return fFileName; }

private:
    //! The next byte as 0..255, or -1 at the end of the input.
    int Next();
    //! The next byte without consuming it, or -1.
    int Peek();
    //! Consumes the LF of a CRLF pair after `c` and counts the line end.
    void EndLine(int c);
    //! Appends `c` to `field`, refusing fields beyond kMaxFieldBytes.
    void Append(std::string& field, int c, long fieldLine);

    std::streambuf* fpBuf;        //!< the stream's buffer, read byte by byte
    std::string fFileName;        //!< named in messages
    char fDelimiter;              //!< field separator
    long fLine = 1;               //!< current line
    long fRecordLine = 0;         //!< line where the last record began
    std::uint64_t fBytesRead = 0; //!< bytes consumed
};

} // namespace MCHost
