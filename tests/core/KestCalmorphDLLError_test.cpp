#include "platform/KestCalmorphDLLError.h"

#include <gtest/gtest.h>

#include <set>

using namespace kest;

TEST(KestCalmorphDLLError, StartsEmptyAndCopiesNeverShareTheirText) {
    KestCalmorphDLLError error, assigned;
    EXPECT_EQ(error.GetReason(), 0);
    EXPECT_EQ(error.GetReasonString().Length(), 0u);
    error.SetReason(45);
    error.SetReasonString(CComBSTR(u"abc"));
    KestCalmorphDLLError copy(error);
    assigned = error;
    EXPECT_EQ(copy.GetReason(), 45);
    EXPECT_EQ(assigned.GetReasonString(), CComBSTR(u"abc"));
    copy.SetReasonString(CComBSTR(u"changed"));
    assigned.SetReasonString(CComBSTR(u"item"));
    EXPECT_EQ(error.GetReasonString(), CComBSTR(u"abc"));
}

TEST(KestCalmorphDLLError, RaiseThrowsTheCodeWithEmptyText) {
    try {
        KestCalmorphDLLError::Raise(reason::kHourOutOfRange);
        FAIL() << "no exception";
    } catch (const KestCalmorphDLLError& error) {
        EXPECT_EQ(error.GetReason(), 37);
        EXPECT_EQ(error.GetReasonString().Length(), 0u);
    }
}

TEST(KestCalmorphDLLError, ReasonCodesAreDistinct) {
    const int codes[] = {reason::kCalDataNotConverted,   reason::kAxisAttributeMissing,
                         reason::kCalItemReadFailed,     reason::kWalkFailed,
                         reason::kCalListReadFailed,     reason::kCalDataReadFailed,
                         reason::kCalDataNotAttribute,   reason::kTargetImageNotAttribute,
                         reason::kSymbolicFileAttribute, reason::kValueNotAttribute,
                         reason::kAxisNoAttributeMap,    reason::kNewElementRefused,
                         reason::kNewElementFailed,      reason::kSchemaInstanceMissing,
                         reason::kSchemaLocationMissing, reason::kSymbolicFileMissing,
                         reason::kAxisValueEmpty,        reason::kAxisWriteNoAttributeMap,
                         reason::kCalItemValueMissing,   reason::kCalListNameMissing,
                         reason::kCalItemNameMissing,    reason::kCalItemSizeUnset,
                         reason::kChangeCountUnset,      reason::kYearOutOfRange,
                         reason::kMonthOutOfRange,       reason::kDayOutOfRange,
                         reason::kHourOutOfRange,        reason::kMinuteOutOfRange,
                         reason::kSecondOutOfRange,      reason::kDateTextLength,
                         reason::kCalDataNoAttributeMap, reason::kCalDataAttributeMissing,
                         reason::kSchemaNotLoaded,       reason::kSchemaLocationAbsent};
    std::set<int> seen;
    for (int code : codes) {
        SCOPED_TRACE(code);
        EXPECT_TRUE(seen.insert(code).second) << "duplicate code";
        EXPECT_FALSE((code >= 1 && code <= 10) || code == 28 || code == 43) << "never raised";
    }
}
