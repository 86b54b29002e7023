#pragma once
// Helpers shared by the document model tests: documents from inline XML, node lookup, text
// conversions for assertions and checks of the library's error object.

#include <gtest/gtest.h>

#include <string>

#include "platform/Automation.h"
#include "platform/KestCalmorphDLLError.h"
#include "platform/XmlDom.h"
#include "text/KestCdfNormalizedString.h"

namespace kest {
namespace test {

/// A new, empty document with validation off.
inline IXMLDOMDocument2Ptr NewDocument() {
    IXMLDOMDocument2Ptr doc;
    HRESULT hr = doc.CreateInstance(kProgIdDOMDocument40);
    EXPECT_TRUE(SUCCEEDED(hr)) << HResultName(hr);
    doc->Putasync(VARIANT_FALSE);
    doc->PutvalidateOnParse(VARIANT_FALSE);
    return doc;
}

/// The document element of XML text, loaded into `keep`; the test fails when it does not load.
inline IXMLDOMNodePtr RootOf(const std::u16string& xml, IXMLDOMDocument2Ptr& keep) {
    keep = NewDocument();
    if (!keep->loadXML(_bstr_t(xml))) {
        ADD_FAILURE() << "does not load: " << Utf16ToUtf8(xml) << "\n"
                      << _bstr_t(keep->GetparseError()->Getreason()).ToString();
    }
    return keep->GetdocumentElement();
}

/// The first child element of `parent` with this name, or an empty pointer.
inline IXMLDOMNodePtr ChildNamed(const IXMLDOMNodePtr& parent, const std::u16string& name) {
    IXMLDOMNodeListPtr children = parent->GetchildNodes();
    while (IXMLDOMNodePtr child = children->nextNode()) {
        if (child->GetnodeType() == NODE_ELEMENT && child->GetnodeName() == _bstr_t(name)) {
            return child;
        }
    }
    return IXMLDOMNodePtr();
}

/// The names of the child elements of `node`, joined by blanks.
inline std::string ChildNames(const IXMLDOMNodePtr& node) {
    std::string names;
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    while (IXMLDOMNodePtr child = children->nextNode()) {
        if (child->GetnodeType() != NODE_ELEMENT) continue;
        if (!names.empty()) names += ' ';
        names += child->GetnodeName().ToString();
    }
    return names;
}

/// XML text of a node, as UTF-8.
inline std::string XmlOf(const IXMLDOMNodePtr& node) { return node->Getxml().ToString(); }

inline std::string Utf8(const CComBSTR& text) { return text.ToString(); }
inline std::string Utf8(const KestCdfNormalizedString& text) { return text.ToString(); }

inline KestCdfNormalizedString Ns(const char16_t* text) {
    return KestCdfNormalizedString(CComBSTR(text));
}

/// Writes `object` with `write(object, parent, doc)` below a fresh element of a fresh document
/// and returns the first child element written there.
template <class T, class Write>
IXMLDOMNodePtr WriteBelow(T& object, IXMLDOMDocument2Ptr& doc, Write write) {
    doc = NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"PARENT"));
    doc->appendChild(parent);
    write(object, parent, doc);
    IXMLDOMNodePtr child = parent->GetfirstChild();
    while (child && child->GetnodeType() != NODE_ELEMENT) child = child->GetnextSibling();
    return child;
}

/// Reads `xml` into a T, writes it, reads what was written into another T and writes that: both
/// writes must give `expected`.
template <class T, class Read, class Write>
void ExpectRoundTrip(const std::u16string& xml, const std::string& expected, Read read,
                     Write write) {
    IXMLDOMDocument2Ptr source, first, second;
    T once, twice;
    read(once, RootOf(xml, source));
    IXMLDOMNodePtr written = WriteBelow(once, first, write);
    ASSERT_TRUE(written);
    EXPECT_EQ(XmlOf(written), expected);
    read(twice, written);
    IXMLDOMNodePtr again = WriteBelow(twice, second, write);
    ASSERT_TRUE(again);
    EXPECT_EQ(XmlOf(again), expected);
}

/// Runs `action` and checks that it throws KestCalmorphDLLError with this code and text.
template <class Action>
void ExpectDllError(Action action, int code, const std::string& text = std::string()) {
    try {
        action();
        ADD_FAILURE() << "no KestCalmorphDLLError, expected code " << code;
    } catch (const KestCalmorphDLLError& error) {
        EXPECT_EQ(error.GetReason(), code);
        EXPECT_EQ(error.GetReasonString().ToString(), text);
    }
}

/// Reads `xml` with `read(T&, node)` and checks the library error it throws.
template <class T, class Read>
void ExpectReadError(const std::u16string& xml, Read read, int code, const std::string& text) {
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr node = RootOf(xml, doc);
    T object;
    ExpectDllError([&] { read(object, node); }, code, text);
}

/// Runs `action` and checks that it throws _com_error with this code.
template <class Action>
void ExpectComError(Action action, HRESULT code) {
    try {
        action();
        ADD_FAILURE() << "no _com_error, expected " << HResultName(code);
    } catch (const _com_error& error) {
        EXPECT_EQ(error.Error(), code) << error.ErrorMessage();
    }
}

}  // namespace test
}  // namespace kest
