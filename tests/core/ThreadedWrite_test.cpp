// Copies of one tree share their arrays; hosts hand copies to threads. Writing copies from
// several threads at once must neither race (run under the tsan preset) nor change a byte.
#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

#include "core/KestCalmorph.h"
#include "support/TestFiles.h"

namespace kest {
namespace {

TEST(ThreadedWrite, CopiesOfOneTreeWriteTheSameFileFromEightThreads) {
    test::ScratchDir dir;
    dir.Write("cdf.xsd", test::ReadWholeFile(KEST_SOURCE_DIR "/schema/cdf.xsd"));
    const std::string input =
        dir.Write("in.cdf", test::ReadWholeFile(KEST_SOURCE_DIR "/fuzz/corpus/roundtrip/full.cdf"));
    KestCalmorph reader;
    CComBSTR message;
    const KestCdfCalData tree = reader.ConvertXMLtoCPP(CComBSTR(input.c_str()), true, message);
    ASSERT_EQ(0u, message.Length()) << message.ToString();

    constexpr int kThreads = 8;
    std::vector<std::thread> threads;
    std::vector<int> written(kThreads, 0);
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([&, t] {
            KestCalmorph writer;
            const KestCdfCalData copy = tree;
            for (int round = 0; round < 20; ++round) {
                const std::string path = dir / ("out" + std::to_string(t) + ".cdf");
                written[t] += writer.ConvertCPPToXML(copy, CComBSTR(path.c_str()), CComBSTR());
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    const std::string first = test::ReadWholeFile(dir / "out0.cdf");
    EXPECT_NE(std::string::npos, first.find("3000000000.0 inf -0.0 nan"));
    for (int t = 0; t < kThreads; ++t) {
        SCOPED_TRACE(t);
        EXPECT_EQ(20, written[t]);
        EXPECT_EQ(first, test::ReadWholeFile(dir / ("out" + std::to_string(t) + ".cdf")));
    }
}

}  // namespace
}  // namespace kest
