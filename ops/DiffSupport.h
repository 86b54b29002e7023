#pragma once
// Pieces diff, merge and check share: items keyed by list, name and occurrence, and texts of
// file references and change entries. Not installed.

#include <nlohmann/json.hpp>

#include <optional>
#include <string>
#include <tuple>
#include <vector>

#include "Diff.h"

namespace kest {
namespace ops {
namespace detail {

struct IndexedItem {
    ItemKey key;
    const Item* item = nullptr;
};

/// Every item of `document` in order with its key; names seen twice in a list are appended to
/// `duplicates` ("list/item") once.
std::vector<IndexedItem> IndexItems(const Document& document, std::vector<std::string>& duplicates);

std::string FileRefText(const std::optional<FileRef>& ref);
std::optional<std::string> OptionalFileRef(const std::optional<FileRef>& ref);
std::string ChangeText(const Change& change);

nlohmann::ordered_json ValueJson(const Value& value);
nlohmann::ordered_json OptionalJson(const std::optional<std::string>& text);

}  // namespace detail

inline bool operator<(const ItemKey& x, const ItemKey& y) {
    return std::tie(x.list, x.item, x.occurrence) < std::tie(y.list, y.item, y.occurrence);
}
}  // namespace ops
}  // namespace kest
