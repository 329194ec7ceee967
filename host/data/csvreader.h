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
//
// With a decimal comma, a field that reads as a number written with a comma for the decimal
// point ("-3,14", "2,5e3") is handed out with a point instead, so the layers above read numbers
// one way. GuessSeparator picks the separator of a file from its first rows when the user
// names none.
#pragma once

#include <cstdint>
#include <istream>
#include <string>
#include <string_view>
#include <vector>

namespace MCHost {

class CsvReader {
public:
    //! The longest field accepted, in bytes.
    static constexpr std::size_t kMaxFieldBytes = 1u << 20;
    //! Bytes taken from the stream at a time.
    static constexpr std::size_t kBufferBytes = 1u << 16;

    //! Reads from `in` (which must outlive the reader), naming `fileName` in messages. A
    //! byte-order mark at the current position of `in` is skipped. The reader takes the stream
    //! in blocks of kBufferBytes, so the stream's own position runs ahead of the records read.
    //! With `decimalComma`, numbers written with a decimal comma are handed out with a point.
    CsvReader(std::istream& in, std::string fileName, char delimiter = ',',
              bool decimalComma = false);

    //! Refuses records of more than `n` fields, as soon as the field after the n-th begins
    //! (so a huge record is never held whole). InputLimits' fields per record unless set.
    void SetMaxFields(std::size_t n) { fMaxFields = n; }

    //! Reads the next record into `fields`, which then holds exactly the record's fields (the
    //! strings already there are reused, so a loop over records allocates little). False, with
    //! `fields` empty, at the end of the input. Throws HostError for a malformed record.
    bool ReadRecord(std::vector<std::string>& fields);

    //! The line on which the last record read began (from 1).
    long GetRecordLine() const { return fRecordLine; }
    //! Bytes of the input that the records read so far took up, the byte-order mark included
    //! (bytes read ahead into the buffer do not count).
    std::uint64_t GetBytesRead() const { return fBytesFetched - (fEnd - fPos); }
    const std::string& GetFileName() const { return fFileName; }

private:
    //! Refills the buffer once it is used up; false at the end of the input.
    bool Fill();
    //! The next byte as 0..255, or -1 at the end of the input.
    int Next() {
        if (fPos == fEnd && !Fill()) {
            return -1;
        }
        return static_cast<unsigned char>(fvBuffer[fPos++]);
    }
    //! The next byte without consuming it, or -1.
    int Peek() {
        if (fPos == fEnd && !Fill()) {
            return -1;
        }
        return static_cast<unsigned char>(fvBuffer[fPos]);
    }
    //! Consumes the LF of a CRLF pair after `c` and counts the line end.
    void EndLine(int c);
    //! Appends `c` to `field`, refusing fields beyond kMaxFieldBytes.
    void Append(std::string& field, int c, long fieldLine);
    //! Appends to `field` the bytes of the buffer up to the next one that ends the run (in
    //! quotes a quote or a line end, otherwise the delimiter or a line end) or the buffer's
    //! end, refusing fields beyond kMaxFieldBytes.
    void AppendRun(std::string& field, bool quoted, long fieldLine);
    //! Throws the message for a field beyond kMaxFieldBytes that began on `fieldLine`.
    [[noreturn]] void ThrowFieldTooLong(long fieldLine) const;
    //! Writes the decimal commas of the first `n` fields that read as numbers as points.
    void PointDecimalCommas(std::vector<std::string>& fields, std::size_t n) const;

    std::streambuf* fpBuf;           //!< the stream's buffer, read in blocks
    std::string fFileName;           //!< named in messages
    char fDelimiter;                 //!< field separator
    bool fbDecimalComma;             //!< numbers are written with a decimal comma
    std::vector<char> fvBuffer;      //!< the block being read
    std::size_t fPos = 0;            //!< next unread byte of fvBuffer
    std::size_t fEnd = 0;            //!< bytes of fvBuffer filled
    long fLine = 1;                  //!< current line
    long fRecordLine = 0;            //!< line where the last record began
    std::uint64_t fBytesFetched = 0; //!< bytes taken from the stream, the byte-order mark included
    std::size_t fMaxFields;          //!< fields a record may have
};

//! True when `text`, without surrounding blanks, is a number written with a decimal comma:
//! a sign, digits with one comma among or before them, and an exponent ("-0,5", ",25", "1,5e-3").
bool IsDecimalCommaNumber(std::string_view text);

//! The separators GuessSeparator tries, in the order a tie is settled.
inline constexpr char kSeparatorCandidates[] = {',', ';', '\t', '|'};
//! Bytes of the start of a file that GuessSeparator looks at.
inline constexpr std::size_t kSeparatorSampleBytes = 64u << 10;
//! Rows after the header that GuessSeparator looks at.
inline constexpr int kSeparatorSampleRows = 50;

//! What the start of a CSV file says about its separator.
struct SeparatorGuess {
    //! The candidate that splits the header into the most fields, two or more, and every
    //! sampled row into as many; the first candidate when none does.
    char fDelimiter = ',';
    bool fbFound = false; //!< a candidate split the sample that evenly
    //! A cell of the sample, read with fDelimiter, that is a number written with a decimal
    //! comma ("3,14"); "" when there is none.
    std::string fDecimalCommaCell;
    //! A candidate other than fDelimiter that the header holds when fDelimiter reads it as one
    //! field (a sign that the separator is another); 0 when none.
    char fInOneFieldHeader = 0;
};

//! Guesses the separator of the file whose first bytes are `sample` (at most
//! kSeparatorSampleBytes; a last row cut off by the sample's end is not looked at) among
//! `candidates`, in order.
SeparatorGuess GuessSeparator(const std::string& sample, std::string_view candidates);

//! The first kSeparatorSampleBytes of `path` for GuessSeparator; "" when the file cannot be
//! opened or is not a regular file (a pipe cannot be read twice).
std::string ReadSeparatorSample(const std::string& path);

//! How a separator is named in messages: ';' or 'tab'.
std::string SeparatorName(char delimiter);

} // namespace MCHost
