#pragma once
// KestCalmorphDLLError: the one error type the library throws for failures it detects itself.

#include "../platform/CComBSTR.h"
#include "Export.h"

namespace kest {

/// Reason codes carried by KestCalmorphDLLError. Codes 1 to 10, 28 and 43 are never raised.
namespace reason {
constexpr int kCalDataNotConverted = 0;       ///< CAL-DATA reader returned false
constexpr int kAxisAttributeMissing = 11;     ///< AXIS attribute missing or not an attribute
constexpr int kCalItemReadFailed = 12;        ///< other failure while a CAL-ITEM is read
constexpr int kWalkFailed = 13;               ///< other failure while walking the document
constexpr int kCalListReadFailed = 14;        ///< other failure while a CAL-LIST is read
constexpr int kCalDataReadFailed = 15;        ///< other failure while CAL-DATA is read/counted
constexpr int kCalDataNotAttribute = 16;      ///< CAL-DATA attribute node is not an attribute
constexpr int kTargetImageNotAttribute = 17;  ///< TARGET-IMAGE attribute is not an attribute
constexpr int kSymbolicFileAttribute = 18;    ///< SYMBOLIC-FILE attribute missing or wrong
constexpr int kValueNotAttribute = 19;        ///< VALUE attribute node is not an attribute
constexpr int kAxisNoAttributeMap = 20;       ///< AXIS element has no attribute map
constexpr int kNewElementRefused = 21;        ///< DOM refused a new element with E_FAIL
constexpr int kNewElementFailed = 22;         ///< non-DOM failure creating an element
constexpr int kSchemaInstanceMissing = 23;    ///< writing: schema instance is null
constexpr int kSchemaLocationMissing = 24;    ///< writing: schema location is null
constexpr int kSymbolicFileMissing = 25;      ///< writing: list without symbolic file
constexpr int kAxisValueEmpty = 26;           ///< writing: axis value is VT_EMPTY
constexpr int kAxisWriteNoAttributeMap = 27;  ///< writing: new AXIS has no attribute map
constexpr int kCalItemValueMissing = 29;      ///< writing: no value object or VT_EMPTY value
constexpr int kCalListNameMissing = 30;       ///< writing: list name is null
constexpr int kCalItemNameMissing = 31;       ///< writing: item name is null
constexpr int kCalItemSizeUnset = 32;         ///< CreateCalItems with size -1
constexpr int kChangeCountUnset = 33;         ///< CreateChangeList with count -1
constexpr int kYearOutOfRange = 34;           ///< year below 1900 or from 2301 on
constexpr int kMonthOutOfRange = 35;          ///< month outside 1..12
constexpr int kDayOutOfRange = 36;            ///< day outside 1..31
constexpr int kHourOutOfRange = 37;           ///< hour outside 0..23
constexpr int kMinuteOutOfRange = 38;         ///< minute outside 0..59
constexpr int kSecondOutOfRange = 39;         ///< second outside 0..59
constexpr int kDateTextLength = 40;           ///< date text not 19 or 20 characters long
constexpr int kCalDataNoAttributeMap = 41;    ///< CAL-DATA element has no attribute map
constexpr int kCalDataAttributeMissing = 42;  ///< CAL-DATA attribute node missing
constexpr int kSchemaNotLoaded = 44;          ///< data or schema file did not load, code 0
constexpr int kSchemaLocationAbsent = 45;     ///< root has no xsi:schemaLocation
}  // namespace reason

/// A short English text for a reason code, for hosts and tools that show errors to people; an
/// extension: the codes themselves carry no texts. "unknown reason" for a code never raised.
KEST_API const char* ReasonText(int reason) noexcept;

/// A reason code and a reason text. Copies never share their text.
class KEST_API KestCalmorphDLLError {
  public:
    /// Code 0 and an empty text.
    KestCalmorphDLLError() = default;
    KestCalmorphDLLError(const KestCalmorphDLLError& other) = default;
    KestCalmorphDLLError& operator=(const KestCalmorphDLLError& other) = default;
    ~KestCalmorphDLLError() = default;

    /// The reason code.
    int GetReason() const noexcept { return m_reason; }
    void SetReason(int reason) noexcept { m_reason = reason; }
    /// A copy of the reason text (empty unless an item's reader or writer set its name).
    CComBSTR GetReasonString() const { return m_reasonString; }
    void SetReasonString(CComBSTR text) { m_reasonString = text; }

    /// Throws an error with the given code and an empty text.
    [[noreturn]] static void Raise(int reason);

  private:
    int m_reason = 0;
    CComBSTR m_reasonString;
};

}  // namespace kest
