#pragma once
// Helpers shared by the DOM tests.

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "platform/XmlDom.h"
#include "support/TestFiles.h"

namespace kest {
namespace testing {

using test::ReadWholeFile;
using test::ScratchDir;
using test::WriteWholeFile;

inline IXMLDOMDocument2Ptr NewDocument() {
    IXMLDOMDocument2Ptr doc;
    EXPECT_EQ(doc.CreateInstance(kProgIdDOMDocument40), S_OK);
    return doc;
}

inline std::string Utf8Of(const _bstr_t& text) { return text.ToString(); }

inline std::string ReasonOf(const IXMLDOMDocument2Ptr& doc) {
    return doc->GetparseError()->Getreason().ToString();
}

inline IXMLDOMDocument2Ptr Parsed(const std::string& xml) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    doc->PutvalidateOnParse(VARIANT_FALSE);
    EXPECT_EQ(doc->loadBuffer(xml.data(), xml.size()), VARIANT_TRUE) << ReasonOf(doc);
    return doc;
}

/// The HRESULT a call throws, S_OK when it returns.
inline HRESULT CodeOf(const std::function<void()>& call) {
    try {
        call();
    } catch (const _com_error& e) {
        return e.Error();
    }
    return S_OK;
}

/// Names in a folder, to see that no temporary file stays behind.
inline std::vector<std::string> Entries(const ScratchDir& dir) {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(dir.Path()))
        names.push_back(entry.path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
}

}  // namespace testing
}  // namespace kest
