#pragma once
// Reading and writing trees for the ops tests: data files are read beside a copy of the schema.

#include <filesystem>
#include <string>

#include "core/KestCalmorph.h"
#include "support/TestFiles.h"

namespace kest {
namespace test {

/// The files every form is tried on.
inline const char* const kOpsDataFiles[] = {"examples/sample.cdf",
                                            "tests/data/ops/edge.cdf",
                                            "tests/data/schema/valid-compact.cdf",
                                            "tests/data/schema/valid-indented.cdf"};

/// Reads a file of the source tree (a path relative to it) beside a copy of cdf.xsd.
inline KestCdfCalData ReadSourceFile(const std::string& relative, const ScratchDir& dir) {
    const std::string source = std::string(KEST_SOURCE_DIR) + "/" + relative;
    const std::string copy = dir / std::filesystem::path(relative).filename().string();
    std::filesystem::copy_file(source, copy, std::filesystem::copy_options::overwrite_existing);
    std::filesystem::copy_file(std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd", dir / "cdf.xsd",
                               std::filesystem::copy_options::overwrite_existing);
    KestCalmorph converter;
    CComBSTR message;
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(copy), true, message);
    if (message.Length() != 0) throw std::runtime_error(copy + ": " + message.ToString());
    return data;
}

/// The bytes ConvertCPPToXML writes for the tree, or the reason code it refuses the tree with.
inline std::string WrittenBytes(const KestCdfCalData& data, const ScratchDir& dir,
                                bool indent = false) {
    KestCalmorph converter;
    KestWriteOptions options;
    options.indent = indent;
    converter.SetWriteOptions(options);
    const std::string out = dir / "written.cdf";
    try {
        converter.ConvertCPPToXML(data, CComBSTR(out), CComBSTR());
    } catch (const KestCalmorphDLLError& error) {
        return "refused with reason code " + std::to_string(error.GetReason());
    }
    return ReadWholeFile(out);
}

}  // namespace test
}  // namespace kest
