#include "data/csvreader.h"

#include "common/hosterror.h"
#include "data/inputlimits.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <sstream>

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

bool IsDigit(char c) {
    return c >= '0' && c <= '9';
}

std::string_view TrimBlanks(std::string_view text) {
    while (!text.empty() && (text.front() == ' ' || text.front() == '\t')) {
        text.remove_prefix(1);
    }
    while (!text.empty() && (text.back() == ' ' || text.back() == '\t')) {
        text.remove_suffix(1);
    }
    return text;
}

//! The sample without a last row that its end may have cut off.
std::string_view WholeRows(const std::string& sample) {
    std::string_view rows(sample);
    if (sample.size() >= kSeparatorSampleBytes) {
        const std::size_t end = rows.find_last_of("\n\r");
        rows = end == std::string_view::npos ? std::string_view() : rows.substr(0, end + 1);
    }
    return rows;
}

//! The header's number of fields when `delimiter` splits every sampled row into as many;
//! 0 when a row has another number. A malformed record ends the sample where it starts.
std::size_t EvenFieldCount(std::string_view rows, char delimiter) {
    std::istringstream in{std::string(rows)};
    CsvReader reader(in, "", delimiter);
    std::vector<std::string> header;
    std::vector<std::string> cells;
    try {
        if (!reader.ReadRecord(header)) {
            return 0;
        }
        for (int r = 0; r < kSeparatorSampleRows && reader.ReadRecord(cells); ++r) {
            if (cells.size() != header.size()) {
                return 0;
            }
        }
    } catch (const HostError&) {
        // The sample may end inside a quoted field; what came before still counts.
    }
    return header.size();
}

//! Fills the parts of `guess` that read the sample with the chosen separator.
void LookWithChosenSeparator(std::string_view rows, SeparatorGuess& guess) {
    std::istringstream in{std::string(rows)};
    CsvReader reader(in, "", guess.fDelimiter);
    std::vector<std::string> cells;
    try {
        if (!reader.ReadRecord(cells)) {
            return;
        }
        if (cells.size() == 1) {
            for (char c : kSeparatorCandidates) {
                if (c != guess.fDelimiter && cells[0].find(c) != std::string::npos) {
                    guess.fInOneFieldHeader = c;
                    break;
                }
            }
        }
        for (int r = 0; r < kSeparatorSampleRows && reader.ReadRecord(cells); ++r) {
            for (const std::string& cell : cells) {
                if (IsDecimalCommaNumber(cell)) {
                    guess.fDecimalCommaCell = std::string(TrimBlanks(cell));
                    return;
                }
            }
        }
    } catch (const HostError&) {
        // As in EvenFieldCount.
    }
}

} // namespace

bool IsDecimalCommaNumber(std::string_view text) {
    text = TrimBlanks(text);
    const std::size_t n = text.size();
    std::size_t i = 0;
    if (i < n && (text[i] == '+' || text[i] == '-')) {
        ++i;
    }
    std::size_t digits = 0;
    bool comma = false;
    for (; i < n; ++i) {
        if (IsDigit(text[i])) {
            ++digits;
        } else if (text[i] == ',' && !comma) {
            comma = true;
        } else {
            break;
        }
    }
    if (!comma || digits == 0) {
        return false;
    }
    if (i < n && (text[i] == 'e' || text[i] == 'E')) {
        ++i;
        if (i < n && (text[i] == '+' || text[i] == '-')) {
            ++i;
        }
        const std::size_t start = i;
        while (i < n && IsDigit(text[i])) {
            ++i;
        }
        if (i == start) {
            return false;
        }
    }
    return i == n;
}

SeparatorGuess GuessSeparator(const std::string& sample, std::string_view candidates) {
    const std::string_view rows = WholeRows(sample);
    SeparatorGuess guess;
    guess.fDelimiter = candidates.empty() ? ',' : candidates.front();
    std::size_t best = 1;
    for (char c : candidates) {
        const std::size_t n = EvenFieldCount(rows, c);
        if (n > best) {
            best = n;
            guess.fDelimiter = c;
            guess.fbFound = true;
        }
    }
    LookWithChosenSeparator(rows, guess);
    return guess;
}

std::string ReadSeparatorSample(const std::string& path) {
    std::error_code ec;
    if (!std::filesystem::is_regular_file(path, ec)) {
        return std::string();
    }
    std::ifstream in(path, std::ios::in | std::ios::binary);
    std::string sample(kSeparatorSampleBytes, '\0');
    in.read(sample.data(), static_cast<std::streamsize>(sample.size()));
    sample.resize(static_cast<std::size_t>(std::max<std::streamsize>(0, in.gcount())));
    return sample;
}

std::string SeparatorName(char delimiter) {
    return delimiter == '\t' ? std::string("tab") : "'" + std::string(1, delimiter) + "'";
}

CsvReader::CsvReader(std::istream& in, std::string fileName, char delimiter, bool decimalComma)
    : fpBuf(in.rdbuf()), fFileName(std::move(fileName)), fDelimiter(delimiter),
      fbDecimalComma(decimalComma), fMaxFields(InputLimits::Get().fMaxFieldsPerRecord) {
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

void CsvReader::PointDecimalCommas(std::vector<std::string>& fields, std::size_t n) const {
    for (std::size_t i = 0; i < n; ++i) {
        std::string& field = fields[i];
        const std::size_t comma = field.find(',');
        if (comma != std::string::npos && IsDecimalCommaNumber(field)) {
            field[comma] = '.';
        }
    }
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
        if (nFields == fMaxFields) {
            throw HostError(LocatedMessage(fFileName, fRecordLine,
                                           "a record has more than " + std::to_string(fMaxFields) +
                                               " fields" + RaiseHint("MCSIM_MAX_FIELDS")));
        }
        if (nFields == fields.size()) {
            fields.emplace_back();
        }
        field = &fields[nFields++];
        field->clear();
    };
    const auto finish = [&]() {
        fields.resize(nFields);
        if (fbDecimalComma) {
            PointDecimalCommas(fields, nFields);
        }
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
