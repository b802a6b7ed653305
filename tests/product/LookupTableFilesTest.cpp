#include "product/CalibrationTables.hpp"

#include "model/LookupTable.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

// How the gains of a table file are read, token by token, is checked in
// CalibrationTablesTest and FloatTextTest; that calibration and incidence
// angles of one load share a table file, in IncidenceArrayTest.

namespace {

using rs2test::WriteFile;

std::string TableFile(const std::string &gains) {
    return "<lut><offset>0.5</offset><gains>" + gains + "</gains></lut>\n";
}

std::vector<float> Values(const LookupTable &table) {
    std::vector<float> values;
    for (std::size_t i = 0; i < table.Size(); ++i)
        values.push_back(table.Get(i));
    return values;
}

TEST(LookupTableFiles, a_file_is_parsed_once_per_load) {
    rs2test::TempDir dir;
    const std::string path =
        WriteFile(dir.File("lutSigma.xml"), TableFile("1 2 3"));
    LookupTableFiles files;
    const LookupTable *first = files.Read(path.c_str());
    ASSERT_NE(first, nullptr);
    // A second request is served from the first reading, even after the file
    // changed.
    WriteFile(path, TableFile("4 5"));
    EXPECT_EQ(files.Read(path.c_str()), first);
    EXPECT_EQ(Values(*first), (std::vector<float>{1, 2, 3}));
    // Another set of files reads the file anew.
    LookupTableFiles later;
    const LookupTable *again = later.Read(path.c_str());
    ASSERT_NE(again, nullptr);
    EXPECT_EQ(Values(*again), (std::vector<float>{4, 5}));
}

TEST(LookupTableFiles, a_file_without_a_table_gives_none_each_time) {
    rs2test::TempDir dir;
    LookupTableFiles files;
    EXPECT_EQ(files.Read(nullptr), nullptr);
    const std::string absent = dir.File("absent.xml");
    EXPECT_EQ(files.Read(absent.c_str()), nullptr);
    EXPECT_EQ(files.Read(absent.c_str()), nullptr);
    // Cut short before the gains.
    const std::string broken =
        WriteFile(dir.File("broken.xml"), "<lut><offset>1</offset><ga");
    EXPECT_EQ(files.Read(broken.c_str()), nullptr);
}

} // namespace
