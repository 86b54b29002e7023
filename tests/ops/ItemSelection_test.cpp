// Picking items by exact name or glob, within one list or all.
#include "ops/ItemSelection.h"

#include <gtest/gtest.h>

using namespace kest::ops;

TEST(ItemSelection, NamesMatchExactlyOrAsGlobs) {
    const struct {
        const char* pattern;
        const char* name;
        bool matches;
    } cases[] = {{"Idle", "Idle", true},         {"Idle", "IdleSpeed", false},
                 {"Idle*", "IdleSpeed", true},   {"*Speed*", "IdleSpeedTarget", true},
                 {"Idle?peed", "IdleSpeed", true}, {"Idle?peed", "Idlepeed", false},
                 {"a*b*c", "axxbyyc", true},     {"a*b*c", "axxbyy", false},
                 {"*", "", true},                {"[x]", "[x]", true}};
    for (const auto& c : cases)
        EXPECT_EQ(NameMatches(c.pattern, c.name), c.matches) << c.pattern << " " << c.name;
    // No exponential backtracking on many stars.
    EXPECT_FALSE(NameMatches(std::string(50, '*') + "b", std::string(100000, 'a')));
}

TEST(ItemSelection, PicksInDocumentOrderAndNamesPatternsThatPickNothing) {
    Document document;
    for (const char* list : {"A", "B"}) {
        CalList calList;
        calList.name = list;
        for (const char* item : {"x1", "y", "x2"}) {
            calList.items.emplace_back();
            calList.items.back().name = item;
        }
        document.lists.push_back(calList);
    }
    const ItemSelection all = SelectItems(document, {});
    EXPECT_EQ(all.items.size(), 6u);
    const ItemSelection some = SelectItems(document, {"x*", "x1", "zz"}, "B");
    ASSERT_EQ(some.items.size(), 2u);
    EXPECT_EQ(*some.items[0].item->name + *some.items[1].item->name + *some.items[1].list->name,
              "x1x2B");
    EXPECT_EQ(some.unmatched, std::vector<std::string>{"zz"});
}
