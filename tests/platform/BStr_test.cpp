#include "platform/BStr.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

using namespace kest;

namespace {

// Frees a BSTR at the end of a scope.
struct Owned {
    BSTR text;
    explicit Owned(BSTR t) : text(t) {}
    ~Owned() { SysFreeString(text); }
    Owned(const Owned&) = delete;
    Owned& operator=(const Owned&) = delete;
};

// Restores normal allocation even when a test fails half way.
struct FailAfter {
    explicit FailAfter(long count) { SysFailAllocationAfter(count); }
    ~FailAfter() { SysFailAllocationAfter(-1); }
};

}  // namespace

TEST(BStr, LengthPrefixTerminatorAndNullAsEmpty) {
    Owned text(SysAllocString(u"abc"));
    ASSERT_NE(text.text, nullptr);
    EXPECT_EQ(SysStringLen(text.text), 3u);
    std::uint32_t prefix;
    std::memcpy(&prefix, reinterpret_cast<char*>(text.text) - 4, 4);
    EXPECT_EQ(prefix, 6u);
    EXPECT_EQ(text.text[3], u'\0');

    EXPECT_EQ(SysAllocString(nullptr), nullptr);
    EXPECT_EQ(SysStringLen(nullptr), 0u);
    EXPECT_EQ(SysStringByteLen(nullptr), 0u);
    EXPECT_TRUE(BstrView(nullptr).empty());
    SysFreeString(nullptr);
}

TEST(BStr, LengthAndByteLengthForms) {
    Owned embedded(SysAllocStringLen(u"a\0b", 3));
    EXPECT_EQ(BstrView(embedded.text), std::u16string_view(u"a\0b", 3));
    Owned zeros(SysAllocStringLen(nullptr, 4));
    EXPECT_EQ(BstrView(zeros.text), std::u16string(4, u'\0'));
    Owned odd(SysAllocStringByteLen("xyz", 3));
    EXPECT_EQ(SysStringByteLen(odd.text), 3u);
    EXPECT_EQ(SysStringLen(odd.text), 1u);
    // The code unit after the last whole one holds the odd byte, then a full zero follows.
    EXPECT_EQ(reinterpret_cast<const char*>(odd.text)[2], 'z');
    EXPECT_EQ(odd.text[2], u'\0');
    Owned empty(SysAllocStringLen(u"ignored", 0));
    ASSERT_NE(empty.text, nullptr);
    EXPECT_EQ(SysStringLen(empty.text), 0u);
}

TEST(BStr, ReAllocFromOwnText) {
    BSTR text = SysAllocString(u"hello world");
    ASSERT_TRUE(SysReAllocString(&text, text + 6));
    EXPECT_EQ(BstrView(text), u"world");
    ASSERT_TRUE(SysReAllocString(&text, nullptr));
    EXPECT_EQ(text, nullptr);
    EXPECT_FALSE(SysReAllocString(nullptr, u"x"));
}

TEST(BStr, AllocationFailureGivesNull) {
    // A length whose byte count does not fit the prefix is refused without allocating.
    EXPECT_EQ(SysAllocStringLen(nullptr, 0x80000000u), nullptr);
    EXPECT_EQ(SysAllocStringByteLen(nullptr, 0xFFFFFFFFu), nullptr);
    BSTR text = SysAllocString(u"keep");
    {
        FailAfter fail(1);
        Owned first(SysAllocString(u"x"));
        EXPECT_NE(first.text, nullptr);
        EXPECT_EQ(SysAllocStringFromUtf8("y"), nullptr);
        Owned third(SysAllocString(u"z"));  // only the one allocation fails
        EXPECT_NE(third.text, nullptr);
        SysFailAllocationAfter(0);
        EXPECT_FALSE(SysReAllocString(&text, u"other"));
    }
    EXPECT_EQ(BstrView(text), u"keep");
    SysFreeString(text);
}

TEST(BStr, VarBstrCmpIsOrdinalAndNullEqualsEmpty) {
    Owned empty(SysAllocString(u"")), a(SysAllocString(u"a")), upperA(SysAllocString(u"A"));
    Owned ab(SysAllocString(u"ab")), embedded(SysAllocStringLen(u"a\0b", 3));
    struct Row {
        const char* label;
        BSTR left, right;
        HRESULT expected;
    } rows[] = {
        {"null null", nullptr, nullptr, VARCMP_EQ},
        {"null empty", nullptr, empty.text, VARCMP_EQ},
        {"null a", nullptr, a.text, VARCMP_LT},
        {"a null", a.text, nullptr, VARCMP_GT},
        {"A a ordinal", upperA.text, a.text, VARCMP_LT},
        {"prefix", a.text, ab.text, VARCMP_LT},
        {"embedded zero counts", embedded.text, a.text, VARCMP_GT},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        EXPECT_EQ(VarBstrCmp(row.left, row.right, LOCALE_USER_DEFAULT, 0), row.expected);
    }
}

TEST(BStr, Utf8ToUtf16ReplacesEachMaximalIllFormedSubpart) {
    struct Row {
        const char* label;
        std::string utf8;
        std::u16string utf16;
    } rows[] = {
        {"two byte after eight ascii", "12345678\xC3\xA9", u"12345678\u00E9"},
        {"four byte", "\xF0\x9F\x98\x80", u"\U0001F600"},
        {"largest", "\xF4\x8F\xBF\xBF", u"\U0010FFFF"},
        {"embedded zero", std::string("a\0b", 3), std::u16string(u"a\0b", 3)},
        {"stray continuations", "a\x80\xBFz", u"a\uFFFD\uFFFDz"},
        {"overlong lead C0", "\xC0\xAF", u"\uFFFD\uFFFD"},
        {"overlong three byte", "\xE0\x80\xAF", u"\uFFFD\uFFFD\uFFFD"},
        {"overlong four byte", "\xF0\x8F\xBF\xBF", u"\uFFFD\uFFFD\uFFFD\uFFFD"},
        {"encoded surrogate", "\xED\xA0\x80", u"\uFFFD\uFFFD\uFFFD"},
        {"last before surrogates", "\xED\x9F\xBF", u"\uD7FF"},
        {"above U+10FFFF", "\xF4\x90\x80\x80", u"\uFFFD\uFFFD\uFFFD\uFFFD"},
        {"lead F5 and FF", "\xF5\x80\xFF", u"\uFFFD\uFFFD\uFFFD"},
        {"truncated at end", "a\xF0\x9F\x98", u"a\uFFFD"},
        {"truncated then ascii", "\xE2\x82z", u"\uFFFDz"},
        {"bad second byte keeps it", "\xC3(", u"\uFFFD("},
        {"lead then lead", "\xE2\xE2\x82\xAC", u"\uFFFD\u20AC"},
        {"Unicode example", "\x61\xF1\x80\x80\xE1\x80\xC2\x62\x80\x63\x80\xBF\x64",
         u"a\uFFFD\uFFFD\uFFFDb\uFFFDc\uFFFD\uFFFDd"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        EXPECT_EQ(Utf8ToUtf16(row.utf8), row.utf16);
        Owned bstr(SysAllocStringFromUtf8(row.utf8));
        ASSERT_NE(bstr.text, nullptr);
        EXPECT_EQ(BstrView(bstr.text), row.utf16);
        EXPECT_EQ(bstr.text[row.utf16.size()], u'\0');
    }
}

TEST(BStr, Utf16ToUtf8ReplacesUnpairedSurrogates) {
    struct Row {
        const char* label;
        std::u16string utf16;
        std::string utf8;
    } rows[] = {
        {"two and three byte", u"\u00E9\u20AC", "\xC3\xA9\xE2\x82\xAC"},
        {"pair", u"\U0001F600", "\xF0\x9F\x98\x80"},
        {"lone high", u"a\xD800z", "a\xEF\xBF\xBDz"},
        {"lone high at end", u"a\xDBFF", "a\xEF\xBF\xBD"},
        {"reversed pair", u"\xDC00\xD800", "\xEF\xBF\xBD\xEF\xBF\xBD"},
        {"high then pair", u"\xD800\xD83D\xDE00", "\xEF\xBF\xBD\xF0\x9F\x98\x80"},
        {"embedded zero", std::u16string(u"a\0b", 3), std::string("a\0b", 3)},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        EXPECT_EQ(Utf16ToUtf8(row.utf16), row.utf8);
    }
}

TEST(BStr, EveryCodePointRoundTrips) {
    std::u16string all;
    for (char32_t c = 0; c <= 0x10FFFF; ++c) {
        if (c >= 0xD800 && c <= 0xDFFF) continue;
        if (c < 0x10000) {
            all.push_back(static_cast<char16_t>(c));
        } else {
            all.push_back(static_cast<char16_t>(0xD800 + ((c - 0x10000) >> 10)));
            all.push_back(static_cast<char16_t>(0xDC00 + ((c - 0x10000) & 0x3FF)));
        }
    }
    EXPECT_EQ(Utf8ToUtf16(Utf16ToUtf8(all)), all);
}
