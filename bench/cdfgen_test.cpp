// The generated files must be what the benchmarks claim to measure: valid CDF that the DOM
// loads and the converter reads completely, with the promised mix of values, curves and maps.

#include <gtest/gtest.h>

#include <unistd.h>

#include <cstdio>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "BenchSupport.h"
#include "CdfGen.h"
#include "core/KestCalmorph.h"
#include "model/KestCdfAxis.h"
#include "model/KestCdfCalItem.h"
#include "model/KestCdfCalList.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::bench;

namespace {

class TempDir {
  public:
    TempDir() {
        char pattern[] = "/tmp/kest-cdfgen-XXXXXX";
        const char* made = mkdtemp(pattern);
        if (made) m_path = made;
    }
    ~TempDir() {
        for (const std::string& f : m_files) std::remove(f.c_str());
        if (!m_path.empty()) rmdir(m_path.c_str());
    }
    std::string File(const std::string& name) {
        m_files.push_back(m_path + "/" + name);
        return m_files.back();
    }
    bool ok() const { return !m_path.empty(); }

  private:
    std::string m_path;
    std::vector<std::string> m_files;
};

std::string ReadAll(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream s;
    s << in.rdbuf();
    return s.str();
}

std::string LoadError(const std::string& path, bool validate) {
    IXMLDOMDocument2Ptr doc;
    if (FAILED(doc.CreateInstance(kProgIdDOMDocument40))) return "no DOM document";
    doc->Putasync(VARIANT_FALSE);
    doc->PutvalidateOnParse(validate ? VARIANT_TRUE : VARIANT_FALSE);
    if (doc->load(_variant_t(path)) == VARIANT_TRUE) return "";
    return doc->GetparseError()->Getreason().ToString();
}

}  // namespace

TEST(CdfGen, FilesLoadAndValidateInEveryForm) {
    TempDir dir;
    ASSERT_TRUE(dir.ok());
    CopyFile(KEST_SOURCE_DIR "/schema/cdf.xsd", dir.File("cdf.xsd"));
    struct Row {
        bool schema;
        bool indent;
        int lists;
    };
    for (const Row& row : {Row{true, true, 0}, Row{true, false, 3}, Row{false, true, 2}}) {
        SCOPED_TRACE(std::string(row.schema ? "schema" : "no schema") +
                     (row.indent ? ", indented" : ", one line") + ", lists " +
                     std::to_string(row.lists));
        CdfGenOptions options;
        options.items = 200;
        options.lists = row.lists;
        options.schema = row.schema;
        options.indent = row.indent;
        const std::string path = dir.File("gen.cdf");
        const CdfGenResult r = GenerateCdf(options, path);
        EXPECT_EQ(r.bytes, FileSize(path));
        EXPECT_EQ(r.items, 200);
        EXPECT_EQ(r.values + r.curves + r.maps, 200);
        EXPECT_EQ(LoadError(path, false), "");
        // A file that names cdf.xsd is checked against it while it loads.
        EXPECT_EQ(LoadError(path, true), "");
        const ExpatPassResult expat = ExpatPass(path);
        EXPECT_TRUE(expat.ok) << expat.error;
    }
}

// Guards the test above: loading with validation does refuse a generated file that breaks the
// schema (a CRC in lowercase), so an empty load error there means the file is valid.
TEST(CdfGen, ValidationSeesABrokenFile) {
    TempDir dir;
    ASSERT_TRUE(dir.ok());
    CopyFile(KEST_SOURCE_DIR "/schema/cdf.xsd", dir.File("cdf.xsd"));
    CdfGenOptions options;
    options.items = 20;
    const std::string path = dir.File("broken.cdf");
    GenerateCdf(options, path);
    std::string text = ReadAll(path);
    const std::size_t crc = text.find("crc32=\"0x");
    ASSERT_NE(crc, std::string::npos);
    text.replace(crc + 9, 8, "abcdef12");
    std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
    EXPECT_EQ(LoadError(path, false), "");
    EXPECT_NE(LoadError(path, true), "");
}

TEST(CdfGen, ConverterReadsTheGeneratedMix) {
    TempDir dir;
    ASSERT_TRUE(dir.ok());
    CopyFile(KEST_SOURCE_DIR "/schema/cdf.xsd", dir.File("cdf.xsd"));
    CdfGenOptions options;
    options.items = 400;
    options.lists = 3;
    options.seed = 7;
    const std::string path = dir.File("mix.cdf");
    const CdfGenResult r = GenerateCdf(options, path);

    KestCalmorph converter;
    CComBSTR message;
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
    EXPECT_EQ(message.ToString(), "");
    ASSERT_EQ(data.GetCalListSize(), 3);
    EXPECT_EQ(data.GetChangeHistory().GetChangeArraySize(), 5);
    EXPECT_EQ(data.GetSchemaLocation().ToString(), std::string(kCdfNamespace) + " cdf.xsd");

    long items = 0, values = 0, curves = 0, maps = 0;
    for (int l = 0; l < data.GetCalListSize(); ++l) {
        const KestCdfCalList& list = data.GetCalLists()[l];
        for (int i = 0; i < list.GetCalItemSize(); ++i) {
            const KestCdfCalItem& item = list.GetCalItems()[i];
            ++items;
            const int axes = item.GetAxisSize();
            (axes == 0 ? values : axes == 1 ? curves : maps) += 1;
            for (int a = 0; a < axes; ++a) {
                const unsigned size = item.GetAxis()[a].GetSize();
                EXPECT_GE(size, 8u);
                EXPECT_LE(size, 16u);
            }
        }
    }
    EXPECT_EQ(items, 400);
    EXPECT_EQ(values, r.values);
    EXPECT_EQ(curves, r.curves);
    EXPECT_EQ(maps, r.maps);
    // Roughly the intended mix, so that the file behaves like a real data set.
    EXPECT_GT(values, 180);
    EXPECT_GT(curves, 60);
    EXPECT_GT(maps, 30);
}

TEST(CdfGen, SeedDecidesTheContent) {
    TempDir dir;
    ASSERT_TRUE(dir.ok());
    CdfGenOptions options;
    options.items = 150;
    const std::string a = dir.File("a.cdf"), b = dir.File("b.cdf"), c = dir.File("c.cdf");
    GenerateCdf(options, a);
    GenerateCdf(options, b);
    options.seed = 2;
    GenerateCdf(options, c);
    EXPECT_EQ(ReadAll(a), ReadAll(b));
    EXPECT_NE(ReadAll(a), ReadAll(c));
}

TEST(CdfGen, UnwritablePathIsReported) {
    CdfGenOptions options;
    options.items = 1;
    EXPECT_THROW(GenerateCdf(options, "/nonexistent-dir/x.cdf"), std::runtime_error);
}
