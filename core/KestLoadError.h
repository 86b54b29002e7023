#pragma once
// Why the last read or validation of a KestCalmorph failed, as fields: an extension of the
// converter, so that hosts need not take the message text apart.

#include <string>

namespace kest {

/// A failed load or validation (KestCalmorph::GetLastLoadError). `code` 0 means the last
/// read or validation loaded fine.
struct KestLoadError {
    /// 0 when the last read/validation loaded fine; else the parse or validation code.
    long code = 0;
    /// 1-based line and column; 0 when unknown.
    long line = 0, column = 0;
    /// Byte offset in the file; -1 when unknown.
    long long offset = -1;
    /// The path as given ("-" for standard input).
    std::string file;
    /// The reason alone, without the position, element names as written in the file.
    std::string reason;
    /// What to do, when something can be done ("save the file as UTF-8").
    std::string hint;
};

}  // namespace kest
