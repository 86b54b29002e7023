// The converter's read and write pipelines, driven through files.
#include "core/KestCalmorph.h"

#include <gtest/gtest.h>
#include <pthread.h>

#include <cstdlib>
#include <functional>
#include <sstream>
#include <string>
#include <vector>

#include "model/KestCdfCalData.h"
#include "model/ModelTestDom.h"
#include "support/TestFiles.h"

namespace fs = std::filesystem;
using namespace kest;
using test::ReadWholeFile;
using test::ScratchDir;
using test::WriteWholeFile;

namespace {

const std::string kSample = std::string(KEST_SOURCE_DIR) + "/examples/sample.cdf";

KestCdfCalData Read(KestCalmorph& converter, const std::string& path) {
    CComBSTR message;
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
    EXPECT_EQ(message.ToString(), "") << path;
    return data;
}

// The tree the converter holds, without loading anything.
KestCdfCalData Held(KestCalmorph& converter) {
    CComBSTR message;
    return converter.ConvertXMLtoCPP(CComBSTR(), false, message);
}

// A CAL-DATA element whose three attributes (taken by position) name no schema to follow.
std::string CalData(const std::string& fileName) {
    return "<CAL-DATA n=\"urn:ns\" i=\"urn:instance\" l=\"none.xsd\"><FILENAME>" + fileName +
           "</FILENAME></CAL-DATA>";
}

std::string Nested(int depth, const std::string& inner) {
    std::string text;
    for (int i = 0; i < depth; ++i) text += "<d>";
    text += inner;
    for (int i = 0; i < depth; ++i) text += "</d>";
    return text;
}

std::string Str(const CComBSTR& text) { return text == nullptr ? "<null>" : text.ToString(); }
std::string Str(const KestCdfNormalizedString& text) { return Str(text.m_string); }

// Every field of a tree: texts as one line per element, values as they are held.
std::string Flatten(const KestCdfCalData& d, std::vector<_variant_t>& values) {
    std::ostringstream o;
    o << Str(d.GetNamespace()) << '|' << Str(d.GetSchemaInstance()) << '|'
      << Str(d.GetSchemaLocation()) << '|' << Str(d.GetFileName()) << '|' << Str(d.GetCompany())
      << '|' << Str(d.GetNote()) << '\n';
    KestCdfChangeHistory h = d.GetChangeHistory();
    for (int i = 0; i < h.GetChangeArraySize(); ++i) {
        const KestCdfChange& c = h.GetChange()[i];
        o << "change " << Str(c.GetUserNameW()) << '|' << Str(c.GetDate().CreateTimeString()) << '|'
          << Str(c.GetTool()) << '|' << Str(c.GetNote()) << '|' << Str(c.GetDataVersion()) << '\n';
    }
    for (int i = 0; i < d.GetCalListSize(); ++i) {
        const KestCdfCalList& l = d.GetCalLists()[i];
        o << "list " << Str(l.GetName()) << '|' << Str(l.GetNote()) << '|'
          << Str(l.GetSymbolicFile().GetSymbolicFile()) << '|' << l.GetSymbolicFile().GetCrc()
          << '|' << Str(l.GetTargetImage().GetTargetImage()) << '|' << l.GetTargetImage().GetCrc()
          << '\n';
        for (int j = 0; j < l.GetCalItemSize(); ++j) {
            const KestCdfCalItem& item = l.GetCalItems()[j];
            KestCdfCalItemValue v = item.GetCalItemValue();
            o << "item " << Str(item.GetName()) << '|' << Str(item.GetAnnotation()) << '|'
              << Str(item.GetNote()) << '|' << Str(v.GetUnits()) << '|' << Str(v.GetFormatType())
              << '\n';
            values.push_back(v.GetValue());
            for (int k = 0; k < item.GetAxisSize(); ++k) {
                const KestCdfAxis& x = item.GetAxis()[k];
                o << "axis " << x.GetSize() << '|' << Str(x.GetSwUnits()) << '|'
                  << Str(x.GetFormatType()) << '\n';
                values.push_back(x.GetAxisValue());
            }
        }
    }
    return o.str();
}

std::string Element(const _variant_t& value, LONG index) {
    _variant_t element;
    if (SafeArrayGetElement(value.parray, &index, &element) != S_OK) return "<none>";
    return _bstr_t(element).ToString();
}

}  // namespace

TEST(KestCalmorph, FailedLoadsKeepTheTreeAndReportOnlyWhenAsked) {
    ScratchDir dir;
    WriteWholeFile(dir / "broken.cdf", "<CAL-DATA a=\"1\" b=\"2\" c=\"3\"><FILENAME>x</CAL-DATA>");
    // Deeper than the loader's nesting limit.
    WriteWholeFile(dir / "deeper.xml", Nested(100000, CalData("too deep")));
    struct Row {
        const char* label;
        std::string path;  // empty: a null path
        bool wantMessage;
        bool expectMessage;
    } rows[] = {
        {"null path", "", true, false},
        {"missing file, not asked", dir / "missing.cdf", false, false},
        {"missing file, asked", dir / "missing.cdf", true, true},
        {"not well-formed, asked", dir / "broken.cdf", true, true},
        {"nested too deep, asked", dir / "deeper.xml", true, true},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        KestCalmorph converter;
        Read(converter, kSample);
        CComBSTR message(u"stale");
        CComBSTR path = row.path.empty() ? CComBSTR() : CComBSTR(row.path);
        KestCdfCalData data = converter.ConvertXMLtoCPP(path, row.wantMessage, message);
        EXPECT_NE(message.m_str, nullptr);  // the empty text, never a null one
        EXPECT_EQ(message.Length() != 0, row.expectMessage) << message.ToString();
        EXPECT_EQ(Str(data.GetFileName()), "EC16_base.cdf");
        ASSERT_EQ(data.GetCalListSize(), 2);
        EXPECT_EQ(Str(data.GetCalLists()[1].GetName()), "Diagnostics");
    }
    // The argumentless conversion gives a default tree and leaves the converter's alone.
    KestCalmorph converter;
    Read(converter, kSample);
    KestCdfCalData fresh = converter.ConvertCPPToXML();
    EXPECT_EQ(fresh.GetCalListSize(), 0);
    EXPECT_EQ(fresh.GetFileName().m_string, nullptr);
    EXPECT_EQ(Held(converter).GetCalListSize(), 2);
}

TEST(KestCalmorph, ConvertsCalDataOutsideChangeHistoryAndItemsOnly) {
    struct Row {
        const char* label;
        std::string document;
        const char* fileName;  // "<null>": nothing converted; nullptr: reason code 42
    } rows[] = {
        {"root", CalData("root"), "root"},
        {"below another element", "<w><g>" + CalData("nested") + "</g></w>", "nested"},
        {"deep inside CAL-ITEM", "<w><CAL-ITEM><x>" + CalData("item") + "</x></CAL-ITEM></w>",
         "<null>"},
        {"inside CHANGE-HISTORY", "<w><CHANGE-HISTORY>" + CalData("h") + "</CHANGE-HISTORY></w>",
         "<null>"},
        {"prefixed name is another element",
         "<w><p:CAL-DATA xmlns:p=\"urn:p\" a=\"1\" b=\"2\"><FILENAME>p</FILENAME></p:CAL-DATA></w>",
         "<null>"},
        {"second in document order wins",
         "<w>" + CalData("first") + "<g>" + CalData("second") + "</g></w>", "second"},
        {"a skipped sibling does not stop the walk",
         "<w><CAL-ITEM/><CHANGE-HISTORY/>" + CalData("after") + "</w>", "after"},
        {"root with two attributes", "<CAL-DATA a=\"1\" b=\"2\"/>", nullptr},
        {"nested root without attributes", "<w><g><CAL-DATA/></g></w>", nullptr},
    };
    ScratchDir dir;
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        WriteWholeFile(dir / "doc.xml", row.document);
        KestCalmorph converter;
        CComBSTR message(u"before");
        try {
            KestCdfCalData data =
                converter.ConvertXMLtoCPP(CComBSTR(dir / "doc.xml"), true, message);
            EXPECT_EQ(Str(data.GetFileName()), row.fileName ? row.fileName : "an error");
            EXPECT_EQ(message.ToString(), "");
        } catch (const KestCalmorphDLLError& error) {
            EXPECT_EQ(row.fileName, nullptr);
            EXPECT_EQ(error.GetReason(), reason::kCalDataAttributeMissing);
            EXPECT_EQ(error.GetReasonString().Length(), 0u);
            EXPECT_EQ(message.ToString(), "before");  // the message is kept
        }
    }
}

TEST(KestCalmorph, WalksDeeplyNestedDocumentsWithoutRecursion) {
    ScratchDir dir;
    WriteWholeFile(dir / "deep.xml", Nested(9000, CalData("deepest")));  // below the loader's limit

    // The whole read (load, walk, conversion, freeing the document) runs on a stack of 512 KiB:
    // a walk that took one call frame per level would need more than 56 bytes per frame.
    KestCalmorph converter;
    std::string result;
    std::function<void()> body = [&] {
        try {
            CComBSTR text;
            KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(dir / "deep.xml"), true, text);
            result = Str(data.GetFileName()) + "|" + text.ToString();
        } catch (...) {
            result = "exception";
        }
    };
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    pthread_attr_setstacksize(&attributes, std::size_t(512) << 10);
    pthread_t thread;
    auto run = [](void* f) -> void* {
        (*static_cast<std::function<void()>*>(f))();
        return nullptr;
    };
    ASSERT_EQ(pthread_create(&thread, &attributes, run, &body), 0);
    pthread_join(thread, nullptr);
    pthread_attr_destroy(&attributes);
    EXPECT_EQ(result, "deepest|");
}

TEST(KestCalmorph, ReadsTheSampleAndWritesItBackFieldForField) {
    ScratchDir dir;
    fs::copy_file(std::string(KEST_SOURCE_DIR) + "/examples/cdf.xsd", dir / "cdf.xsd");
    KestCalmorph converter;
    KestCdfCalData original = Read(converter, kSample);
    std::vector<_variant_t> before, after;
    const std::string sample = Flatten(original, before);
    for (const char* line :
         {"http://kest.dev/schemas/cdf/1.0|http://www.w3.org/2001/XMLSchema-instance|"
          "http://kest.dev/schemas/cdf/1.0 cdf.xsd|EC16_base.cdf|Kest Automotive Engineering|",
          "\nchange sbrandt|2024-04-02T16:05:48|", "\nlist EngineControl|",
          "|979311042|EC16_V0412.hex|", "\nitem TorqueLimit|", "\naxis 4|rpm", "\naxis 3|%",
          "\nlist Diagnostics|", "DIAG_V0107.hex|-1\n"}) {
        EXPECT_NE(sample.find(line), std::string::npos) << line << "\nin\n" << sample;
    }
    const _variant_t map = original.GetCalLists()[0].GetCalItems()[1].GetCalItemValue().GetValue();
    EXPECT_EQ(map.parray->rgsabound[0].cElements, 12u);
    EXPECT_EQ(Element(map, 11), "139.125");
    EXPECT_EQ(Element(original.GetCalLists()[1].GetCalItems()[0].GetCalItemValue().GetValue(), 1),
              "BLINK");

    // Non-ASCII text is stored as UTF-8 and comes back unchanged.
    const std::string note = "Drehmoment \xE2\x89\xA4 150 Nm, \xC3\x96ltemperatur";
    original.SetNote(CComBSTR(note.c_str()));
    const std::string first = dir / "first.cdf", second = dir / "second.cdf";
    ASSERT_TRUE(converter.ConvertCPPToXML(original, CComBSTR(first), CComBSTR(u"c")));
    const std::string text = ReadWholeFile(first);
    EXPECT_EQ(text.rfind("<?xml", 0), 0u) << text.substr(0, 80);
    EXPECT_NE(text.substr(0, text.find("?>")).find("encoding=\"UTF-8\""), std::string::npos);
    EXPECT_NE(text.find("><!--c--><CHANGE-HISTORY>"), std::string::npos);
    EXPECT_NE(text.find(note), std::string::npos);

    // Any XML tool agrees: xmllint accepts the written file and refuses it without FILENAME.
    if (std::system("xmllint --version > /dev/null 2>&1") == 0) {
        const std::string xsd = dir / "cdf.xsd", broken = dir / "broken.cdf";
        const std::string lint = "xmllint --noout --schema '" + xsd + "' ";
        EXPECT_EQ(std::system((lint + "'" + first + "' 2> /dev/null").c_str()), 0);
        const std::size_t from = text.find("<FILENAME>");
        const std::size_t to = text.find("</FILENAME>") + std::string("</FILENAME>").size();
        ASSERT_NE(from, std::string::npos);
        test::WriteWholeFile(broken, text.substr(0, from) + text.substr(to));
        EXPECT_NE(std::system((lint + "'" + broken + "' 2> /dev/null").c_str()), 0);
    }

    KestCalmorph rereader;
    KestCdfCalData reread = Read(rereader, first);
    EXPECT_EQ(Flatten(reread, after), Flatten(original, before = {}));
    ASSERT_EQ(after.size(), before.size());
    for (std::size_t i = 0; i < before.size(); ++i) {
        EXPECT_EQ(after[i].vt, before[i].vt) << "value " << i;
        EXPECT_TRUE(after[i] == before[i]) << "value " << i;
    }
    ASSERT_TRUE(converter.ConvertCPPToXML(reread, CComBSTR(second), CComBSTR(u"c")));
    EXPECT_TRUE(ReadWholeFile(second) == text);

    for (const CComBSTR& none : {CComBSTR(u""), CComBSTR()}) {  // no comment at all
        ASSERT_TRUE(converter.ConvertCPPToXML(reread, CComBSTR(second), none));
        EXPECT_EQ(ReadWholeFile(second).find("<!--"), std::string::npos);
    }
}

TEST(KestCalmorph, FailedWritesLeaveTheDirectoryAsItWas) {
    ScratchDir dir;
    KestCalmorph converter;
    KestCdfCalData data = Read(converter, kSample);
    EXPECT_FALSE(converter.ConvertCPPToXML(data, CComBSTR(u""), CComBSTR(u"c")));
    EXPECT_FALSE(converter.ConvertCPPToXML(data, CComBSTR(), CComBSTR(u"c")));
    EXPECT_THROW(converter.ConvertCPPToXML(data, CComBSTR(dir / "missing/out.cdf"), CComBSTR()),
                 _com_error);
    EXPECT_TRUE(fs::is_empty(dir.Path()));

    // A tree the writer refuses deep inside, after much was built, leaves the old file alone.
    const std::string path = dir / "out.cdf";
    WriteWholeFile(path, "previous content");
    data.GetCalLists()[0].GetCalItems()[1].SetCalItemValue(nullptr);
    test::ExpectDllError([&] { converter.ConvertCPPToXML(data, CComBSTR(path), CComBSTR(u"c")); },
                         reason::kCalItemValueMissing, "TorqueLimit");
    EXPECT_EQ(ReadWholeFile(path), "previous content");
    EXPECT_EQ(std::distance(fs::directory_iterator(dir.Path()), fs::directory_iterator()), 1);
}

TEST(KestCalmorph, CopiesShareTreeAndParkedDocument) {
    KestCalmorph converter;
    EXPECT_FALSE(converter.GetDocumentPointer());
    IXMLDOMDocument2Ptr parked;
    ASSERT_EQ(parked.CreateInstance(kProgIdDOMDocument40), S_OK);
    converter.SetDocumentPointer(parked);
    Read(converter, kSample);

    KestCalmorph copy(converter);
    KestCalmorph assigned;
    assigned = converter;
    for (KestCalmorph* other : {&copy, &assigned}) {
        EXPECT_TRUE(other->GetDocumentPointer() == parked);
        EXPECT_EQ(Held(*other).GetCalLists(), Held(converter).GetCalLists());  // the very lists
    }
    converter.SetDocumentPointer(nullptr);
    EXPECT_FALSE(converter.GetDocumentPointer());
    EXPECT_TRUE(copy.GetDocumentPointer() == parked);
}
