#pragma once
// The text `calmorph info` prints for a tree.

#include <kest/calmorph.h>

#include <string>

namespace kest::tool {

/// Prints the header, change history and lists of `data` (read from `file`) to standard output;
/// with `withItems` every item as well.
void PrintInfo(const std::string& file, const KestCdfCalData& data, bool withItems);

}  // namespace kest::tool
