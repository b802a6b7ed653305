// Only regular files are read: a pipe named like a product file would block
// the open until some writer came, and a folder holds nothing to read.

#include "tests/broken/BrokenProduct.hpp"

#include "host/ErrorReports.hpp"
#include "host/GeoTiffImage.hpp"
#include "tests/support/TempDir.hpp"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

namespace {

namespace fs = std::filesystem;

using rs2test::Outcome;
using rs2test::Quoted;

enum class Stand { Pipe, Folder };

// Puts a pipe or a folder where path was.
void Replace(const std::string &path, Stand stand) {
    fs::remove(path);
    if (stand == Stand::Pipe)
        ASSERT_EQ(mkfifo(path.c_str(), 0600), 0) << path;
    else
        fs::create_directory(path);
}

TEST(RegularFiles, a_pipe_or_folder_in_place_of_a_product_file_is_refused) {
    const char *const plain = "product.xml";
    const char *const sigma = "product.xml?c=sigma";
    const struct {
        const char *file;
        Stand stand;
        const char *dataset;
        Outcome info;
    } cases[] = {
        {"imagery_HH.tif", Stand::Pipe, plain, {0, "not a regular file"}},
        {"imagery_HH.tif", Stand::Folder, plain, {0, "not a regular file"}},
        {"lutSigma.xml", Stand::Pipe, sigma, {0, "can not be found"}},
        {"ProductDescription.self", Stand::Pipe, plain, {0, "16 x 12"}},
        {"product.xml", Stand::Pipe, plain, {1, "not a regular file"}},
        {"product.xml", Stand::Folder, plain, {1, "no product.xml in"}},
        // The calibrated name is no file name: the host offers it to the
        // driver, which reads no product description from a pipe.
        {"product.xml", Stand::Pipe, sigma, {1, "not a dataset the driver"}},
    };
    for (const auto &c : cases) {
        SCOPED_TRACE(
            std::string(c.file) +
            (c.stand == Stand::Pipe ? " as a pipe, " : " as a folder, ") +
            c.dataset);
        rs2test::TempDir folder;
        rs2gen::GenerateProduct(folder.Path(), rs2test::CaseOptions());
        Replace(folder.File(c.file), c.stand);
        rs2test::ExpectOutcome(
            rs2test::RunRs2("info " + Quoted(folder.File(c.dataset))), c.info);
    }
}

TEST(RegularFiles, the_image_reader_refuses_a_pipe_and_a_folder_at_once) {
    rs2test::TempDir folder;
    const std::string pipe = folder.File("pipe.tif");
    ASSERT_EQ(mkfifo(pipe.c_str(), 0600), 0);
    // A reader that waited on the pipe would wait for ever: the alarm ends
    // the program instead.
    alarm(30);
    for (const std::string &path : {pipe, folder.Path()}) {
        EXPECT_FALSE(host::HasTiffSignature(path)) << path;
        try {
            host::GeoTiffImage::Open(path);
            ADD_FAILURE() << path << " was opened";
        } catch (const host::ReportedError &error) {
            EXPECT_NE(std::string(error.what()).find("not a regular file"),
                      std::string::npos)
                << error.what();
        }
    }
    alarm(0);
}

} // namespace
