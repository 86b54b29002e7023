#include "text/KestCdfDate.h"

#include <gtest/gtest.h>

#include <climits>
#include <ctime>

#include "platform/KestCalmorphDLLError.h"

using namespace kest;

namespace {

// A date with every field set to a recognisable value.
KestCdfDate Known() {
    KestCdfDate date;
    date.SetDate(CComBSTR(u"2001-02-03T04:05:06"));
    return date;
}

// The reason code thrown by `action`, or -1 when nothing was thrown.
template <class Action>
int ReasonOf(Action action) {
    try {
        action();
    } catch (const KestCalmorphDLLError& error) {
        EXPECT_EQ(error.GetReasonString().Length(), 0u);
        return error.GetReason();
    }
    return -1;
}

std::u16string Text(const KestCdfDate& date) { return date.CreateTimeString().ToU16String(); }

}  // namespace

TEST(KestCdfDate, DefaultIsCurrentLocalTime) {
    std::time_t before = std::time(nullptr);
    KestCdfDate date;
    std::time_t after = std::time(nullptr);
    struct tm fields = date.GetDate();
    std::time_t made = std::mktime(&fields);
    EXPECT_GE(made, before - 1);
    EXPECT_LE(made, after + 1);
}

TEST(KestCdfDate, ParsesAndWritesDateText) {
    struct Row {
        const char* label;
        const char16_t* text;
        int reason;              // -1: accepted
        const char16_t* result;  // CreateTimeString afterwards
    } rows[] = {
        {"plain", u"1999-05-06T07:08:09", -1, u"1999-05-06T07:08:09"},
        {"trailing Z", u"1999-05-06T07:08:09Z", -1, u"1999-05-06T07:08:09"},
        {"leading minus", u"-1999-05-06T07:08:09", -1, u"1999-05-06T07:08:09"},
        {"other twentieth char", u"1999-05-06T07:08:09+", -1, u"1999-05-06T07:08:09"},
        {"separators not checked", u"1999/05/06 07.08.09", -1, u"1999-05-06T07:08:09"},
        {"length 18", u"1999-05-06T07:08:0", 40, u"2001-02-03T04:05:06"},
        {"length 21", u"1999-05-06T07:08:09Z+", 40, u"2001-02-03T04:05:06"},
        {"empty", u"", 40, u"2001-02-03T04:05:06"},
        {"year 1899", u"1899-05-06T07:08:09", 34, u"2001-02-03T04:05:06"},
        {"year 1900", u"1900-01-01T09:05:00", -1, u"1900-01-01T09:05:00"},
        {"year 2300", u"2300-12-31T23:59:59", -1, u"2300-12-31T23:59:59"},
        {"year 2301", u"2301-05-06T07:08:09", 34, u"2001-02-03T04:05:06"},
        {"month 13 keeps later fields", u"1999-13-06T07:08:09", 35, u"1999-02-03T04:05:06"},
        {"letters in month", u"1999-ab-06T07:08:09", 35, u"1999-02-03T04:05:06"},
        {"day 0 refused", u"1999-05-00T07:08:09", 36, u"1999-05-03T04:05:06"},
        {"day 31 in February", u"1999-02-31T07:08:09", -1, u"1999-02-31T07:08:09"},
        {"hour 24", u"1999-05-06T24:08:09", 37, u"1999-05-06T04:05:06"},
        {"minute 60", u"1999-05-06T07:60:09", 38, u"1999-05-06T07:05:06"},
        {"second 60", u"1999-05-06T07:08:60", 39, u"1999-05-06T07:08:06"},
        {"letters in minute give 0", u"1999-05-06T07:xx:09", -1, u"1999-05-06T07:00:09"},
        {"digit then letter", u"1999-05-06T07:8x:09", -1, u"1999-05-06T07:08:09"},
        {"leading blank in group", u"1999- 5-06T07:08:09", -1, u"1999-05-06T07:08:09"},
        {"plus sign in group", u"1999-+5-06T07:08:09", -1, u"1999-05-06T07:08:09"},
        {"minus sign in group", u"1999--5-06T07:08:09", 35, u"1999-02-03T04:05:06"},
        {"minus with 19 chars is a field", u"-999-05-06T07:08:09", 34, u"2001-02-03T04:05:06"},
        // Digits in the separator positions: a conversion that read past its group would
        // see 19991, 051, ... and refuse them.
        {"groups end at their last character", u"1999105106T07108109", -1, u"1999-05-06T07:08:09"},
        {"fullwidth digits are no digits", u"\uFF11999-05-06T07:08:09", 34, u"2001-02-03T04:05:06"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        KestCdfDate date = Known();
        EXPECT_EQ(ReasonOf([&] { date.SetDate(CComBSTR(row.text)); }), row.reason);
        EXPECT_EQ(Text(date), row.result);
    }
    KestCdfDate date = Known();
    EXPECT_EQ(ReasonOf([&] { date.SetDate(CComBSTR()); }), 40);
}

TEST(KestCdfDate, SettersCheckTheirRangeAndKeepTheFieldOnFailure) {
    struct Row {
        const char* label;
        void (KestCdfDate::*setter)(int);
        int (KestCdfDate::*getter)() const;
        int low, high;  // first and last accepted value
        int reason;
    } rows[] = {
        {"year", &KestCdfDate::SetYear, &KestCdfDate::GetYear, 1900, 2300, 34},
        {"month", &KestCdfDate::SetMonth, &KestCdfDate::GetMonth, 1, 12, 35},
        {"day", &KestCdfDate::SetDay, &KestCdfDate::GetDay, 1, 31, 36},
        {"hour", &KestCdfDate::SetHour, &KestCdfDate::GetHour, 0, 23, 37},
        {"minute", &KestCdfDate::SetMinute, &KestCdfDate::GetMinute, 0, 59, 38},
        {"second", &KestCdfDate::SetSecond, &KestCdfDate::GetSecond, 0, 59, 39},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        KestCdfDate date = Known();
        int before = (date.*row.getter)();
        struct tm fields = date.GetDate();
        for (int bad : {row.low - 1, row.high + 1, INT_MIN, INT_MAX}) {
            SCOPED_TRACE(bad);
            EXPECT_EQ(ReasonOf([&] { (date.*row.setter)(bad); }), row.reason);
            EXPECT_EQ((date.*row.getter)(), before);
        }
        for (int good : {row.low, row.high}) {
            EXPECT_EQ(ReasonOf([&] { (date.*row.setter)(good); }), -1);
            int stored = (date.*row.getter)();
            EXPECT_EQ(row.reason == 34 ? stored + 1900 : stored, good);
        }
        // Only this field changed.
        EXPECT_EQ(date.GetDate().tm_wday, fields.tm_wday);
        EXPECT_EQ(date.GetDate().tm_yday, fields.tm_yday);
    }
}

TEST(KestCdfDate, FieldsAndTextForm) {
    KestCdfDate date = Known();
    date.SetYear(1900);
    date.SetMonth(1);
    EXPECT_EQ(Text(date), u"1900-01-03T04:05:06");
    EXPECT_EQ(date.GetYear(), 0);
    EXPECT_EQ(date.GetMonth(), 1);
    // Unchecked values from a struct tm are written as they are, without overflow.
    struct tm odd = date.GetDate();
    odd.tm_year = INT_MAX;
    odd.tm_mon = 11;
    odd.tm_mday = 123;
    date.SetDate(&odd);
    EXPECT_EQ(Text(date), u"2147485547-12-123T04:05:06");
}
