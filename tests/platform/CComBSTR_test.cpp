#include "platform/CComBSTR.h"

#include <gtest/gtest.h>

#include <functional>

#include "platform/AtlException.h"

using namespace kest;

namespace {

struct FailAfter {
    explicit FailAfter(long count) { SysFailAllocationAfter(count); }
    ~FailAfter() { SysFailAllocationAfter(-1); }
};

HRESULT CaughtCode(const std::function<void()>& action) {
    try {
        action();
    } catch (const CAtlException& error) {
        return error;
    }
    return S_OK;
}

}  // namespace

TEST(CComBSTR, ConstructionKeepsNullApartFromEmpty) {
    EXPECT_EQ(CComBSTR(static_cast<const OLECHAR*>(nullptr)).m_str, nullptr);
    EXPECT_EQ(CComBSTR(static_cast<const char*>(nullptr)).m_str, nullptr);
    EXPECT_EQ(CComBSTR(0).m_str, nullptr);
    EXPECT_NE(CComBSTR(u"").m_str, nullptr);
    EXPECT_NE(CComBSTR(std::string()).m_str, nullptr);
    EXPECT_EQ(CComBSTR(3).View(), std::u16string(3, u'\0'));
    EXPECT_EQ(CComBSTR(2, u"abc").View(), u"ab");
    EXPECT_EQ(CComBSTR(0, u"abc").m_str, nullptr);
    EXPECT_EQ(CComBSTR("gr\xC3\xBC\xC3\x9F").View(), u"gr\u00FC\u00DF");
    EXPECT_EQ(CComBSTR(std::string("a\0b", 3)).Length(), 3u);
    EXPECT_EQ(CComBSTR(u"x\u00E9").ToString(), "x\xC3\xA9");
    EXPECT_EQ(HRESULT(CaughtCode([] { CComBSTR bad(-1); })), E_INVALIDARG);
}

TEST(CComBSTR, CopiesAreIndependent) {
    CComBSTR first(u"one");
    CComBSTR second(first);
    second.Append(u"!");
    EXPECT_EQ(first.View(), u"one");
    second = first;
    EXPECT_NE(second.m_str, first.m_str);
    second = second;  // self-assignment keeps the text
    second = second.m_str;
    EXPECT_EQ(second.View(), u"one");
    CComBSTR moved(std::move(second));
    EXPECT_EQ(moved.View(), u"one");
    EXPECT_EQ(second.m_str, nullptr);
    moved = "utf8 \xE2\x82\xAC";
    EXPECT_EQ(moved.View(), u"utf8 \u20AC");
}

TEST(CComBSTR, AppendForms) {
    CComBSTR text;
    EXPECT_EQ(text.Append(static_cast<const OLECHAR*>(nullptr)), S_OK);
    EXPECT_EQ(text.m_str, nullptr);
    EXPECT_EQ(text.Append(u"", 0), S_OK);
    EXPECT_NE(text.m_str, nullptr);  // appending to null gives an empty string
    EXPECT_EQ(text.Append(u'c'), S_OK);
    EXPECT_EQ(text.Append("d\xC3\xA9"), S_OK);
    EXPECT_EQ(text.Append(u"xyz", 2), S_OK);
    EXPECT_EQ(text.Append(u"xyz", -1), E_INVALIDARG);
    EXPECT_EQ(text.View(), u"cd\u00E9xy");
    // Appending the string to itself reads the old text before freeing it.
    text = u"ab";
    text.Append(text);
    text.Append(text.m_str + 1, 2);
    EXPECT_EQ(text.View(), u"ababba");
}

TEST(CComBSTR, ComparisonsTreatNullAsEmpty) {
    CComBSTR null, empty(u""), a(u"a");
    EXPECT_TRUE(null == empty);
    EXPECT_TRUE(empty == static_cast<const OLECHAR*>(nullptr));
    EXPECT_TRUE(null == nullptr);
    EXPECT_FALSE(empty == nullptr);
    EXPECT_TRUE(a != u"A");
    EXPECT_TRUE(null < a);
    EXPECT_TRUE(CComBSTR(u"A") < a);
    EXPECT_FALSE(a < a);
    EXPECT_TRUE(!null);
    EXPECT_FALSE(!empty);
}

TEST(CComBSTR, OwnershipTransfer) {
    CComBSTR text(u"owned");
    BSTR copy = text.Copy();
    EXPECT_NE(copy, text.m_str);
    EXPECT_EQ(BstrView(copy), u"owned");
    EXPECT_EQ(text.CopyTo(nullptr), E_POINTER);
    BSTR detached = text.Detach();
    EXPECT_EQ(text.m_str, nullptr);
    text.Attach(copy);
    text.Attach(detached);  // frees the attached copy
    EXPECT_EQ(text.m_str, detached);
    // A byte-length string keeps its odd byte through a copy.
    text.Attach(SysAllocStringByteLen("abc", 3));
    EXPECT_EQ(CComBSTR(text).ByteLength(), 3u);
}

TEST(CComBSTR, AllocationFailureThrowsOrReportsOutOfMemory) {
    // Each action's first allocation fails.
    const CComBSTR x(u"x");
    struct Row {
        const char* label;
        std::function<void()> action;
    } rows[] = {{"wide constructor", [] { CComBSTR text(u"x"); }},
                {"utf8 constructor", [] { CComBSTR text("x"); }},
                {"length constructor", [] { CComBSTR text(4); }},
                {"copy", [&] { CComBSTR copy(x); }},
                {"operator+=", [] { CComBSTR().operator+=(u"x"); }}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        FailAfter fail(0);
        EXPECT_EQ(CaughtCode(row.action), E_OUTOFMEMORY);
    }
    CComBSTR text(u"kept"), other(u"other");
    FailAfter fail(0);
    EXPECT_EQ(text.Append(u"more"), E_OUTOFMEMORY);
    SysFailAllocationAfter(0);
    BSTR target = reinterpret_cast<BSTR>(1);
    EXPECT_EQ(text.CopyTo(&target), E_OUTOFMEMORY);
    EXPECT_EQ(target, nullptr);
    SysFailAllocationAfter(0);
    EXPECT_THROW(text = other, CAtlException);
    EXPECT_EQ(text.View(), u"kept");
}
