#include "platform/detail/DomNames.h"

#include <gtest/gtest.h>

using namespace kest::detail;

TEST(DomNames, Utf8EncodingNamesInAnyCase) {
    const struct {
        const char* name;
        bool utf8;
    } rows[] = {{"UTF-8", true},   {"utf-8", true},   {"Utf8", true},   {"UTF8", true},
                {"UTF-16", false}, {"utf-88", false}, {"utf_8", false}, {"utf", false},
                {"", false},       {"latin1", false}, {"UTF-", false}};
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        EXPECT_EQ(IsUtf8EncodingName(row.name), row.utf8);
    }
}
