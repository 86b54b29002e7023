#include "platform/ComError.h"

#include <gtest/gtest.h>

using namespace kest;

TEST(ComError, MessagesNameTheCode) {
    struct Row {
        HRESULT code;
        const char* description;
        const char* message;
    } rows[] = {
        {E_POINTER, "", "E_POINTER (0x80004003)"},
        {E_OUTOFMEMORY, "", "E_OUTOFMEMORY (0x8007000E)"},
        {DISP_E_TYPEMISMATCH, "not a number", "DISP_E_TYPEMISMATCH (0x80020005): not a number"},
        {XML_E_PARSEFAILED, "", "XML_E_PARSEFAILED (0xC00CE000)"},
        {static_cast<HRESULT>(0x80001234u), "", "HRESULT 0x80001234"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.message);
        _com_error error(row.code, row.description);
        EXPECT_EQ(error.Error(), row.code);
        EXPECT_STREQ(error.ErrorMessage(), row.message);
        EXPECT_STREQ(error.what(), row.message);
        EXPECT_EQ(error.Description(), row.description);
    }
    EXPECT_EQ(HResultName(S_OK), "S_OK (0x00000000)");
    EXPECT_THROW(ThrowIfFailed(E_FAIL), _com_error);
    EXPECT_NO_THROW(ThrowIfFailed(S_FALSE));
}
