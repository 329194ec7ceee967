// The CSV record layer on awkward files: quoting, embedded line ends, line-end styles,
// byte-order marks, blank lines, and the malformed records it must refuse with file and line;
// and files written from known records, long enough that every kind of token falls across the
// reader's block boundaries, read back exactly.
#include "common/hosterror.h"
#include "data/csvreader.h"

#include <gtest/gtest.h>

#include <random>
#include <sstream>
#include <string>
#include <vector>

namespace {

using MCHost::CsvReader;
using MCHost::HostError;
using Rows = std::vector<std::vector<std::string>>;

//! Every record of `reader` and the line each begins on, read into one reused vector (so the
//! strings left from a longer record are reused, as the data passes do).
struct ReadBack {
    Rows rows;
    std::vector<long> lines;
    std::vector<std::string> last; //!< the vector after the final, failed read
};

ReadBack ReadAll(CsvReader& reader) {
    ReadBack out;
    while (reader.ReadRecord(out.last)) {
        out.rows.push_back(out.last);
        out.lines.push_back(reader.GetRecordLine());
    }
    return out;
}

struct GoodCase {
    const char* name;
    std::string text;
    char delimiter;
    Rows rows;
    std::vector<long> lines; //!< line on which each record begins
};

class CsvReaderGood : public ::testing::TestWithParam<GoodCase> {};

TEST_P(CsvReaderGood, SplitsRecordsAndCountsLines) {
    const GoodCase& c = GetParam();
    std::istringstream in(c.text);
    CsvReader reader(in, "f.csv", c.delimiter);
    const ReadBack read = ReadAll(reader);
    EXPECT_EQ(read.rows, c.rows);
    EXPECT_EQ(read.lines, c.lines);
    EXPECT_EQ(reader.GetBytesRead(), c.text.size());
}

INSTANTIATE_TEST_SUITE_P(
    Awkward, CsvReaderGood,
    ::testing::Values(
        GoodCase{"Plain", "a,b\n1,2\n", ',', {{"a", "b"}, {"1", "2"}}, {1, 2}},
        GoodCase{"NoFinalLineEnd", "a,b\n1,2", ',', {{"a", "b"}, {"1", "2"}}, {1, 2}},
        GoodCase{"Crlf", "a,b\r\n1,2\r\n", ',', {{"a", "b"}, {"1", "2"}}, {1, 2}},
        GoodCase{"LoneCr", "a,b\r1,2\r", ',', {{"a", "b"}, {"1", "2"}}, {1, 2}},
        GoodCase{"QuotedDelimiter", "\"x,y\",2\n", ',', {{"x,y", "2"}}, {1}},
        GoodCase{"DoubledQuotes", "\"say \"\"hi\"\"\",1\n", ',', {{"say \"hi\"", "1"}}, {1}},
        GoodCase{"EmbeddedNewline",
                 "h1,h2\n\"line one\nline two\",3\nnext,4\n",
                 ',',
                 {{"h1", "h2"}, {"line one\nline two", "3"}, {"next", "4"}},
                 {1, 2, 4}},
        GoodCase{"EmbeddedCrlfKeptAsWritten",
                 "\"a\r\nb\",c\r\nd,e\r\n",
                 ',',
                 {{"a\r\nb", "c"}, {"d", "e"}},
                 {1, 3}},
        GoodCase{"EmptyFields", ",,\n", ',', {{"", "", ""}}, {1}},
        GoodCase{"TrailingDelimiter", "a,\nb,", ',', {{"a", ""}, {"b", ""}}, {1, 2}},
        GoodCase{"QuotedEmpty", "\"\",x\n", ',', {{"", "x"}}, {1}},
        GoodCase{"BlankLinesSkipped", "a\n\n\r\n\nb\n\n", ',', {{"a"}, {"b"}}, {1, 5}},
        GoodCase{"ByteOrderMark",
                 "\xEF\xBB\xBF"
                 "a,b\n1,2\n",
                 ',',
                 {{"a", "b"}, {"1", "2"}},
                 {1, 2}},
        GoodCase{"NotAByteOrderMark", "\xEFxy,1\n", ',', {{"\xEFxy", "1"}}, {1}},
        GoodCase{"BareQuoteInsideUnquoted", "ab\"c,d\n", ',', {{"ab\"c", "d"}}, {1}},
        GoodCase{"Semicolons", "a;\"b;c\"\n1;2\n", ';', {{"a", "b;c"}, {"1", "2"}}, {1, 2}},
        GoodCase{"Tabs", "a\tb\n1\t2\n", '\t', {{"a", "b"}, {"1", "2"}}, {1, 2}},
        GoodCase{"Empty", "", ',', {}, {}}),
    [](const auto& p) { return std::string(p.param.name); });

struct BadCase {
    const char* name;
    std::string text;
    const char* where; //!< "file:line:" the message must start with
    const char* what;  //!< words the message must contain
};

class CsvReaderBad : public ::testing::TestWithParam<BadCase> {};

TEST_P(CsvReaderBad, RefusesWithFileAndLine) {
    const BadCase& c = GetParam();
    std::istringstream in(c.text);
    CsvReader reader(in, "f.csv");
    std::vector<std::string> fields;
    try {
        while (reader.ReadRecord(fields)) {
        }
        FAIL() << "no error for " << c.name;
    } catch (const HostError& e) {
        const std::string message = e.what();
        EXPECT_EQ(message.rfind(c.where, 0), 0u) << message;
        EXPECT_NE(message.find(c.what), std::string::npos) << message;
    }
}

INSTANTIATE_TEST_SUITE_P(
    Malformed, CsvReaderBad,
    ::testing::Values(
        // The quote opened on line 2 is never closed: the message points at its opening.
        BadCase{"UnterminatedQuote", "a,b\n1,\"oops\n2,3\n4,5\n", "f.csv:2:", "not closed"},
        BadCase{"TextAfterClosingQuote", "a\n\"x\"y\n", "f.csv:2:", "follows a closing quote"},
        BadCase{"TextAfterClosingQuoteLaterLine", "a\n\"x\ny\"z\n",
                "f.csv:3:", "follows a closing quote"},
        // One field more than the cap, refused as it begins (MCSIM_MAX_FIELDS raises it).
        BadCase{"TooManyFields", "a\n" + std::string(100000, ',') + "\n", "f.csv:2:",
                "more than 100000 fields; set MCSIM_MAX_FIELDS"}),
    [](const auto& p) { return std::string(p.param.name); });

TEST(CsvReader, RefusesARunawayField) {
    // An open quote that swallows the rest of a large file stops at the field limit instead
    // of holding the file in memory.
    std::string text = "a\n\"";
    text.append(CsvReader::kMaxFieldBytes + 16, 'x');
    std::istringstream in(text);
    CsvReader reader(in, "big.csv");
    std::vector<std::string> fields;
    ASSERT_TRUE(reader.ReadRecord(fields));
    try {
        reader.ReadRecord(fields);
        FAIL() << "no error";
    } catch (const HostError& e) {
        EXPECT_EQ(std::string(e.what()).rfind("big.csv:2:", 0), 0u) << e.what();
    }
}

// ------------------------------------------------------------------------------------------
// The field limit, to the byte, for both kinds of field.

struct LimitCase {
    const char* name;
    bool quoted;
    std::size_t length; //!< the field's length
    bool accepted;
};

class CsvReaderFieldLimit : public ::testing::TestWithParam<LimitCase> {};

TEST_P(CsvReaderFieldLimit, AcceptsUpToTheLimitAndNoMore) {
    const LimitCase& c = GetParam();
    const std::string field(c.length, 'x');
    const std::string text = "a,b\n1," + (c.quoted ? "\"" + field + "\"" : field) + "\n";
    std::istringstream in(text);
    CsvReader reader(in, "big.csv");
    std::vector<std::string> fields;
    ASSERT_TRUE(reader.ReadRecord(fields));
    try {
        ASSERT_TRUE(reader.ReadRecord(fields));
        EXPECT_TRUE(c.accepted);
        ASSERT_EQ(fields.size(), 2u);
        EXPECT_EQ(fields[1].size(), c.length);
    } catch (const HostError& e) {
        EXPECT_FALSE(c.accepted);
        EXPECT_EQ(std::string(e.what()).rfind("big.csv:2:", 0), 0u) << e.what();
    }
}

INSTANTIATE_TEST_SUITE_P(
    Lengths, CsvReaderFieldLimit,
    ::testing::Values(LimitCase{"UnquotedAtTheLimit", false, CsvReader::kMaxFieldBytes, true},
                      LimitCase{"UnquotedOneOver", false, CsvReader::kMaxFieldBytes + 1, false},
                      LimitCase{"QuotedAtTheLimit", true, CsvReader::kMaxFieldBytes, true},
                      LimitCase{"QuotedOneOver", true, CsvReader::kMaxFieldBytes + 1, false}),
    [](const auto& p) { return std::string(p.param.name); });

// ------------------------------------------------------------------------------------------
// Written from known records and read back.

//! A file written from random records (fixed seed): the text and what reading it must give.
struct WrittenFile {
    std::string text;
    Rows rows;
    std::vector<long> lines;
};

//! Line ends in `s` as the reader counts them: LF, CRLF and a lone CR, one line each.
long CountLineEnds(const std::string& s) {
    long n = 0;
    for (std::size_t i = 0; i < s.size(); ++i) {
        n += s[i] == '\n' || (s[i] == '\r' && (i + 1 == s.size() || s[i + 1] != '\n'));
    }
    return n;
}

WrittenFile WriteRandomFile(unsigned seed, char delimiter, std::size_t minBytes) {
    std::mt19937 gen(seed);
    const auto pick = [&](int n) { return static_cast<int>(gen() % static_cast<unsigned>(n)); };
    static const char kPlain[] = "abcXYZ019 .-+";
    const std::string lineEnds[] = {"\n", "\r\n", "\r"};
    WrittenFile file;
    long line = 1;
    while (file.text.size() < minBytes) {
        const int nFields = 1 + pick(6);
        std::vector<std::string> record;
        std::string written;
        for (int k = 0; k < nFields; ++k) {
            // Mostly short fields; now and then one longer than the reader's block.
            const std::size_t length =
                pick(1000) == 0 ? CsvReader::kBufferBytes + static_cast<std::size_t>(pick(999))
                                : static_cast<std::size_t>(pick(12));
            const bool quoted = pick(3) == 0 || (nFields == 1 && length == 0);
            std::string value;
            for (std::size_t i = 0; i < length; ++i) {
                if (quoted && pick(8) == 0) {
                    const std::string tricky[] = {"\"", "\n", "\r\n", "\r",
                                                  std::string(1, delimiter)};
                    value += tricky[pick(5)];
                } else {
                    value += kPlain[pick(static_cast<int>(sizeof kPlain) - 1)];
                }
            }
            std::string cell = value;
            if (quoted) {
                cell.clear();
                for (char ch : value) {
                    cell += ch == '"' ? std::string("\"\"") : std::string(1, ch);
                }
                cell = "\"" + cell + "\"";
            }
            written += (k > 0 ? std::string(1, delimiter) : std::string()) + cell;
            record.push_back(value);
        }
        file.rows.push_back(record);
        file.lines.push_back(line);
        line += CountLineEnds(written);
        // The line end, sometimes followed by blank lines of the same kind.
        const std::string& end = lineEnds[pick(3)];
        const int blanks = pick(10) == 0 ? 1 + pick(2) : 0;
        for (int b = 0; b <= blanks; ++b) {
            written += end;
            ++line;
        }
        file.text += written;
    }
    return file;
}

TEST(CsvReader, ReadsBackRecordsWrittenAcrossBlockBoundaries) {
    for (const char delimiter : {',', ';', '\t'}) {
        for (unsigned seed = 1; seed <= 3; ++seed) {
            const WrittenFile file = WriteRandomFile(seed, delimiter, 5 * CsvReader::kBufferBytes);
            std::istringstream in(file.text);
            CsvReader reader(in, "w.csv", delimiter);
            const ReadBack read = ReadAll(reader);
            EXPECT_TRUE(read.last.empty());
            ASSERT_EQ(read.rows.size(), file.rows.size()) << "seed " << seed;
            for (std::size_t r = 0; r < read.rows.size(); ++r) {
                ASSERT_EQ(read.rows[r], file.rows[r]) << "seed " << seed << ", record " << r;
            }
            EXPECT_EQ(read.lines, file.lines) << "seed " << seed;
            EXPECT_EQ(reader.GetBytesRead(), file.text.size());
        }
    }
}

TEST(CsvReader, ReadsEveryTokenSplitByTheBlockBoundary) {
    // Records full of two-byte tokens (CRLF, a doubled quote, a closing quote before a
    // delimiter, an empty field, CR before a blank line), placed so that the boundary of the
    // reader's first block falls before each byte of them in turn.
    const std::string tail = "\"q\"\"r\",s\r\n\"t\r\nu\",,v\r\nw\r\r\n\"\",z";
    for (std::size_t at = 0; at <= tail.size(); ++at) {
        const std::size_t padding = CsvReader::kBufferBytes - at - 9;
        const std::string text = "h1,h2\nx," + std::string(padding, 'y') + "\n" + tail;
        ASSERT_EQ(text.find(tail), CsvReader::kBufferBytes - at);
        std::istringstream in(text);
        CsvReader reader(in, "t.csv");
        const ReadBack read = ReadAll(reader);
        const Rows expected = {{"h1", "h2"},  {"x", std::string(padding, 'y')},
                               {"q\"r", "s"}, {"t\r\nu", "", "v"},
                               {"w"},         {"", "z"}};
        EXPECT_EQ(read.rows, expected) << "boundary before byte " << at;
        EXPECT_EQ(read.lines, (std::vector<long>{1, 2, 3, 4, 6, 8}))
            << "boundary before byte " << at;
        EXPECT_EQ(reader.GetBytesRead(), text.size());
    }
}

TEST(CsvReader, BytesReadCountRecordsNotTheBlockReadAhead) {
    std::string text = "\xEF\xBB\xBFh\n";
    for (int i = 0; i < 50000; ++i) {
        text += std::to_string(i) + "\r\n";
    }
    std::istringstream in(text);
    CsvReader reader(in, "b.csv");
    std::vector<std::string> fields;
    std::uint64_t expected = 5; // the mark and the header
    ASSERT_TRUE(reader.ReadRecord(fields));
    EXPECT_EQ(reader.GetBytesRead(), expected);
    for (int i = 0; i < 50000; ++i) {
        ASSERT_TRUE(reader.ReadRecord(fields));
        expected += std::to_string(i).size() + 2;
        ASSERT_EQ(reader.GetBytesRead(), expected) << "record " << i;
    }
    EXPECT_FALSE(reader.ReadRecord(fields));
    EXPECT_EQ(reader.GetBytesRead(), text.size());
}

} // namespace

//! The start of a file and what GuessSeparator must make of it among the four candidates.
struct SeparatorCase {
    const char* name;
    std::string sample;
    char delimiter;          //!< expected separator
    bool found;              //!< it split every sampled row evenly
    std::string decimalCell; //!< expected decimal-comma cell
    char inOneFieldHeader;   //!< expected other separator in a one-field header
};

class GuessSeparatorTable : public ::testing::TestWithParam<SeparatorCase> {};

TEST_P(GuessSeparatorTable, PicksTheSeparatorThatSplitsEveryRowAlike) {
    const SeparatorCase& c = GetParam();
    const MCHost::SeparatorGuess guess = MCHost::GuessSeparator(c.sample, ",;\t|");
    EXPECT_EQ(guess.fDelimiter, c.delimiter);
    EXPECT_EQ(guess.fbFound, c.found);
    EXPECT_EQ(guess.fDecimalCommaCell, c.decimalCell);
    EXPECT_EQ(guess.fInOneFieldHeader, c.inOneFieldHeader);
}

INSTANTIATE_TEST_SUITE_P(
    Samples, GuessSeparatorTable,
    ::testing::Values(
        SeparatorCase{"Comma", "a,b\n1,2\n", ',', true, "", 0},
        SeparatorCase{"SemicolonWithDecimalCommas", "a;b\n1,5;-2,25\n3;4\n", ';', true, "1,5", 0},
        SeparatorCase{"Tab", "a\tb\tc\n1\t2,5\t3\n", '\t', true, "2,5", 0},
        SeparatorCase{"PipeBeatsTheCommaInsideQuotes", "a|b\n\"x,y\"|2\n", '|', true, "", 0},
        // A comma inside every text splits the rows, but not the header, evenly.
        SeparatorCase{"UnevenRowsAreNoSeparator", "name;n\nSmith, J;1\nLee, K;2\n", ';', true, "",
                      0},
        SeparatorCase{"NoCandidateFits", "a;b\n1;2;3\n", ',', false, "", ';'},
        // The row cut off by the end of the sample does not count.
        SeparatorCase{"CutRowIgnored",
                      "a;b\n" + std::string(MCHost::kSeparatorSampleBytes - 8, 'x') + ";1\n2;3;4",
                      ';', true, "", 0}),
    [](const auto& p) { return std::string(p.param.name); });

TEST(CsvReader, DecimalCommasOfNumbersOnlyBecomePoints) {
    std::istringstream in("a;b;c\n1,5;-,25e3;x,y\n\"2,0\";1,2,3; 7 \n");
    CsvReader reader(in, "d.csv", ';', true);
    EXPECT_EQ(ReadAll(reader).rows,
              (Rows{{"a", "b", "c"}, {"1.5", "-.25e3", "x,y"}, {"2.0", "1,2,3", " 7 "}}));
}
