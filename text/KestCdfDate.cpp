#include "KestCdfDate.h"

#include <cstring>
#include <string>

#include "../platform/KestCalmorphDLLError.h"

namespace kest {

namespace {

bool IsAtoiSpace(char16_t c) noexcept {
    return c == u' ' || c == u'\t' || c == u'\n' || c == u'\v' || c == u'\f' || c == u'\r';
}

// The number that atoi would read from exactly these characters, and nothing beyond them:
// white space skipped, an optional sign, then digits up to the first other character;
// no digits give 0.
int GroupValue(std::u16string_view group) noexcept {
    std::size_t i = 0;
    while (i < group.size() && IsAtoiSpace(group[i])) ++i;
    bool negative = false;
    if (i < group.size() && (group[i] == u'+' || group[i] == u'-')) {
        negative = group[i] == u'-';
        ++i;
    }
    int value = 0;
    for (; i < group.size() && group[i] >= u'0' && group[i] <= u'9'; ++i) {
        value = value * 10 + (group[i] - u'0');
    }
    return negative ? -value : value;
}

void AppendNumber(std::u16string& text, long long value) {
    for (char c : std::to_string(value)) text.push_back(static_cast<char16_t>(c));
}

// Month, day and time fields: a leading "0" below 10.
void AppendField(std::u16string& text, int value) {
    if (value < 10) text.push_back(u'0');
    AppendNumber(text, value);
}

}  // namespace

KestCdfDate::KestCdfDate() {
    std::memset(&m_date, 0, sizeof m_date);
    std::time_t now = std::time(nullptr);
    localtime_r(&now, &m_date);
}

void KestCdfDate::SetDate(const struct tm* date) { m_date = *date; }

void KestCdfDate::SetDate(CComBSTR text) {
    std::u16string_view view = text.View();
    if (view.size() < 19 || view.size() > 20) KestCalmorphDLLError::Raise(reason::kDateTextLength);
    std::size_t s = (view.size() == 20 && view[0] == u'-') ? 1 : 0;
    SetYear(GroupValue(view.substr(s, 4)));
    SetMonth(GroupValue(view.substr(s + 5, 2)));
    SetDay(GroupValue(view.substr(s + 8, 2)));
    SetHour(GroupValue(view.substr(s + 11, 2)));
    SetMinute(GroupValue(view.substr(s + 14, 2)));
    SetSecond(GroupValue(view.substr(s + 17, 2)));
}

CComBSTR KestCdfDate::CreateTimeString() const {
    std::u16string text;
    // Widened so that an unchecked year near INT_MAX cannot overflow.
    AppendNumber(text, static_cast<long long>(GetYear()) + 1900);
    text.push_back(u'-');
    AppendField(text, GetMonth());
    text.push_back(u'-');
    AppendField(text, GetDay());
    text.push_back(u'T');
    AppendField(text, GetHour());
    text.push_back(u':');
    AppendField(text, GetMinute());
    text.push_back(u':');
    AppendField(text, GetSecond());
    return CComBSTR(std::u16string_view(text));
}

void KestCdfDate::SetYear(int year) {
    if (year < 1900 || year >= 2301) KestCalmorphDLLError::Raise(reason::kYearOutOfRange);
    m_date.tm_year = year - 1900;
}

void KestCdfDate::SetMonth(int month) {
    if (month < 1 || month > 12) KestCalmorphDLLError::Raise(reason::kMonthOutOfRange);
    m_date.tm_mon = month - 1;
}

void KestCdfDate::SetDay(int day) {
    // No calendar has a day 0, and the text form cannot express one.
    if (day < 1 || day > 31) KestCalmorphDLLError::Raise(reason::kDayOutOfRange);
    m_date.tm_mday = day;
}

void KestCdfDate::SetHour(int hour) {
    if (hour < 0 || hour > 23) KestCalmorphDLLError::Raise(reason::kHourOutOfRange);
    m_date.tm_hour = hour;
}

void KestCdfDate::SetMinute(int minute) {
    if (minute < 0 || minute > 59) KestCalmorphDLLError::Raise(reason::kMinuteOutOfRange);
    m_date.tm_min = minute;
}

void KestCdfDate::SetSecond(int second) {
    if (second < 0 || second > 59) KestCalmorphDLLError::Raise(reason::kSecondOutOfRange);
    m_date.tm_sec = second;
}

}  // namespace kest
