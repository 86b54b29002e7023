#include <gtest/gtest.h>

#include <set>
#include <string>

#include "platform/KestCalmorphDLLError.h"

using namespace kest;

TEST(ReasonText, EveryRaisedCodeHasItsOwnTextAndOthersAreUnknown) {
    const std::string unknown = "unknown reason";
    std::set<std::string> texts;
    for (int code = -1; code <= 46; ++code) {
        SCOPED_TRACE(code);
        bool raised = code == 0 || (code >= 11 && code <= 45 && code != 28 && code != 43);
        std::string text = ReasonText(code);
        if (raised) {
            EXPECT_NE(text, unknown);
            EXPECT_TRUE(texts.insert(text).second) << "shared text " << text;
        } else {
            EXPECT_EQ(text, unknown);
        }
    }
}
