// Every value a file holds survives a read, a write and a read again: numbers the "%.15g" text
// would change, infinities, NaN, negative zero, numbers beyond 32 bits, empty STRING and LABEL
// lists, and a root that declares its namespaces in another order.
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "core/KestCalmorph.h"
#include "support/TestFiles.h"

namespace kest {
namespace {

const std::string kRoot =
    "<CAL-DATA xmlns=\"http://kest.dev/schemas/cdf/1.0\" "
    "xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
    "xsi:schemaLocation=\"http://kest.dev/schemas/cdf/1.0 cdf.xsd\">";

std::string File(const std::string& root, const std::string& itemContent) {
    return "<?xml version=\"1.0\"?>\n" + root +
           "<CHANGE-HISTORY/><FILENAME>f</FILENAME><CAL-LIST><NAME>L</NAME>"
           "<SYMBOLIC-FILE crc32=\"0x00000001\">s</SYMBOLIC-FILE><CAL-ITEM><NAME>K</NAME>\n" +
           itemContent + "</CAL-ITEM></CAL-LIST></CAL-DATA>";
}

class Pipeline {
  public:
    Pipeline() { m_dir.Write("cdf.xsd", test::ReadWholeFile(KEST_SOURCE_DIR "/schema/cdf.xsd")); }
    // Reads `name`, writes the tree to `out`; returns the written text.
    std::string Convert(const std::string& name, const std::string& out) {
        CComBSTR message;
        m_tree = m_converter.ConvertXMLtoCPP(CComBSTR((m_dir / name).c_str()), true, message);
        EXPECT_EQ(0u, message.Length()) << message.ToString();
        m_converter.ConvertCPPToXML(m_tree, CComBSTR((m_dir / out).c_str()), CComBSTR());
        return test::ReadWholeFile(m_dir / out);
    }
    test::ScratchDir m_dir;
    KestCalmorph m_converter;
    KestCdfCalData m_tree;
};

TEST(ValueSurvival, WriteReadWriteKeepsEveryValue) {
    const std::string kNumeric = "sw-units=\"\" format-type=\"NUMERIC\">";
    const struct Row {
        std::string content;
        std::string written;  // as the first write has it; the second write must equal the first
    } rows[] = {
        // Item values: the first token and tokens with '.' or a name of a non-finite are doubles.
        {"<VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">1.5 1.0e999 -1.0e999 nan -0.0 5</VALUE>",
         ">1.5 inf -inf nan -0.0 5<"},
        {"<VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">0.1 0.30000000000000004 -464.0 "
         "0.3</VALUE>",
         ">0.1 0.30000000000000004 -464 0.3<"},  // "%.15g" kept where it reads back
        {"<VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">"
         "0 2147483647 2147483648 -2147483648 -2147483649 99999999999999999999</VALUE>",
         ">0 2147483647 2147483648.0 -2147483648 -2147483649.0 1.0e+020<"},
        // Axes: one typing for the whole text.
        {"<AXIS size=\"2\" " + kNumeric +
             "1.0 1.0e999</AXIS><VALUE sw-units-ref=\"\" "
             "format-type=\"LABEL\">x</VALUE>",
         ">1 inf<"},
        {"<AXIS size=\"3\" " + kNumeric + "-0.0 2 nan</AXIS><AXIS size=\"1\" " + kNumeric +
             "3000000000</AXIS><VALUE sw-units-ref=\"\" format-type=\"LABEL\">x</VALUE>",
         ">-0.0 2 nan</AXIS><AXIS size=\"1\" sw-units=\"\" format-type=\"NUMERIC\">3000000000.0<"},
        // Empty STRING and LABEL lists read back as the setter's value for the empty text.
        {"<AXIS size=\"0\" sw-units=\"\" format-type=\"STRING\"></AXIS><AXIS size=\"0\" "
         "sw-units=\"\" format-type=\"LABEL\"/><VALUE sw-units-ref=\"\" format-type=\"LABEL\"/>",
         "format-type=\"STRING\"></AXIS><AXIS size=\"0\" sw-units=\"\" format-type=\"LABEL\">"
         "</AXIS><VALUE sw-units-ref=\"\" format-type=\"LABEL\"></VALUE>"},
        {"<VALUE sw-units-ref=\"\" format-type=\"STRING\"></VALUE>",
         "format-type=\"STRING\">\"\"<"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.content);
        Pipeline pipeline;
        pipeline.m_dir.Write("in.cdf", File(kRoot, row.content));
        const std::string first = pipeline.Convert("in.cdf", "out1.cdf");
        EXPECT_NE(std::string::npos, first.find(row.written)) << first;
        EXPECT_EQ(first, pipeline.Convert("out1.cdf", "out2.cdf"));
    }
}

TEST(ValueSurvival, RootNamespacesAreReadByRole) {
    const struct Row {
        std::string root;
        std::string ns;
    } rows[] = {
        {"<CAL-DATA xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
         "xsi:schemaLocation=\"http://kest.dev/schemas/cdf/1.0 cdf.xsd\" "
         "xmlns=\"http://kest.dev/schemas/cdf/1.0\">",
         "http://kest.dev/schemas/cdf/1.0"},
        {kRoot, "http://kest.dev/schemas/cdf/1.0"},
        // Without a schema-instance prefix on the location the roles are incomplete: positions.
        {"<CAL-DATA xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
         "xmlns=\"http://kest.dev/schemas/cdf/1.0\" "
         "xmlns:q=\"urn:q\" q:schemaLocation=\"x\">",
         "http://www.w3.org/2001/XMLSchema-instance"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.root);
        Pipeline pipeline;
        pipeline.m_dir.Write(
            "in.cdf", File(row.root, "<VALUE sw-units-ref=\"\" format-type=\"LABEL\">x</VALUE>"));
        pipeline.Convert("in.cdf", "out.cdf");
        EXPECT_EQ(row.ns, pipeline.m_tree.GetNamespace().ToString());
    }
}

TEST(ValueSurvival, CountsBeyondALibraryArrayAreRefused) {
    Pipeline pipeline;
    pipeline.m_dir.Write("in.cdf",
                         test::ReadWholeFile(KEST_SOURCE_DIR "/fuzz/corpus/roundtrip/full.cdf"));
    pipeline.Convert("in.cdf", "out.cdf");
    KestCdfCalData& tree = pipeline.m_tree;
    KestCdfCalList& list = tree.GetCalLists()[0];
    KestCdfCalItem& item = list.GetCalItems()[0];
    KestCdfChangeHistory history = tree.GetChangeHistory();
    const std::string out = pipeline.m_dir / "sized.cdf";
    auto write = [&] {
        return pipeline.m_converter.ConvertCPPToXML(tree, CComBSTR(out.c_str()), CComBSTR());
    };
    const std::function<void(int)> setters[] = {[&](int n) { tree.SetCalListSize(n); },
                                                [&](int n) { list.SetCalItemSize(n); },
                                                [&](int n) { item.SetAxisSize(n); },
                                                [&](int n) {
                                                    history.SetChangeArraySize(n);
                                                    tree.SetChangeHistory(history);
                                                }};
    const int lengths[] = {1, 2, 2, 1};
    for (int i = 0; i < 4; ++i) {
        SCOPED_TRACE(i);
        setters[i](lengths[i] + 1);
        try {
            write();
            ADD_FAILURE() << "written";
        } catch (const _com_error& error) {
            EXPECT_EQ(DISP_E_BADINDEX, error.Error());
        }
        setters[i](lengths[i]);
        EXPECT_TRUE(write());
    }
}

TEST(ValueSurvival, HostDoublesOnAnAxisKeepTheirValue) {
    KestCdfAxis axis;
    axis.SetFormatType(KestCdfNormalizedString(CComBSTR(u"NUMERIC")));
    const struct {
        double given;
        VARTYPE vt;
    } rows[] = {{3.0, VT_I4},           {1e-5, VT_R8},          {1e20, VT_R8},
                {0.00005, VT_R8},       {2147483647.0, VT_I4},  {2147483648.0, VT_R8},
                {-2147483648.0, VT_I4}, {-2147483649.0, VT_R8}, {-0.0, VT_R8}};
    for (const auto& row : rows) {
        SCOPED_TRACE(row.given);
        axis.SetAxisValue(_variant_t(row.given));
        _variant_t stored = axis.GetAxisValue();
        const VARIANT& element = static_cast<VARIANT*>(stored.parray->pvData)[0];
        ASSERT_EQ(row.vt, element.vt);
        EXPECT_EQ(row.given, row.vt == VT_I4 ? element.lVal : element.dblVal);
    }
}

TEST(ValueSurvival, NumbersNotTakenWholeAreReported) {
    Pipeline pipeline;
    pipeline.m_dir.Write("in.cdf", File(kRoot,
                                        "<VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">"
                                        "98O 7,60  abc 1.0e999 3000000000 5 \n 2</VALUE>"));
    pipeline.Convert("in.cdf", "out.cdf");
    const std::vector<KestReadWarning>& warnings = pipeline.m_converter.GetReadWarnings();
    // The text starts at line 3, column 46.
    const char* expected[][5] = {{"98O", "98", "partial", "3", "46"},
                                 {"7,60", "7", "partial", "3", "50"},
                                 {"", "0", "empty", "3", "55"},
                                 {"abc", "0", "partial", "3", "56"},
                                 {"1.0e999", "inf", "overflow", "3", "60"},
                                 {"\n", "0", "empty", "3", "81"}};
    ASSERT_EQ(6u, warnings.size());
    for (std::size_t i = 0; i < warnings.size(); ++i) {
        SCOPED_TRACE(expected[i][0]);
        EXPECT_EQ(expected[i][0], warnings[i].token);
        EXPECT_EQ(expected[i][1], warnings[i].valueRead);
        EXPECT_EQ(expected[i][2], warnings[i].kind);
        EXPECT_EQ(std::stol(expected[i][3]), warnings[i].line);
        EXPECT_EQ(std::stol(expected[i][4]), warnings[i].column);
        EXPECT_EQ("K", warnings[i].item);
        EXPECT_EQ(pipeline.m_dir / "in.cdf", warnings[i].file);
    }
    EXPECT_EQ(0u, pipeline.m_converter.GetReadWarningsOmitted());
    // Reset on each read: what the library wrote reads without a word.
    pipeline.Convert("out.cdf", "out2.cdf");
    EXPECT_TRUE(pipeline.m_converter.GetReadWarnings().empty());
    std::string many = "0";
    for (int i = 0; i < 1002; ++i) many += " x";
    pipeline.m_dir.Write(
        "many.cdf",
        File(kRoot, "<VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">" + many + "</VALUE>"));
    pipeline.Convert("many.cdf", "out3.cdf");
    EXPECT_EQ(1000u, pipeline.m_converter.GetReadWarnings().size());
    EXPECT_EQ(2u, pipeline.m_converter.GetReadWarningsOmitted());
}

}  // namespace
}  // namespace kest
