#pragma once
// KestCdfDate: the local date and time of one change entry, with checked setters and the
// "YYYY-MM-DDThh:mm:ss" text form.

#include <ctime>

#include "../platform/CComBSTR.h"
#include "../platform/Export.h"

namespace kest {

class KEST_API KestCdfDate {
  public:
    /// The current local time (thread-safe conversion).
    KestCdfDate();
    KestCdfDate(const KestCdfDate& other) = default;
    KestCdfDate& operator=(const KestCdfDate& other) = default;
    ~KestCdfDate() = default;

    /// Copy of all nine fields.
    struct tm GetDate() const {
        return m_date;
    }
    /// Copies the nine fields without any check; the pointer must not be null.
    void SetDate(const struct tm* date);
    /// Parses date text (19 or 20 characters); throws KestCalmorphDLLError 34 to 40 on failure,
    /// the fields set before the failing one keep their new values.
    void SetDate(CComBSTR text);
    /// The date as "YYYY-MM-DDThh:mm:ss".
    CComBSTR CreateTimeString() const;

    /// Years since 1900.
    int GetYear() const { return m_date.tm_year; }
    /// Month 1 to 12.
    int GetMonth() const { return m_date.tm_mon + 1; }
    int GetDay() const { return m_date.tm_mday; }
    int GetHour() const { return m_date.tm_hour; }
    int GetMinute() const { return m_date.tm_min; }
    int GetSecond() const { return m_date.tm_sec; }

    /// Full year 1900..2300, else reason 34.
    void SetYear(int year);
    /// 1..12, else reason 35.
    void SetMonth(int month);
    /// 1..31 (no check against the month), else reason 36.
    void SetDay(int day);
    /// 0..23, else reason 37.
    void SetHour(int hour);
    /// 0..59, else reason 38.
    void SetMinute(int minute);
    /// 0..59, else reason 39.
    void SetSecond(int second);

  private:
    struct tm m_date;
};

}  // namespace kest
