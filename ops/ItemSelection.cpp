#include "ItemSelection.h"

namespace kest {
namespace ops {

namespace {

// Iterative glob match with one backtrack point: linear in practice, never exponential.
bool GlobMatches(const std::string& pattern, const std::string& name) {
    std::size_t p = 0, n = 0, starP = std::string::npos, starN = 0;
    while (n < name.size()) {
        if (p < pattern.size() && (pattern[p] == '?' || pattern[p] == name[n])) {
            ++p;
            ++n;
        } else if (p < pattern.size() && pattern[p] == '*') {
            starP = p++;
            starN = n;
        } else if (starP != std::string::npos) {
            p = starP + 1;
            n = ++starN;
        } else {
            return false;
        }
    }
    while (p < pattern.size() && pattern[p] == '*') ++p;
    return p == pattern.size();
}

}  // namespace

bool NameMatches(const std::string& pattern, const std::string& name) {
    if (pattern.find_first_of("*?") == std::string::npos) return pattern == name;
    return GlobMatches(pattern, name);
}

ItemSelection SelectItems(const Document& document, const std::vector<std::string>& patterns,
                          const std::string& list) {
    ItemSelection selection;
    std::vector<bool> used(patterns.size(), false);
    for (std::size_t l = 0; l < document.lists.size(); ++l) {
        const CalList& calList = document.lists[l];
        if (!list.empty() && calList.name.value_or(std::string()) != list) continue;
        for (std::size_t i = 0; i < calList.items.size(); ++i) {
            const std::string name = calList.items[i].name.value_or(std::string());
            bool picked = patterns.empty();
            for (std::size_t k = 0; k < patterns.size(); ++k) {
                if (NameMatches(patterns[k], name)) {
                    picked = true;
                    used[k] = true;
                }
            }
            if (picked) selection.items.push_back(ItemRef{&calList, &calList.items[i], l, i});
        }
    }
    for (std::size_t k = 0; k < patterns.size(); ++k)
        if (!used[k]) selection.unmatched.push_back(patterns[k]);
    return selection;
}

}  // namespace ops
}  // namespace kest
