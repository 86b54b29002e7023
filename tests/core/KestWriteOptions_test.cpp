// The writer's indentation option: one element per line, and the same tree when read back.
#include "core/KestWriteOptions.h"

#include <gtest/gtest.h>

#include <sstream>

#include "ops/JsonFormat.h"
#include "ops/OpsTestUtil.h"

using namespace kest;

TEST(KestWriteOptions, IndentPutsOneElementOnEachLine) {
    test::ScratchDir dir;
    const KestCdfCalData tree = test::ReadSourceFile("examples/sample.cdf", dir);
    const std::string plain = test::WrittenBytes(tree, dir);
    EXPECT_EQ(plain.find("\n<CAL-DATA"), plain.find('\n'));  // declaration, root: two lines
    EXPECT_EQ(plain.find('\n', plain.find("\n<CAL-DATA") + 1), plain.size() - 1);

    std::istringstream lines(test::WrittenBytes(tree, dir, true));
    std::string line;
    std::size_t depth = 0;
    int items = 0;
    while (std::getline(lines, line)) {
        const std::size_t start = line.find_first_not_of(' ');
        const bool closes = line.compare(start, 2, "</") == 0;
        const bool leaf = line.find("</", start + 1) != std::string::npos ||
                          line.find("/>") != std::string::npos || line[start + 1] == '?';
        if (closes) --depth;
        EXPECT_EQ(start, depth * 2) << line;
        EXPECT_EQ(line[start], '<') << line;
        if (!closes && !leaf) ++depth;
        items += line.compare(start, 10, "<CAL-ITEM>") == 0;
    }
    EXPECT_EQ(depth, 0u);
    EXPECT_EQ(items, 6);
}

// What a written file reads back as, in JSON form.
std::string ReadBack(const std::string& text, const test::ScratchDir& dir) {
    test::WriteWholeFile(dir / "back.cdf", text);
    KestCalmorph converter;
    CComBSTR message;
    const KestCdfCalData back = converter.ConvertXMLtoCPP(CComBSTR(dir / "back.cdf"), true, message);
    EXPECT_EQ(message.ToString(), "");
    return ops::ExportJson(ops::FromCalData(back));
}

TEST(KestWriteOptions, IndentedFilesReadAsThePlainOnes) {
    for (const char* file : test::kOpsDataFiles) {
        SCOPED_TRACE(file);
        test::ScratchDir dir;
        const KestCdfCalData tree = test::ReadSourceFile(file, dir);
        const std::string plain = test::WrittenBytes(tree, dir);
        if (plain.compare(0, 5, "<?xml") != 0) continue;  // a tree the writer refuses
        EXPECT_EQ(ReadBack(test::WrittenBytes(tree, dir, true), dir), ReadBack(plain, dir));
    }
}
