#pragma once
// kest::ops::ReportJson: what the HTML report of a document shows, as one compact JSON text the
// page's script draws from: header, change history, file references with their CRC checks, one
// table row per item (list, name, format, units, dimensions, min, max) and each item's values
// and axes. With an older document beside it, every item carries its state against the old one
// (added, removed, changed, same), the indices of its changed elements and, when changed, the
// old values and axis points, so the page can draw the old curve under the new one.
//
// The text is safe inside an HTML script element: every '<' is written as \u003c, so no name or
// text can end the element or open markup.

#include <string>

#include "../platform/Export.h"

#include "Document.h"

namespace kest {
namespace ops {

/// A document and the path it was read from ("" or "-" when it has no folder to look in).
struct KEST_API ReportSource {
    const Document* document = nullptr;
    std::string path;
};

/// The report data of `current`, compared with `old` when it holds a document.
KEST_API std::string ReportJson(const ReportSource& current, const ReportSource& old = {});

}  // namespace ops
}  // namespace kest
