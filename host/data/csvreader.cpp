#include "data/csvreader.h"

#include "common/hosterror.h"

#include <algorithm>

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
            fBytesFetched = 3;
        } else {
            fpBuf->pubseekpos(start, std::ios::in);
        }
    }
}

bool CsvReader::Fill() {
    if (!fpBuf) {
        return false;
    }
    if (fvBuffer.empty()) {
        fvBuffer.resize(kBufferBytes);
    }
    const std::streamsize got =
        fpBuf->sgetn(fvBuffer.data(), static_cast<std::streamsize>(fvBuffer.size()));
    if (got <= 0) {
        return false;
    }
    fPos = 0;
    fEnd = static_cast<std::size_t>(got);
    fBytesFetched += static_cast<std::uint64_t>(got);
    return true;
}

void CsvReader::EndLine(int c) {
    if (c == '\r' && Peek() == '\n') {
        Next();
    }
    ++fLine;
}

void CsvReader::ThrowFieldTooLong(long fieldLine) const {
    throw HostError(LocatedMessage(fFileName, fieldLine,
                                   "a field is longer than " + std::to_string(kMaxFieldBytes) +
                                       " bytes (is a quote left open?)"));
}

void CsvReader::Append(std::string& field, int c, long fieldLine) {
    if (field.size() >= kMaxFieldBytes) {
        ThrowFieldTooLong(fieldLine);
    }
    field.push_back(static_cast<char>(c));
}

void CsvReader::AppendRun(std::string& field, bool quoted, long fieldLine) {
    const char* const first = fvBuffer.data() + fPos;
    const char* const last = fvBuffer.data() + fEnd;
    const char* p = first;
    // Most fields are short runs of ordinary bytes: find the run's end, then take it at once.
    const char stop = quoted ? '"' : fDelimiter;
    while (p != last && *p != stop && *p != '\n' && *p != '\r') {
        ++p;
    }
    const std::size_t n = static_cast<std::size_t>(p - first);
    if (n > kMaxFieldBytes - std::min(field.size(), kMaxFieldBytes)) {
        ThrowFieldTooLong(fieldLine);
    }
    field.append(first, n);
    fPos += n;
}

bool CsvReader::ReadRecord(std::vector<std::string>& fields) {
    enum class State { kFieldStart, kUnquoted, kQuoted, kQuoteInQuoted };
    // The record's fields go into the strings already in `fields`, which keep their capacity
    // from one record to the next; `field` is the one being filled.
    std::size_t nFields = 0;
    std::string* field = nullptr;
    const auto open = [&]() {
        if (nFields == fields.size()) {
            fields.emplace_back();
        }
        field = &fields[nFields++];
        field->clear();
    };
    const auto finish = [&]() {
        fields.resize(nFields);
        return true;
    };
    State state = State::kFieldStart;
    long fieldLine = fLine;
    bool anything = false; // a byte of this record has been read
    fRecordLine = fLine;

    for (;;) {
        if (state == State::kUnquoted || state == State::kQuoted) {
            AppendRun(*field, state == State::kQuoted, fieldLine);
        }
        const int c = Next();
        if (c < 0) {
            if (state == State::kQuoted) {
                throw HostError(LocatedMessage(fFileName, fieldLine,
                                               "a quoted field is not closed before the end "
                                               "of the file"));
            }
            if (!anything) {
                fields.clear();
                return false;
            }
            if (state == State::kFieldStart) {
                open();
            }
            return finish();
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
            open();
            if (c == '"') {
                fieldLine = fLine;
                state = State::kQuoted;
            } else if (c == fDelimiter) {
                // An empty field; the next one starts here.
            } else if (lineEnd) {
                EndLine(c);
                return finish();
            } else {
                fieldLine = fLine;
                Append(*field, c, fieldLine);
                state = State::kUnquoted;
            }
            break;
        case State::kUnquoted:
            if (c == fDelimiter) {
                state = State::kFieldStart;
            } else if (lineEnd) {
                EndLine(c);
                return finish();
            } else {
                Append(*field, c, fieldLine);
            }
            break;
        case State::kQuoted:
            if (c == '"') {
                state = State::kQuoteInQuoted;
            } else {
                // A line end inside quotes belongs to the field, exactly as written.
                Append(*field, c, fieldLine);
                if (c == '\n' || (c == '\r' && Peek() != '\n')) {
                    ++fLine;
                }
            }
            break;
        case State::kQuoteInQuoted:
            if (c == '"') {
                Append(*field, c, fieldLine);
                state = State::kQuoted;
            } else if (c == fDelimiter) {
                state = State::kFieldStart;
            } else if (lineEnd) {
                EndLine(c);
                return finish();
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
