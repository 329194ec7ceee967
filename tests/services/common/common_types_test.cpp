#include "mccommon/display.h"
#include "mccommon/hostinterfaces.h"
#include "mccommon/mcmv.h"
#include "mccommon/mcstatus.h"
#include "mccommon/records.h"
#include "mccommon/variables.h"

#include <gtest/gtest.h>

#include <sstream>

using namespace MCCommon_800;
using namespace MCXML_800;

// Appending a list to itself must not read the elements it is adding.
TEST(MCWarnings, AppendingItselfKeepsOrder) {
    MCWarnings w;
    w.AddWarning(MCStatus(1, false), 0);
    w.AddWarning(MCStatus(2, true), 0);
    w.AddWarnings(w);
    ASSERT_EQ(w.GetWarnings(true).size(), 4u);
    EXPECT_EQ(w.GetWarnings(true)[3].GetErrorCode(), 2);
}

TEST(Records, NamesAreUniqueAndOutOfRangeReadsAreMissing) {
    ValueRecord r(4);
    EXPECT_EQ(r.Add("a", Value(1.0)), 0);
    EXPECT_EQ(r.Add("b", Value("x")), 1);
    EXPECT_EQ(r.Add("a", Value(2.0)), 0);
    EXPECT_EQ(r[0].GetReal(), 2.0);
    EXPECT_TRUE(MCMV::IsMissing(r[1].GetReal()));
    EXPECT_TRUE(r.Remove("a"));
    EXPECT_FALSE(r.Remove("a"));
    EXPECT_EQ(r.IndexOf("b"), 0);

    const Value list(std::vector<Value::ListEntry>{{"yes", 0.25}, {"no", 0.75}});
    EXPECT_EQ(list.GetListValue("no"), 0.75);
    EXPECT_TRUE(MCMV::IsMissing(list.GetListValue("maybe")));
    EXPECT_EQ(Value(" 2.5").GetReal(), 2.5);
    const Record rec(std::vector<double>{1.0, 2.0});
    EXPECT_TRUE(MCMV::IsMissing(rec[2]));
}

TEST(Variables, EncoderMapsBothWaysAndOutOfRangeIsEmpty) {
    const MCCatNumEncoder numbers(std::vector<double>{1.0, 2.0, 2.5});
    EXPECT_EQ(numbers.Encode("2.5"), 2);
    EXPECT_EQ(numbers.Encode(3.0), -1);
    EXPECT_TRUE(MCMV::IsMissing(numbers.GetCategoryNumber(3)));
    MCCatNumEncoder texts(std::vector<std::string>{"a", "b"});
    EXPECT_EQ(texts.AddCategory("c"), 2);
    EXPECT_EQ(texts.AddCategory("a"), 0);
    EXPECT_EQ(texts.Encode(1.0), -1);
    EXPECT_EQ(texts.GetCategoryText(5), "");
}

TEST(Variables, ListCopiesAreDeep) {
    MCVarList list;
    list.Add(std::make_unique<MCScaleVar>("age"));
    list.Add(std::make_unique<MCCatVar>("region",
                                        MCCatNumEncoder(std::vector<std::string>{"n", "s"}), true));
    MCVarList copy = list;
    list = MCVarList();
    ASSERT_EQ(copy.Size(), 2);
    EXPECT_EQ(copy.FindVariable("nothing"), -1);
    const auto* region = dynamic_cast<const MCCatVar*>(copy.GetVarAt(1));
    ASSERT_NE(region, nullptr);
    EXPECT_TRUE(region->GetOrdinalFlag());
    EXPECT_EQ(region->GetStorage(), IMCVariable::kStringStorage);
}

TEST(MemoryRecordIter, RunsSeveralPasses) {
    MCMemoryRecordIter it({Record(std::vector<double>{1.0}), Record(std::vector<double>{2.0})});
    double sum = 0.0;
    for (int pass = 0; pass < 2; ++pass) {
        while (it.HasMore()) {
            sum += (*it.NextRecord())[0];
        }
        EXPECT_EQ(it.NextRecord(), nullptr);
        ASSERT_EQ(it.Restart(), 0);
    }
    EXPECT_EQ(sum, 6.0);
    EXPECT_EQ(it.GetPassCount(), 3);
}

TEST(Display, RedirectionIsScoped) {
    std::ostringstream os;
    {
        MCDisplay_800::ScopedOutStream scoped(os);
        MCDisplay_800::DisplayFrame frame("X start", "X end");
        MCDisplay_800::DisplayDV("values", {1.5, 2.0});
    }
    EXPECT_EQ(os.str(), "X start\nvalues 1.5 2\nX end\n");
    EXPECT_NE(MCDisplay_800::GetOutStream(), &os);
}
