// The CSV form of a file with every kind of element, quoting and layout.
#include "ops/CsvFormat.h"

#include <gtest/gtest.h>

#include "ops/OpsTestUtil.h"

using namespace kest;

TEST(CsvFormat, EdgeFileGivesItsRows) {
    test::ScratchDir dir;
    const std::string csv =
        ops::ExportCsv(ops::FromCalData(test::ReadSourceFile("tests/data/ops/edge.cdf", dir)));
    EXPECT_EQ(csv, test::ReadWholeFile(std::string(KEST_TEST_DATA_DIR) + "/ops/edge.csv"));
}
