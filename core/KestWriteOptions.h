#pragma once
// KestWriteOptions: how KestCalmorph::ConvertCPPToXML lays out the file it writes.

namespace kest {

struct KestWriteOptions {
    /// One element per line with two-space indentation, so that a line diff of two files shows
    /// the changed items. Off: no white space between elements (the default). Indentation goes
    /// only between elements that hold no text, so reading the file gives the same tree.
    bool indent = false;
};

}  // namespace kest
