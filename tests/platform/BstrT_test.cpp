#include "platform/BstrT.h"

#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <thread>
#include <utility>
#include <vector>

#include "platform/ComError.h"

using namespace kest;

namespace {

struct FailAfter {
    explicit FailAfter(long count) { SysFailAllocationAfter(count); }
    ~FailAfter() { SysFailAllocationAfter(-1); }
};

}  // namespace

TEST(BstrT, NullAndEmpty) {
    _bstr_t null, empty("");
    EXPECT_TRUE(!null);
    EXPECT_EQ(static_cast<const char*>(null), nullptr);
    EXPECT_EQ(null.ToString(), "");
    EXPECT_TRUE(!_bstr_t(static_cast<const char*>(nullptr)));
    EXPECT_TRUE(!_bstr_t(nullptr, true));
    EXPECT_FALSE(!empty);
    EXPECT_STREQ(static_cast<const char*>(empty), "");
    EXPECT_TRUE(null == empty);
    EXPECT_TRUE(null == static_cast<const char*>(nullptr));
    EXPECT_FALSE(null < empty);
}

TEST(BstrT, CopiesShareOneString) {
    _bstr_t first(u"shared");
    _bstr_t second(first), third;
    third = second;
    EXPECT_EQ(std::as_const(first).GetBSTR(), std::as_const(second).GetBSTR());
    EXPECT_EQ(static_cast<const OLECHAR*>(third), static_cast<const OLECHAR*>(first));
    // Changing one copy leaves the others alone.
    second += _bstr_t(u"!");
    third = "new";
    EXPECT_EQ(first.View(), u"shared");
    EXPECT_EQ(second.View(), u"shared!");
    // Writing through GetBSTR() gives this copy a string of its own first.
    _bstr_t fourth(first);
    BSTR& raw = fourth.GetBSTR();
    EXPECT_NE(raw, std::as_const(first).GetBSTR());
    raw[0] = u'S';
    EXPECT_EQ(fourth.View(), u"Shared");
    EXPECT_EQ(first.View(), u"shared");
}

TEST(BstrT, Utf8FormIsCachedAndFollowsChanges) {
    _bstr_t text(u"K\u00E4se \U0001F600");
    const char* narrow = text;
    EXPECT_STREQ(narrow, "K\xC3\xA4se \xF0\x9F\x98\x80");
    EXPECT_EQ(static_cast<const char*>(text), narrow);  // converted once
    _bstr_t copy(text);
    EXPECT_EQ(static_cast<const char*>(copy), narrow);  // copies share the cache
    text.GetBSTR()[0] = u'k';
    EXPECT_STREQ(static_cast<const char*>(text), "k\xC3\xA4se \xF0\x9F\x98\x80");
    EXPECT_STREQ(static_cast<const char*>(copy), "K\xC3\xA4se \xF0\x9F\x98\x80");
    text += "!";
    EXPECT_STREQ(static_cast<const char*>(text), "k\xC3\xA4se \xF0\x9F\x98\x80!");
    EXPECT_EQ(_bstr_t("a\xFF"
                      "b")
                  .View(),
              u"a\uFFFDb");
}

TEST(BstrT, ConcurrentUtf8ConversionIsSafe) {
    _bstr_t text(std::u16string(5000, u'\u00E9'));
    std::vector<const char*> seen(4);
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&, i] { seen[i] = _bstr_t(text); });
    }
    for (std::thread& thread : threads) thread.join();
    for (const char* narrow : seen) EXPECT_EQ(narrow, seen[0]);
    EXPECT_EQ(std::strlen(seen[0]), 10000u);
}

TEST(BstrT, ConcatenationAndComparison) {
    _bstr_t a("a"), null;
    EXPECT_EQ(("x" + a).View(), u"xa");
    EXPECT_EQ((u"y" + a).View(), u"ya");
    EXPECT_EQ((null + a).View(), u"a");
    EXPECT_TRUE(!(null + null));
    a += a;
    EXPECT_EQ(a.View(), u"aa");
    EXPECT_TRUE(_bstr_t("A") < _bstr_t("a"));
    EXPECT_TRUE(_bstr_t("ab") != _bstr_t("a"));
    EXPECT_TRUE(_bstr_t("ab") != u"a");
    EXPECT_FALSE(_bstr_t("a") != u"a");
    EXPECT_TRUE(_bstr_t(u"\u00E9") == "\xC3\xA9");
    EXPECT_EQ(_bstr_t(std::u16string(u"a\0b", 3)).length(), 3u);
}

TEST(BstrT, OwnershipTransfer) {
    BSTR raw = SysAllocString(u"raw");
    _bstr_t taken(raw, false), copied(raw, true);
    EXPECT_EQ(taken.GetBSTR(), raw);
    EXPECT_NE(copied.GetBSTR(), raw);
    EXPECT_EQ(taken.copy(false), raw);
    // Detaching a shared string hands out a copy; the other sharer keeps its own.
    _bstr_t sharer(taken);
    BSTR detached = taken.Detach();
    EXPECT_TRUE(!taken);
    EXPECT_EQ(BstrView(detached), u"raw");
    EXPECT_EQ(sharer.View(), u"raw");
    BSTR sole = sharer.Detach();
    EXPECT_EQ(sole, raw);  // the last holder gives up the string itself
    SysFreeString(sole);
    _bstr_t target(u"old");
    target.Attach(detached);
    EXPECT_EQ(target.GetBSTR(), detached);
    target.Assign(copied.GetBSTR());
    EXPECT_NE(target.GetBSTR(), copied.GetBSTR());
    EXPECT_EQ(target.View(), u"raw");
}

TEST(BstrT, AllocationFailureThrowsComError) {
    // Each action's first allocation fails.
    _bstr_t x("x");
    struct Row {
        const char* label;
        std::function<void()> action;
    } rows[] = {{"utf8", [] { _bstr_t text("x"); }},
                {"wide", [] { _bstr_t text(u"x"); }},
                {"copy", [&] { SysFreeString(x.copy()); }},
                {"append", [&] { x += x; }}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        try {
            FailAfter fail(0);
            row.action();
            ADD_FAILURE() << "no exception";
        } catch (const _com_error& error) {
            EXPECT_EQ(error.Error(), E_OUTOFMEMORY);
        }
    }
    _bstr_t kept("kept");
    {
        FailAfter fail(0);
        EXPECT_THROW(kept = u"other", _com_error);
    }
    EXPECT_EQ(kept.View(), u"kept");
}
