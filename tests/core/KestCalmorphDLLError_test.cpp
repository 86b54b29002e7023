#include "platform/KestCalmorphDLLError.h"

#include <gtest/gtest.h>

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
