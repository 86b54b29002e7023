#include "platform/ComPtr.h"

#include <gtest/gtest.h>

using namespace kest;

namespace {

class Probe : public RefCounted {
  public:
    int Answer() const { return 42; }
};

}  // namespace

TEST(ComPtr, LiveObjectsCountsConstructionAndFinalRelease) {
    long before = RefCounted::LiveObjects();
    {
        ComPtr<Probe> first(new Probe);
        EXPECT_EQ(RefCounted::LiveObjects(), before + 1);
        ComPtr<Probe> second = first;
        ComPtr<Probe> third(new Probe);
        EXPECT_EQ(RefCounted::LiveObjects(), before + 2);
        first = nullptr;
        EXPECT_EQ(RefCounted::LiveObjects(), before + 2);  // second still holds it
        second = third;
        EXPECT_EQ(RefCounted::LiveObjects(), before + 1);
        EXPECT_EQ(second->Answer(), 42);
    }
    EXPECT_EQ(RefCounted::LiveObjects(), before);
}

TEST(ComPtr, EmptyPointerThrowsEPointer) {
    ComPtr<Probe> empty;
    try {
        empty->Answer();
        ADD_FAILURE() << "no exception";
    } catch (const _com_error& error) {
        EXPECT_EQ(error.Error(), E_POINTER);
    }
}
