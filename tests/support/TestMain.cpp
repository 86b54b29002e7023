// Test entry point: after every test, no platform object may be left alive.
#include <gtest/gtest.h>

#include "platform/ComPtr.h"
#include "platform/detail/DomDocument.h"

namespace {

class LiveObjectCheck : public ::testing::EmptyTestEventListener {
    long m_before = 0;
    long m_documentsBefore = 0;
    void OnTestStart(const ::testing::TestInfo&) override {
        m_before = kest::RefCounted::LiveObjects();
        m_documentsBefore = kest::detail::LiveDocuments();
    }
    void OnTestEnd(const ::testing::TestInfo& info) override {
        long after = kest::RefCounted::LiveObjects();
        EXPECT_EQ(m_before, after)
            << "platform objects leaked by " << info.test_suite_name() << "." << info.name();
        EXPECT_EQ(m_documentsBefore, kest::detail::LiveDocuments())
            << "DOM documents leaked by " << info.test_suite_name() << "." << info.name();
    }
};

}  // namespace

int main(int argc, char** argv) {
    ::testing::InitGoogleTest(&argc, argv);
    ::testing::UnitTest::GetInstance()->listeners().Append(new LiveObjectCheck);
    return RUN_ALL_TESTS();
}
