// The CSV record layer on awkward files: quoting, embedded line ends, line-end styles,
// byte-order marks, blank lines, and the malformed records it must refuse with file and line.
#include "common/hosterror.h"
#include "data/csvreader.h"

#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <vector>

namespace {

using MCHost::CsvReader;
using MCHost::HostError;
using Rows = std::vector<std::vector<std::string>>;

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
    Rows rows;
    std::vector<long> lines;
    std::vector<std::string> fields;
    while (reader.ReadRecord(fields)) {
        rows.push_back(fields);
        lines.push_back(reader.GetRecordLine());
    }
    EXPECT_EQ(rows, c.rows);
    EXPECT_EQ(lines, c.lines);
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
                "f.csv:3:", "follows a closing quote"}),
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

} // namespace
