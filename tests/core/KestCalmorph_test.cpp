// The converter's read and write pipelines, driven through files.
#include "core/KestCalmorph.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <stdlib.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <sstream>
#include <string>

#include "model/KestCdfCalData.h"

namespace fs = std::filesystem;
using namespace kest;

namespace {

const std::string kExamples = std::string(KEST_SOURCE_DIR) + "/examples";
const std::string kSample = kExamples + "/sample.cdf";

class TempDir {
  public:
    TempDir() {
        std::string pattern = (fs::temp_directory_path() / "kest-calmorph-XXXXXX").string();
        if (!mkdtemp(pattern.data())) throw std::runtime_error("mkdtemp failed");
        m_path = pattern;
    }
    ~TempDir() {
        std::error_code ignored;
        fs::remove_all(m_path, ignored);
    }
    std::string operator/(const std::string& name) const { return (m_path / name).string(); }
    const fs::path& path() const { return m_path; }

  private:
    fs::path m_path;
};

void WriteFile(const std::string& path, const std::string& text) {
    std::ofstream out(path, std::ios::binary);
    out << text;
}

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

KestCdfCalData Read(KestCalmorph& converter, const std::string& path) {
    CComBSTR message;
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
    EXPECT_EQ(message.ToString(), "") << path;
    return data;
}

// A CAL-DATA element whose three attributes (taken by position) carry no schema location the
// loader would try to follow.
std::string CalData(const std::string& fileName) {
    return "<CAL-DATA n=\"urn:ns\" i=\"urn:instance\" l=\"none.xsd\"><FILENAME>" + fileName +
           "</FILENAME></CAL-DATA>";
}

std::string Str(const CComBSTR& text) { return text == nullptr ? "<null>" : text.ToString(); }
std::string Str(const KestCdfNormalizedString& text) { return Str(text.m_string); }

long ElementCount(const _variant_t& value);

void ExpectSameValue(const _variant_t& a, const _variant_t& b, const std::string& what) {
    EXPECT_EQ(a.vt, b.vt) << what;
    EXPECT_TRUE(a == b) << what << ": " << ElementCount(a) << " elements before, "
                        << ElementCount(b) << " after";
}

// Field by field, everything a file carries.
void ExpectSameTree(const KestCdfCalData& a, const KestCdfCalData& b) {
    EXPECT_EQ(Str(a.GetNamespace()), Str(b.GetNamespace()));
    EXPECT_EQ(Str(a.GetSchemaInstance()), Str(b.GetSchemaInstance()));
    EXPECT_EQ(Str(a.GetSchemaLocation()), Str(b.GetSchemaLocation()));
    EXPECT_EQ(Str(a.GetFileName()), Str(b.GetFileName()));
    EXPECT_EQ(Str(a.GetCompany()), Str(b.GetCompany()));
    EXPECT_EQ(Str(a.GetNote()), Str(b.GetNote()));

    KestCdfChangeHistory ha = a.GetChangeHistory();
    KestCdfChangeHistory hb = b.GetChangeHistory();
    ASSERT_EQ(ha.GetChangeArraySize(), hb.GetChangeArraySize());
    for (int i = 0; i < ha.GetChangeArraySize(); ++i) {
        SCOPED_TRACE("change " + std::to_string(i));
        const KestCdfChange& ca = ha.GetChange()[i];
        const KestCdfChange& cb = hb.GetChange()[i];
        EXPECT_EQ(Str(ca.GetUserNameW()), Str(cb.GetUserNameW()));
        EXPECT_EQ(Str(ca.GetDate().CreateTimeString()), Str(cb.GetDate().CreateTimeString()));
        EXPECT_EQ(Str(ca.GetTool()), Str(cb.GetTool()));
        EXPECT_EQ(Str(ca.GetNote()), Str(cb.GetNote()));
        EXPECT_EQ(Str(ca.GetDataVersion()), Str(cb.GetDataVersion()));
    }

    ASSERT_EQ(a.GetCalListSize(), b.GetCalListSize());
    for (int i = 0; i < a.GetCalListSize(); ++i) {
        SCOPED_TRACE("list " + std::to_string(i));
        const KestCdfCalList& la = a.GetCalLists()[i];
        const KestCdfCalList& lb = b.GetCalLists()[i];
        EXPECT_EQ(Str(la.GetName()), Str(lb.GetName()));
        EXPECT_EQ(Str(la.GetNote()), Str(lb.GetNote()));
        EXPECT_EQ(Str(la.GetSymbolicFile().GetSymbolicFile()),
                  Str(lb.GetSymbolicFile().GetSymbolicFile()));
        EXPECT_EQ(la.GetSymbolicFile().GetCrc(), lb.GetSymbolicFile().GetCrc());
        EXPECT_EQ(Str(la.GetTargetImage().GetTargetImage()),
                  Str(lb.GetTargetImage().GetTargetImage()));
        EXPECT_EQ(la.GetTargetImage().GetCrc(), lb.GetTargetImage().GetCrc());
        ASSERT_EQ(la.GetCalItemSize(), lb.GetCalItemSize());
        for (int j = 0; j < la.GetCalItemSize(); ++j) {
            const KestCdfCalItem& ia = la.GetCalItems()[j];
            SCOPED_TRACE("item " + std::to_string(j) + " " + Str(ia.GetName()));
            const KestCdfCalItem& ib = lb.GetCalItems()[j];
            EXPECT_EQ(Str(ia.GetName()), Str(ib.GetName()));
            EXPECT_EQ(Str(ia.GetAnnotation()), Str(ib.GetAnnotation()));
            EXPECT_EQ(Str(ia.GetNote()), Str(ib.GetNote()));
            KestCdfCalItemValue va = ia.GetCalItemValue();
            KestCdfCalItemValue vb = ib.GetCalItemValue();
            EXPECT_EQ(Str(va.GetUnits()), Str(vb.GetUnits()));
            EXPECT_EQ(Str(va.GetFormatType()), Str(vb.GetFormatType()));
            ExpectSameValue(va.GetValue(), vb.GetValue(), "value");
            ASSERT_EQ(ia.GetAxisSize(), ib.GetAxisSize());
            for (int k = 0; k < ia.GetAxisSize(); ++k) {
                SCOPED_TRACE("axis " + std::to_string(k));
                const KestCdfAxis& xa = ia.GetAxis()[k];
                const KestCdfAxis& xb = ib.GetAxis()[k];
                EXPECT_EQ(xa.GetSize(), xb.GetSize());
                EXPECT_EQ(Str(xa.GetSwUnits()), Str(xb.GetSwUnits()));
                EXPECT_EQ(Str(xa.GetFormatType()), Str(xb.GetFormatType()));
                ExpectSameValue(xa.GetAxisValue(), xb.GetAxisValue(), "axis value");
            }
        }
    }
}

long ElementCount(const _variant_t& value) {
    if (!(value.vt & VT_ARRAY) || !value.parray) return -1;
    return static_cast<long>(value.parray->rgsabound[0].cElements);
}

std::string Element(const _variant_t& value, LONG index) {
    _variant_t element;
    if (SafeArrayGetElement(value.parray, &index, &element) != S_OK) return "<none>";
    return _bstr_t(element).ToString();
}

}  // namespace

// --------------------------------------------------------------------------------------------
// Reading

TEST(KestCalmorph, ReadsEveryPartOfTheSample) {
    KestCalmorph converter;
    KestCdfCalData data = Read(converter, kSample);

    EXPECT_EQ(Str(data.GetNamespace()), "http://kest.dev/schemas/cdf/1.0");
    EXPECT_EQ(Str(data.GetSchemaInstance()), "http://www.w3.org/2001/XMLSchema-instance");
    EXPECT_EQ(Str(data.GetSchemaLocation()), "http://kest.dev/schemas/cdf/1.0 cdf.xsd");
    EXPECT_EQ(Str(data.GetFileName()), "EC16_base.cdf");
    EXPECT_EQ(Str(data.GetCompany()), "Kest Automotive Engineering");

    KestCdfChangeHistory history = data.GetChangeHistory();
    ASSERT_EQ(history.GetChangeArraySize(), 2);
    EXPECT_EQ(Str(history.GetChange()[1].GetUserNameW()), "sbrandt");
    EXPECT_EQ(Str(history.GetChange()[1].GetDate().CreateTimeString()), "2024-04-02T16:05:48");

    ASSERT_EQ(data.GetCalListSize(), 2);
    const KestCdfCalList& engine = data.GetCalLists()[0];
    EXPECT_EQ(Str(engine.GetName()), "EngineControl");
    EXPECT_EQ(engine.GetSymbolicFile().GetCrc(), 0x3A5F19C2);
    EXPECT_EQ(Str(engine.GetTargetImage().GetTargetImage()), "EC16_V0412.hex");
    ASSERT_EQ(engine.GetCalItemSize(), 3);

    const KestCdfCalItem& torque = engine.GetCalItems()[1];
    EXPECT_EQ(Str(torque.GetName()), "TorqueLimit");
    ASSERT_EQ(torque.GetAxisSize(), 2);
    EXPECT_EQ(torque.GetAxis()[0].GetSize(), 4u);
    EXPECT_EQ(torque.GetAxis()[1].GetSize(), 3u);
    _variant_t map = torque.GetCalItemValue().GetValue();
    EXPECT_EQ(ElementCount(map), 12);
    EXPECT_EQ(Element(map, 11), "139.125");

    const KestCdfCalList& diagnostics = data.GetCalLists()[1];
    EXPECT_EQ(diagnostics.GetTargetImage().GetCrc(), -1);
    _variant_t lamp = diagnostics.GetCalItems()[0].GetCalItemValue().GetValue();
    ASSERT_EQ(ElementCount(lamp), 3);
    EXPECT_EQ(Element(lamp, 1), "BLINK");
    _variant_t label = diagnostics.GetCalItems()[1].GetCalItemValue().GetValue();
    ASSERT_EQ(ElementCount(label), 1);
    EXPECT_EQ(Element(label, 0), "UDS_ON_CAN");
}

TEST(KestCalmorph, NullPathReturnsTheTreeAndAnEmptyMessage) {
    KestCalmorph converter;
    Read(converter, kSample);
    CComBSTR message(u"stale");
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(), true, message);
    EXPECT_NE(message.m_str, nullptr);  // the empty text, not a null one
    EXPECT_EQ(message.Length(), 0u);
    EXPECT_EQ(Str(data.GetFileName()), "EC16_base.cdf");
    EXPECT_EQ(data.GetCalListSize(), 2);
}

TEST(KestCalmorph, MessageOnlyWhenAskedAndOnlyForFailedLoads) {
    TempDir dir;
    WriteFile(dir / "broken.cdf", "<CAL-DATA a=\"1\" b=\"2\" c=\"3\"><FILENAME>x</CAL-DATA>");
    struct Row {
        const char* label;
        std::string path;
        bool wantMessage;
        bool expectMessage;
    } rows[] = {
        {"missing file, not asked", dir / "missing.cdf", false, false},
        {"missing file, asked", dir / "missing.cdf", true, true},
        {"not well-formed, not asked", dir / "broken.cdf", false, false},
        {"not well-formed, asked", dir / "broken.cdf", true, true},
        {"valid file, asked", kSample, true, false},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        KestCalmorph converter;
        CComBSTR message(u"stale");
        converter.ConvertXMLtoCPP(CComBSTR(row.path), row.wantMessage, message);
        EXPECT_EQ(message.Length() != 0, row.expectMessage) << message.ToString();
    }
}

TEST(KestCalmorph, FailedLoadAfterSuccessfulOneKeepsTheTree) {
    TempDir dir;
    WriteFile(dir / "broken.cdf", "<CAL-DATA><unclosed></CAL-DATA>");
    KestCalmorph converter;
    Read(converter, kSample);
    CComBSTR message;
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(dir / "broken.cdf"), true, message);
    EXPECT_NE(message.Length(), 0u);
    EXPECT_EQ(Str(data.GetFileName()), "EC16_base.cdf");
    ASSERT_EQ(data.GetCalListSize(), 2);
    EXPECT_EQ(Str(data.GetCalLists()[1].GetName()), "Diagnostics");
}

TEST(KestCalmorph, ConvertsCalDataOutsideChangeHistoryAndItemsOnly) {
    struct Row {
        const char* label;
        std::string document;
        const char* fileName;  // nullptr: nothing converted
    } rows[] = {
        {"root", CalData("root"), "root"},
        {"below another element", "<wrapper><group>" + CalData("nested") + "</group></wrapper>",
         "nested"},
        {"inside CAL-ITEM", "<wrapper><CAL-ITEM>" + CalData("item") + "</CAL-ITEM></wrapper>",
         nullptr},
        {"deep inside CAL-ITEM",
         "<wrapper><CAL-ITEM><x><y>" + CalData("item") + "</y></x></CAL-ITEM></wrapper>", nullptr},
        {"inside CHANGE-HISTORY",
         "<wrapper><CHANGE-HISTORY>" + CalData("history") + "</CHANGE-HISTORY></wrapper>", nullptr},
        {"prefixed name is another element",
         "<wrapper><p:CAL-DATA xmlns:p=\"urn:p\" a=\"1\" "
         "b=\"2\"><FILENAME>p</FILENAME></p:CAL-DATA></wrapper>",
         nullptr},
        {"second in document order wins",
         "<wrapper>" + CalData("first") + "<g>" + CalData("second") + "</g></wrapper>", "second"},
        {"a skipped sibling does not stop the walk",
         "<wrapper><CAL-ITEM/><CHANGE-HISTORY/>" + CalData("after") + "</wrapper>", "after"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        TempDir dir;
        WriteFile(dir / "doc.xml", row.document);
        KestCalmorph converter;
        KestCdfCalData data = Read(converter, dir / "doc.xml");
        if (row.fileName) {
            EXPECT_EQ(Str(data.GetFileName()), row.fileName);
            EXPECT_EQ(Str(data.GetNamespace()), "urn:ns");
        } else {
            EXPECT_EQ(data.GetFileName().m_string, nullptr);
            EXPECT_EQ(data.GetNamespace().m_string, nullptr);
        }
    }
}

TEST(KestCalmorph, ConversionErrorsLeaveWithTheirCodeAndKeepTheMessage) {
    struct Row {
        const char* label;
        std::string document;
        int reason;
    } rows[] = {
        {"root with two attributes", "<CAL-DATA a=\"1\" b=\"2\"/>",
         reason::kCalDataAttributeMissing},
        {"nested root with two attributes", "<w><g><CAL-DATA a=\"1\" b=\"2\"/></g></w>",
         reason::kCalDataAttributeMissing},
        {"nested root without attributes", "<w><CAL-DATA/></w>", reason::kCalDataAttributeMissing},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        TempDir dir;
        WriteFile(dir / "doc.xml", row.document);
        KestCalmorph converter;
        CComBSTR message(u"before");
        try {
            converter.ConvertXMLtoCPP(CComBSTR(dir / "doc.xml"), true, message);
            ADD_FAILURE() << "no error";
        } catch (const KestCalmorphDLLError& error) {
            EXPECT_EQ(error.GetReason(), row.reason);
            EXPECT_EQ(error.GetReasonString().Length(), 0u);
        }
        EXPECT_EQ(message.ToString(), "before");
    }
}

namespace {

// Runs `body` on a thread with a small stack, so that a walk that recursed once per level
// would overflow it long before the deepest element.
void RunWithSmallStack(std::size_t stackBytes, const std::function<void()>& body) {
    pthread_attr_t attributes;
    pthread_attr_init(&attributes);
    pthread_attr_setstacksize(&attributes, stackBytes);
    struct Call {
        const std::function<void()>* body;
        static void* Run(void* self) {
            (*static_cast<Call*>(self)->body)();
            return nullptr;
        }
    } call{&body};
    pthread_t thread;
    ASSERT_EQ(pthread_create(&thread, &attributes, &Call::Run, &call), 0);
    pthread_join(thread, nullptr);
    pthread_attr_destroy(&attributes);
}

}  // namespace

TEST(KestCalmorph, WalksDeeplyNestedDocumentsWithoutRecursion) {
    // Just below the loader's default nesting limit.
    const int depth = 9000;
    std::string document;
    document.reserve(depth * 8 + 200);
    for (int i = 0; i < depth; ++i) document += "<d>";
    document += CalData("deepest");
    for (int i = 0; i < depth; ++i) document += "</d>";
    TempDir dir;
    WriteFile(dir / "deep.xml", document);

    // The whole read (load, walk, conversion, freeing the document) runs on a stack of 512 KiB:
    // a walk that took one call frame per level would need more than 56 bytes per frame.
    KestCalmorph converter;
    std::string fileName;
    std::string message;
    RunWithSmallStack(std::size_t(512) << 10, [&] {
        try {
            CComBSTR text;
            KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(dir / "deep.xml"), true, text);
            fileName = Str(data.GetFileName());
            message = text.ToString();
        } catch (...) {
            message = "exception";
        }
    });
    EXPECT_EQ(message, "");
    EXPECT_EQ(fileName, "deepest");
}

TEST(KestCalmorph, NestingBeyondTheLoaderLimitIsALoadFailure) {
    const int depth = 100000;
    std::string document;
    for (int i = 0; i < depth; ++i) document += "<d>";
    document += CalData("too deep");
    for (int i = 0; i < depth; ++i) document += "</d>";
    TempDir dir;
    WriteFile(dir / "deeper.xml", document);

    KestCalmorph converter;
    Read(converter, kSample);
    CComBSTR message;
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(dir / "deeper.xml"), true, message);
    EXPECT_NE(message.Length(), 0u);
    EXPECT_EQ(Str(data.GetFileName()), "EC16_base.cdf");
}

// --------------------------------------------------------------------------------------------
// Writing

TEST(KestCalmorph, ReadWriteReadKeepsEveryField) {
    TempDir dir;
    fs::copy_file(kExamples + "/cdf.xsd", dir / "cdf.xsd");
    KestCalmorph reader;
    KestCdfCalData original = Read(reader, kSample);

    KestCalmorph writer;
    ASSERT_TRUE(writer.ConvertCPPToXML(original, CComBSTR(dir / "first.cdf"), CComBSTR(u"pass 1")));
    KestCalmorph rereader;
    KestCdfCalData reread = Read(rereader, dir / "first.cdf");
    ExpectSameTree(original, reread);

    ASSERT_TRUE(writer.ConvertCPPToXML(reread, CComBSTR(dir / "second.cdf"), CComBSTR(u"pass 1")));
    std::string first = ReadFile(dir / "first.cdf");
    std::string second = ReadFile(dir / "second.cdf");
    EXPECT_FALSE(first.empty());
    auto diverge = std::mismatch(first.begin(), first.end(), second.begin(), second.end());
    std::size_t at = static_cast<std::size_t>(diverge.first - first.begin());
    EXPECT_TRUE(first == second) << "the files differ from byte " << at << ": \""
                                 << first.substr(at < 40 ? 0 : at - 40, 80) << "\" vs \""
                                 << second.substr(at < 40 ? 0 : at - 40, 80) << "\"";
}

TEST(KestCalmorph, WrittenFileStartsWithDeclarationAndComment) {
    TempDir dir;
    KestCalmorph converter;
    KestCdfCalData data = Read(converter, kSample);
    const std::string note = "Drehmoment \xE2\x89\xA4 150 Nm, \xC3\x96ltemperatur";
    data.SetNote(CComBSTR(note.c_str()));

    struct Row {
        const char* label;
        CComBSTR comment;
        bool expectComment;
    } rows[] = {
        {"with comment", CComBSTR(u"written by the test"), true},
        {"empty comment", CComBSTR(u""), false},
        {"null comment", CComBSTR(), false},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        std::string path = dir / "out.cdf";
        ASSERT_TRUE(converter.ConvertCPPToXML(data, CComBSTR(path), row.comment));
        std::string text = ReadFile(path);

        std::string::size_type end = text.find("?>");
        ASSERT_EQ(text.rfind("<?xml", 0), 0u) << text.substr(0, 80);
        ASSERT_NE(end, std::string::npos);
        EXPECT_NE(text.substr(0, end).find("encoding=\"UTF-8\""), std::string::npos);
        EXPECT_NE(text.find(note), std::string::npos) << "note not stored as UTF-8";

        IXMLDOMDocument2Ptr document;
        ASSERT_EQ(document.CreateInstance(kProgIdDOMDocument40), S_OK);
        document->PutvalidateOnParse(VARIANT_FALSE);
        ASSERT_NE(document->load(_variant_t(path)), VARIANT_FALSE);
        IXMLDOMNodePtr first = document->GetdocumentElement()->GetfirstChild();
        if (row.expectComment) {
            EXPECT_EQ(first->GetnodeType(), NODE_COMMENT);
            EXPECT_EQ(_bstr_t(first->GetnodeValue()).ToString(), "written by the test");
        } else {
            EXPECT_EQ(first->GetnodeType(), NODE_ELEMENT);
            EXPECT_EQ(first->GetnodeName().ToString(), "CHANGE-HISTORY");
        }
    }
}

TEST(KestCalmorph, EmptyOutputPathWritesNothing) {
    TempDir dir;
    KestCalmorph converter;
    KestCdfCalData data = Read(converter, kSample);
    data.SetFileName(CComBSTR(u"kept"));
    EXPECT_FALSE(converter.ConvertCPPToXML(data, CComBSTR(u""), CComBSTR(u"c")));
    EXPECT_FALSE(converter.ConvertCPPToXML(data, CComBSTR(), CComBSTR(u"c")));
    EXPECT_TRUE(fs::is_empty(dir.path()));

    // The converter keeps the tree it was given.
    CComBSTR message;
    EXPECT_EQ(Str(converter.ConvertXMLtoCPP(CComBSTR(), false, message).GetFileName()), "kept");
}

TEST(KestCalmorph, UnwritableOutputThrowsComErrorAndCreatesNothing) {
    TempDir dir;
    KestCalmorph converter;
    KestCdfCalData data = Read(converter, kSample);
    std::string path = dir / "missing/out.cdf";
    EXPECT_THROW(converter.ConvertCPPToXML(data, CComBSTR(path), CComBSTR()), _com_error);
    EXPECT_FALSE(fs::exists(dir / "missing"));
    EXPECT_TRUE(fs::is_empty(dir.path()));
}

TEST(KestCalmorph, RefusedTreeLeavesAnExistingFileUntouched) {
    struct Row {
        const char* label;
        std::function<void(KestCdfCalData&)> spoil;
        int reason;
        const char* itemName;
    } rows[] = {
        {"schema instance null",
         [](KestCdfCalData& d) { d.SetSchemaInstance(KestCdfNormalizedString()); },
         reason::kSchemaInstanceMissing, ""},
        {"schema location null",
         [](KestCdfCalData& d) { d.SetSchemaLocation(KestCdfNormalizedString()); },
         reason::kSchemaLocationMissing, ""},
        {"second list without name",
         [](KestCdfCalData& d) { d.GetCalLists()[1].SetName(KestCdfNormalizedString()); },
         reason::kCalListNameMissing, ""},
        {"second list without symbolic file",
         [](KestCdfCalData& d) { d.GetCalLists()[1].SetSymbolicFile(nullptr); },
         reason::kSymbolicFileMissing, ""},
        {"last item without name",
         [](KestCdfCalData& d) {
             d.GetCalLists()[1].GetCalItems()[2].SetName(KestCdfNormalizedString());
         },
         reason::kCalItemNameMissing, ""},
        {"item without value",
         [](KestCdfCalData& d) { d.GetCalLists()[0].GetCalItems()[1].SetCalItemValue(nullptr); },
         reason::kCalItemValueMissing, "TorqueLimit"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        TempDir dir;
        const std::string path = dir / "out.cdf";
        WriteFile(path, "previous content");

        KestCalmorph converter;
        KestCdfCalData data = Read(converter, kSample);
        row.spoil(data);
        try {
            converter.ConvertCPPToXML(data, CComBSTR(path), CComBSTR(u"comment"));
            ADD_FAILURE() << "no error";
        } catch (const KestCalmorphDLLError& error) {
            EXPECT_EQ(error.GetReason(), row.reason);
            EXPECT_EQ(error.GetReasonString().ToString(), row.itemName);
        }
        EXPECT_EQ(ReadFile(path), "previous content");
        EXPECT_EQ(std::distance(fs::directory_iterator(dir.path()), fs::directory_iterator()), 1);
    }
}

TEST(KestCalmorph, ArgumentlessConvertGivesDefaultTreeAndLeavesConverterAlone) {
    KestCalmorph converter;
    Read(converter, kSample);
    KestCdfCalData fresh = converter.ConvertCPPToXML();
    EXPECT_EQ(fresh.GetCalListSize(), 0);
    EXPECT_EQ(fresh.GetFileName().m_string, nullptr);
    CComBSTR message;
    EXPECT_EQ(converter.ConvertXMLtoCPP(CComBSTR(), false, message).GetCalListSize(), 2);
}

TEST(KestCalmorph, CopiesShareTreeAndParkedDocument) {
    KestCalmorph converter;
    EXPECT_FALSE(converter.GetDocumentPointer());

    IXMLDOMDocument2Ptr parked;
    ASSERT_EQ(parked.CreateInstance(kProgIdDOMDocument40), S_OK);
    converter.SetDocumentPointer(parked);
    EXPECT_TRUE(converter.GetDocumentPointer() == parked);
    Read(converter, kSample);

    KestCalmorph copy(converter);
    KestCalmorph assigned;
    assigned = converter;
    for (KestCalmorph* other : {&copy, &assigned}) {
        EXPECT_TRUE(other->GetDocumentPointer() == parked);
        CComBSTR message;
        KestCdfCalData data = other->ConvertXMLtoCPP(CComBSTR(), false, message);
        ASSERT_EQ(data.GetCalListSize(), 2);
        // The copy refers to the very lists of the original.
        CComBSTR unused;
        EXPECT_EQ(data.GetCalLists(),
                  converter.ConvertXMLtoCPP(CComBSTR(), false, unused).GetCalLists());
    }
    converter.SetDocumentPointer(nullptr);
    EXPECT_FALSE(converter.GetDocumentPointer());
    EXPECT_TRUE(copy.GetDocumentPointer() == parked);
}
