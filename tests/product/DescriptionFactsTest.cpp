#include "product/DescriptionFacts.hpp"
#include "driver/FileInventory.hpp"
#include "host/RasterServices.hpp"
#include "host/StringLists.hpp"
#include "product/CalibrationTables.hpp"
#include "tests/support/TempDir.hpp"

#include <gtest/gtest.h>

#include <fstream>
#include <memory>
#include <string>
#include <vector>

namespace {

struct ListDeleter {
    void operator()(char **list) const { DestroyStringList(list); }
};

std::vector<std::string> Texts(char **list) {
    std::unique_ptr<char *, ListDeleter> keeper(list);
    std::vector<std::string> texts;
    for (char **entry = list; entry && *entry; ++entry)
        texts.emplace_back(*entry);
    return texts;
}

std::string Description(const std::vector<std::string> &images,
                        const std::vector<std::string> &tables) {
    std::string xml = "<product>";
    for (const std::string &image : images)
        xml += "<fullResolutionImageData pole='HH'>" + image +
               "</fullResolutionImageData>";
    for (const std::string &table : tables)
        xml += "<lookupTable incidenceAngleCorrection='" + table +
               "'>lut.xml</lookupTable>";
    return xml + "</product>";
}

} // namespace

// The lists of an open product come from the facts kept when it was
// parsed, but only while product.xml is the file that was parsed.
TEST(DescriptionFacts, serve_the_lists_until_the_description_changes) {
    rs2test::TempDir folder;
    const std::string path = folder.File("product.xml");
    std::ofstream(path) << Description({"a.tif"}, {"Beta Nought"});
    // Kept facts that differ from the file show which source answered.
    RememberDescriptionFacts(path.c_str(), {{"kept.tif"}, {"Kept", "None"}});
    FILE *handle = fpAlloc(path.c_str(), 192, nullptr);
    EXPECT_EQ(Texts(ListImageFiles(handle)),
              std::vector<std::string>{folder.Path() + "///kept.tif"});
    EXPECT_EQ(Texts(ListCalibrationTypes(path.c_str())),
              (std::vector<std::string>{":Calibration Type:Kept",
                                        ":Calibration Type:None"}));

    std::ofstream(path) << Description({"b.tif", "c.tif"},
                                       {"Gamma", "Sigma Nought"});
    EXPECT_EQ(Texts(ListImageFiles(handle)),
              (std::vector<std::string>{folder.Path() + "///b.tif",
                                        folder.Path() + "///c.tif"}));
    EXPECT_EQ(Texts(ListCalibrationTypes(path.c_str())),
              (std::vector<std::string>{":Calibration Type:Sigma Nought",
                                        ":Calibration Type:Gamma",
                                        ":Calibration Type:None"}));
    fpDealloc(handle);
}
