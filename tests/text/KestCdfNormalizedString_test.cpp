#include "text/KestCdfNormalizedString.h"

#include <gtest/gtest.h>

#include "platform/AtlException.h"

using namespace kest;

TEST(KestCdfNormalizedString, AssignmentFromBstrReplacesWithoutCollapsing) {
    struct Row {
        const char* label;
        std::u16string input;
        std::u16string expected;
    } rows[] = {
        {"tab, line feed, carriage return", u"A\tB\nC\rD", u"A B C D"},
        {"CR LF gives two spaces", u"A\r\nB", u"A  B"},
        {"runs and ends survive", u"\t\nx  y\r\t", u"  x  y  "},
        {"other controls stay", u"a\vb\fc\u0085d\u2028e", u"a\vb\fc\u0085d\u2028e"},
        {"embedded zero kept", std::u16string(u"a\0\tb", 4), std::u16string(u"a\0 b", 4)},
        {"empty", u"", u""},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        KestCdfNormalizedString value(CComBSTR(u"old"));
        value = _bstr_t(row.input);
        EXPECT_EQ(value.m_string.View(), row.expected);
        EXPECT_NE(value.m_string.m_str, nullptr);
    }
    KestCdfNormalizedString value(CComBSTR(u"old"));
    value = _bstr_t();
    EXPECT_EQ(value.m_string.m_str, nullptr);
    EXPECT_EQ(value.ToString(), "");
}

TEST(KestCdfNormalizedString, ConstructionAndCopiesKeepTextVerbatim) {
    KestCdfNormalizedString fromBstrT(_bstr_t(u"A\tB\r\n"));
    EXPECT_EQ(fromBstrT.m_string.View(), u"A\tB\r\n");
    KestCdfNormalizedString fromCComBSTR(CComBSTR(u"C\nD"));
    EXPECT_EQ(fromCComBSTR.m_string.View(), u"C\nD");
    EXPECT_EQ(KestCdfNormalizedString(_bstr_t()).m_string.m_str, nullptr);

    KestCdfNormalizedString copy(fromBstrT), assigned;
    EXPECT_NE(copy.m_string.m_str, fromBstrT.m_string.m_str);
    assigned = fromCComBSTR;
    EXPECT_EQ(assigned.m_string.View(), u"C\nD");
    EXPECT_NE(assigned.m_string.m_str, fromCComBSTR.m_string.m_str);
    // Self-assignment must not free the text it is about to copy.
    copy = copy;
    EXPECT_EQ(copy.ToU16String(), u"A\tB\r\n");
}

TEST(KestCdfNormalizedString, CopyAssignmentOutOfMemoryLeavesEmpty) {
    KestCdfNormalizedString source(CComBSTR(u"source")), target(CComBSTR(u"target"));
    SysFailAllocationAfter(0);
    EXPECT_THROW(target = source, CAtlException);
    SysFailAllocationAfter(-1);
    EXPECT_EQ(target.m_string.m_str, nullptr);
    EXPECT_EQ(source.m_string.View(), u"source");
}
