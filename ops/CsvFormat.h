#pragma once
// The CSV form of a calibration document, for spreadsheets and data frames: a header row, then
// one row per value element with the columns list, item, format, units, index, x, y, value.
// index counts the item's values from 0; x and y are the points of the first and second axis
// at the value's position (ValueLayout.h), empty where the item has no such axis or its values
// do not follow its axes. Numbers are written by value (FormatNumber), texts as they are.
// Fields are quoted as RFC 4180 says (when they hold a comma, a quote, CR or LF; quotes
// doubled); rows end in CR LF; the text is UTF-8 without a byte-order mark.

#include <string>

#include "../platform/Export.h"

#include "Document.h"

namespace kest {
namespace ops {

KEST_API std::string ExportCsv(const Document& document);

}  // namespace ops
}  // namespace kest
