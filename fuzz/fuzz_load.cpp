// Fuzz target: arbitrary bytes through loadBuffer. A document that loads must serialise, walk
// and load again to the same text; a refused one must say why.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "platform/XmlDom.h"

using namespace kest;

namespace {

void Check(bool condition, const char* what) {
    if (!condition) {
        std::fprintf(stderr, "fuzz_load: %s\n", what);
        std::abort();
    }
}

IXMLDOMDocument2Ptr NewDocument() {
    IXMLDOMDocument2Ptr doc;
    Check(doc.CreateInstance(kProgIdDOMDocument40) == S_OK, "document not created");
    doc->PutvalidateOnParse(VARIANT_FALSE);  // no schema is ever fetched while fuzzing
    return doc;
}

// Visits every node and attribute without recursion, reading names, values and text.
void Walk(const IXMLDOMNodePtr& root) {
    IXMLDOMNodePtr node = root->GetfirstChild();
    while (node) {
        node->GetnodeName();
        node->GetnodeValue();
        if (IXMLDOMNamedNodeMapPtr map = node->Getattributes()) {
            while (IXMLDOMNodePtr a = map->nextNode()) {
                a->GetnodeValue();
                a->GetnodeName();
            }
        }
        if (IXMLDOMNodePtr child = node->GetfirstChild()) {
            node = child;
            continue;
        }
        while (node && node != root && !node->GetnextSibling()) node = node->GetparentNode();
        if (!node || node == root) break;
        node = node->GetnextSibling();
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    if (doc->loadBuffer(data, size) != VARIANT_TRUE) {
        IXMLDOMParseErrorPtr error = doc->GetparseError();
        Check(error->GeterrorCode() != 0, "failed load without a code");
        Check(error->Getreason().length() > 0, "failed load without a reason");
        Check(!doc->GetfirstChild(), "failed load left content");
        return 0;
    }
    Walk(doc);
    std::string text = doc->Getxml().ToString();
    IXMLDOMDocument2Ptr again = NewDocument();
    if (again->loadBuffer(text.data(), text.size()) != VARIANT_TRUE) {
        std::fprintf(stderr, "%s\n%s\n", text.c_str(),
                     again->GetparseError()->Getreason().ToString().c_str());
        Check(false, "saved text does not load");
    }
    Check(again->Getxml().ToString() == text, "saved text does not load to the same document");
    return 0;
}
