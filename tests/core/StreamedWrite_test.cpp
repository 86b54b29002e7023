// The streamed write against the document built and saved: the same bytes, or the same refusal,
// for every tree the test files, the examples and the fuzz corpora read into.
#include "core/KestCalmorph.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "support/TestFiles.h"

using namespace kest;
namespace fs = std::filesystem;

namespace {

// What a write gave: the file's bytes (or its absence) after it, or the refusal.
std::string Outcome(const std::string& path, const std::function<bool()>& write) {
    std::string result;
    try {
        result = write() ? "saved" : "not saved";
    } catch (const KestCalmorphDLLError& error) {
        result = "reason " + std::to_string(error.GetReason()) + " " +
                 error.GetReasonString().ToString();
    } catch (const _com_error& error) {
        result = "com " + std::to_string(error.Error()) + " " + error.ErrorMessage();
    }
    std::error_code ec;
    return result + "\n" + (fs::is_regular_file(path, ec) ? test::ReadWholeFile(path) : "-");
}

std::string DomWrite(const KestCdfCalData& tree, const std::string& path, const char16_t* comment,
                     bool indent) {
    return Outcome(path, [&] {
        KestCdfCalData copy = tree;
        IXMLDOMDocument2Ptr doc;
        if (FAILED(doc.CreateInstance(kProgIdDOMDocument40))) return false;
        if (indent) doc->setProperty(_bstr_t(u"Indent"), _variant_t(true));
        IXMLDOMNodePtr declaration =
            doc->createNode(_variant_t(static_cast<int>(NODE_PROCESSING_INSTRUCTION)),
                            _bstr_t(u"xml"), _bstr_t(u""));
        IXMLDOMAttributePtr encoding = doc->createAttribute(_bstr_t(u"encoding"));
        encoding->PutnodeValue(_variant_t(u"UTF-8"));
        declaration->Getattributes()->setNamedItem(encoding);
        doc->appendChild(declaration);
        copy.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR(comment));
        if (path.empty()) return false;
        doc->save(_variant_t(CComBSTR(path).m_str));
        return true;
    });
}

std::string StreamWrite(const KestCdfCalData& tree, const std::string& path,
                        const char16_t* comment, bool indent) {
    return Outcome(path, [&] {
        KestCalmorph converter;
        KestWriteOptions options;
        options.indent = indent;
        converter.SetWriteOptions(options);
        return converter.ConvertCPPToXML(tree, CComBSTR(path), CComBSTR(comment));
    });
}

std::vector<std::string> InputFiles() {
    std::vector<std::string> files{std::string(KEST_SOURCE_DIR) + "/examples/sample.cdf"};
    for (const char* dir : {"/tests/data", "/fuzz/corpus"})
        for (const auto& entry :
             fs::recursive_directory_iterator(KEST_SOURCE_DIR + std::string(dir)))
            if (entry.is_regular_file() &&
                (entry.path().extension() == ".cdf" || entry.path().extension() == ".xml" ||
                 entry.path().extension().empty()))
                files.push_back(entry.path().string());
    return files;
}

}  // namespace

TEST(StreamedWrite, WritesTheBytesOfTheBuiltDocument) {
    test::ScratchDir dir;
    int trees = 0;
    for (const std::string& file : InputFiles()) {
        SCOPED_TRACE(file);
        KestCalmorph reader;
        KestReadOptions options;
        options.validate = false;
        reader.SetReadOptions(options);
        CComBSTR message;
        KestCdfCalData tree;
        try {
            tree = reader.ConvertXMLtoCPP(CComBSTR(file), true, message);
        } catch (...) {
            continue;  // a file whose walk fails gives no tree
        }
        ++trees;
        for (bool indent : {false, true})
            for (const char16_t* comment : {u"", u"a -- comment-"}) {
                fs::remove(dir / "dom.cdf");
                fs::remove(dir / "stream.cdf");
                const std::string dom = DomWrite(tree, dir / "dom.cdf", comment, indent);
                EXPECT_EQ(StreamWrite(tree, dir / "stream.cdf", comment, indent), dom);
            }
    }
    EXPECT_GT(trees, 100);
}

TEST(StreamedWrite, RefusesAsTheBuiltDocumentDoes) {
    test::ScratchDir dir;
    KestCalmorph reader;
    CComBSTR message;
    const KestCdfCalData sample = reader.ConvertXMLtoCPP(
        CComBSTR(std::string(KEST_SOURCE_DIR) + "/examples/sample.cdf"), true, message);
    KestCdfCalData control = sample;  // a character no XML 1.0 file can hold
    control.SetFileName(CComBSTR(u"a\x01b"));
    KestCdfCalData marks = sample;
    marks.SetNote(CComBSTR(u"<&>]]>\r\t\"'"));
    // Megabytes reach the file before the last list turns out to have no name.
    KestCdfCalData large = sample;
    const int lists = 1000;
    KestCdfCalList* const array = large.CreateCalList(lists);
    for (int i = 0; i + 1 < lists; ++i) array[i] = sample.GetCalList();
    large.SetCalListSize(lists);
    fs::create_directory(dir / "folder");
    test::WriteWholeFile(dir / "old.cdf", "old");
    const struct {
        const char* label;
        KestCdfCalData tree;
        std::string path;
    } cases[] = {
        {"empty tree", KestCdfCalData(), dir / "old.cdf"},
        {"control character", control, dir / "old.cdf"},
        {"large, refused at its end", large, dir / "old.cdf"},
        {"empty path", sample, ""},
        {"empty tree, empty path", KestCdfCalData(), ""},
        {"directory", sample, dir / "folder"},
        {"missing folder", sample, dir / "none/out.cdf"},
        {"empty tree, missing folder", KestCdfCalData(), dir / "none/out.cdf"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.label);
        const std::string dom = DomWrite(c.tree, c.path, u"", false);
        EXPECT_EQ(StreamWrite(c.tree, c.path, u"", false), dom);
        EXPECT_NE(dom.substr(0, 5), "saved");
    }
    EXPECT_EQ(test::ReadWholeFile(dir / "old.cdf"), "old");
    EXPECT_EQ(std::distance(fs::directory_iterator(dir / ""), fs::directory_iterator()), 2);
    // A comment of megabytes goes out before the root's attributes are known.
    const std::u16string comment(1500000, u'c');
    const std::string escaped = DomWrite(marks, dir / "marks.cdf", comment.c_str(), true);
    EXPECT_EQ(StreamWrite(marks, dir / "marks.cdf", comment.c_str(), true), escaped);
}
