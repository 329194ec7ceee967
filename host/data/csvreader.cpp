#include "data/csvreader.h"

#include "common/hosterror.h"

namespace MCHost {

namespace {

//! The character shown in a message: printable ASCII as itself, anything else in hex.
std::string Describe(int c) {
    if (c >= 0x20 && c < 0x7f) {
        return std::string("'") + static_cast<char>(c) + "'";
    }
    static const char kHex[] = "0123456789abcdef";
    return std::string("byte 0x") + kHex[(c >> 4) & 0xf] + kHex[c & 0xf];
}

} // namespace

CsvReader::CsvReader(std::istream& in, std::string fileName, char delimiter)
    : fpBuf(in.rdbuf()), fFileName(std::move(fileName)), fDelimiter(delimiter) {
    // The byte-order mark EF BB BF; anything else at the start is data and stays unread.
    if (fpBuf && fpBuf->sgetc() == 0xEF) {
        const auto start = fpBuf->pubseekoff(0, std::ios::cur, std::ios::in);
        char mark[3] = {0, 0, 0};
        const std::streamsize got = fpBuf->sgetn(mark, 3);
        if (got == 3 && static_cast<unsigned char>(mark[1]) == 0xBB &&
            static_cast<unsigned char>(mark[2]) == 0xBF) {
            fBytesRead = 3;
        } else {
            fpBuf->pubseekpos(start, std::ios::in);
        }
    }
}

int CsvReader::Next() {
    const int c = fpBuf ? fpBuf->sbumpc() : std::char_traits<char>::eof();
    if (c == std::char_traits<char>::eof()) {
        return -1;
    }
    ++fBytesRead;
    return static_cast<unsigned char>(c);
}

int CsvReader::Peek() {
    const int c = fpBuf ? fpBuf->sgetc() : std::char_traits<char>::eof();
    return c == std::char_traits<char>::eof() ? -1 : static_cast<unsigned char>(c);
}

void CsvReader::EndLine(int c) {
    if (c == '\r' && Peek() == '\n') {
        Next();
    }
    ++fLine;
}

void CsvReader::Append(std::string& field, int c, long fieldLine) {
    if (field.size() >= kMaxFieldBytes) {
        throw HostError(LocatedMessage(fFileName, fieldLine,
                                       "a field is longer than " + std::to_string(kMaxFieldBytes) +
                                           " bytes (is a quote left open?)"));
    }
    field.push_back(static_cast<char>(c));
}

bool CsvReader::ReadRecord(std::vector<std::string>& fields) {
    enum class State { kFieldStart, kUnquoted, kQuoted, kQuoteInQuoted };
    fields.clear();
    std::string field;
    State state = State::kFieldStart;
    long fieldLine = fLine;
    bool anything = false; // a byte of this record has been read
    fRecordLine = fLine;

    for (;;) {
        const int c = Next();
        if (c < 0) {
            if (state == State::kQuoted) {
                throw HostError(LocatedMessage(fFileName, fieldLine,
                                               "a quoted field is not closed before the end "
                                               "of the file"));
            }
            if (!anything) {
                return false;
            }
            fields.push_back(std::move(field));
            return true;
        }
        const bool lineEnd = (c == '\n' || c == '\r');
        switch (state) {
        case State::kFieldStart:
            if (lineEnd && !anything) {
                // An empty line between records.
                EndLine(c);
                fRecordLine = fLine;
                fieldLine = fLine;
                continue;
            }
            anything = true;
            if (c == '"') {
                fieldLine = fLine;
                state = State::kQuoted;
            } else if (c == fDelimiter) {
                fields.emplace_back();
            } else if (lineEnd) {
                EndLine(c);
                fields.push_back(std::move(field));
                return true;
            } else {
                fieldLine = fLine;
                Append(field, c, fieldLine);
                state = State::kUnquoted;
            }
            break;
        case State::kUnquoted:
            if (c == fDelimiter) {
                fields.push_back(std::move(field));
                field.clear();
                state = State::kFieldStart;
            } else if (lineEnd) {
                EndLine(c);
                fields.push_back(std::move(field));
                return true;
            } else {
                Append(field, c, fieldLine);
            }
            break;
        case State::kQuoted:
            if (c == '"') {
                state = State::kQuoteInQuoted;
            } else {
                // A line end inside quotes belongs to the field, exactly as written.
                Append(field, c, fieldLine);
                if (c == '\n' || (c == '\r' && Peek() != '\n')) {
                    ++fLine;
                }
            }
            break;
        case State::kQuoteInQuoted:
            if (c == '"') {
                Append(field, c, fieldLine);
                state = State::kQuoted;
            } else if (c == fDelimiter) {
                fields.push_back(std::move(field));
                field.clear();
                state = State::kFieldStart;
            } else if (lineEnd) {
                EndLine(c);
                fields.push_back(std::move(field));
                return true;
            } else {
                throw HostError(LocatedMessage(fFileName, fLine,
                                               Describe(c) + " follows a closing quote; a "
                                                             "quote inside a quoted field is "
                                                             "written twice (\"\")"));
            }
            break;
        }
    }
}

} // namespace MCHost
