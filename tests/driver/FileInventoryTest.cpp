#include "driver/FileInventory.hpp"
#include "host/HostMemory.hpp"
#include "host/RasterServices.hpp"
#include "tests/support/HostLists.hpp"
#include "tests/support/TempDir.hpp"
#include "tests/support/TestFiles.hpp"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

std::vector<std::string> Texts(char **list) {
    return rs2test::ListTexts(host::HostList(list).get());
}

void Touch(const std::string &path, const std::string &text = "x") {
    rs2test::WriteFile(path, text);
}

// A host handle named like an open dataset; the file lists need only its name.
struct NamedHandle {
    explicit NamedHandle(const std::string &name)
        : handle(fpAlloc(name.c_str(), 192, nullptr)) {}
    ~NamedHandle() { fpDealloc(handle); }
    FILE *handle;
};

} // namespace

TEST(FileInventory, auxiliary_files_are_the_ones_that_exist_in_order) {
    rs2test::TempDir folder;
    Touch(folder.File("lutSigma.xml"));
    Touch(folder.File("readme.txt"));
    NamedHandle plain(folder.File("product.xml"));
    EXPECT_EQ(Texts(ListAuxiliaryFiles(plain.handle)),
              (std::vector<std::string>{folder.File("lutSigma.xml"),
                                        folder.File("readme.txt")}));

    Touch(folder.File("lutBeta.xml"));
    Touch(folder.File("product.xml_c_Sigma.pox"));
    Touch(folder.File("product.xml_c_.pox"));
    NamedHandle sigma(folder.File("product.xml") + "?c=Sigma");
    EXPECT_EQ(Texts(ListAuxiliaryFiles(sigma.handle)),
              (std::vector<std::string>{folder.File("lutBeta.xml"),
                                        folder.File("lutSigma.xml"),
                                        folder.File("product.xml_c_Sigma.pox"),
                                        folder.File("readme.txt")}));
    EXPECT_EQ(Texts(ListAuxiliaryFiles(plain.handle))[2],
              folder.File("product.xml_c_.pox"));

    rs2test::TempDir empty;
    NamedHandle nothing(empty.File("product.xml"));
    EXPECT_EQ(ListAuxiliaryFiles(nothing.handle), nullptr);
}

TEST(FileInventory, image_files_give_one_entry_per_attribute) {
    rs2test::TempDir folder;
    Touch(folder.File("product.xml"),
          "<product><a>"
          "<fullResolutionImageData pole=\"HH\">imagery_HH.tif"
          "</fullResolutionImageData>"
          "<fullResolutionImageData pole=\"HV\">imagery_HV.tif"
          "</fullResolutionImageData></a>"
          "<fullResolutionImageData pole=\"VH\">imagery_VH.tif"
          "</fullResolutionImageData>"
          // two attributes: two entries
          "<fullResolutionImageData pole=\"VV\" x=\"1\">imagery_VV.tif"
          "</fullResolutionImageData>"
          // no attribute: no entry
          "<fullResolutionImageData>none.tif</fullResolutionImageData>"
          "</product>");
    NamedHandle handle(folder.File("product.xml") + "?c=beta");
    std::string dir = folder.Path() + "/";
    EXPECT_EQ(Texts(ListImageFiles(handle.handle)),
              (std::vector<std::string>{
                  dir + "//imagery_HH.tif", dir + "//imagery_HV.tif",
                  dir + "//imagery_VH.tif", dir + "//imagery_VV.tif",
                  dir + "//imagery_VV.tif"}));
    EXPECT_EQ(BrowseImageFile(handle.handle), dir + "BrowseImage.tif");

    NamedHandle missing(folder.File("absent.xml"));
    EXPECT_EQ(ListImageFiles(missing.handle), nullptr);
}
