#include "host/ErrorReports.hpp"
#include "host/Exception.hpp"
#include "host/Raster.hpp"
#include "host/XmlUtil.hpp"
#include "model/ZirOdi2CalibImage.hpp"
#include "product/ProductReader.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/generator/ProductGenerator.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <arpa/inet.h>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <netinet/in.h>
#include <poll.h>
#include <stdexcept>
#include <string>
#include <sys/socket.h>
#include <unistd.h>
#include <vector>

namespace {

// A TCP port on the loopback interface that counts as touched when anything
// connected to it.
class LoopbackListener {
  public:
    LoopbackListener() : socketFd(socket(AF_INET, SOCK_STREAM, 0)) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t length = sizeof address;
        auto *raw = reinterpret_cast<sockaddr *>(&address);
        if (socketFd < 0 || bind(socketFd, raw, length) != 0 ||
            listen(socketFd, 4) != 0 || getsockname(socketFd, raw, &length))
            throw std::runtime_error("no loopback listener");
        port = ntohs(address.sin_port);
    }
    ~LoopbackListener() { close(socketFd); }
    LoopbackListener(const LoopbackListener &) = delete;
    LoopbackListener &operator=(const LoopbackListener &) = delete;

    std::string Url(const std::string &file) const {
        return "http://127.0.0.1:" + std::to_string(port) + "/" + file;
    }
    bool Contacted() const {
        pollfd pending{socketFd, POLLIN, 0};
        return poll(&pending, 1, 0) > 0;
    }

  private:
    int socketFd;
    int port = 0;
};

// A small generated product whose files the tests replace.
struct ProductFolder {
    ProductFolder() : product(rs2gen::GenerateProduct(dir.Path(), Options())) {}

    static rs2gen::ProductOptions Options() {
        rs2gen::ProductOptions options;
        options.width = 8;
        options.height = 6;
        options.tieGridColumns = 2;
        options.tieGridRows = 2;
        return options;
    }
    std::string Write(const std::string &name, const std::string &text) const {
        const std::string path = dir.File(name);
        std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
        return path;
    }
    std::string Read(const std::string &name) const {
        std::ifstream in(dir.File(name), std::ios::binary);
        return std::string(std::istreambuf_iterator<char>(in), {});
    }

    rs2test::TempDir dir;
    rs2gen::GeneratedProduct product;
};

// The message LoadProduct reports for the product, "" when it loads.
std::string LoadFailure(const ProductFolder &folder, const char *option) {
    ProductReader reader;
    try {
        std::unique_ptr<ZirOdi2CalibImage> model(
            LoadProduct(reader, folder.product.productXml.c_str(), option));
        return model ? "" : "no model";
    } catch (const host::ReportedError &report) {
        return report.what();
    } catch (const orv::Exception &exception) {
        return exception.what();
    }
}

bool Contains(const std::string &text, const std::string &part) {
    return text.find(part) != std::string::npos;
}

const char *const kBillionLaughs = R"(<?xml version="1.0"?>
<!DOCTYPE product [
 <!ENTITY a "aaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaa">
 <!ENTITY b "&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;">
 <!ENTITY c "&b;&b;&b;&b;&b;&b;&b;&b;&b;&b;&b;&b;&b;&b;&b;&b;">
 <!ENTITY d "&c;&c;&c;&c;&c;&c;&c;&c;&c;&c;&c;&c;&c;&c;&c;&c;">
 <!ENTITY e "&d;&d;&d;&d;&d;&d;&d;&d;&d;&d;&d;&d;&d;&d;&d;&d;">
 <!ENTITY f "&e;&e;&e;&e;&e;&e;&e;&e;&e;&e;&e;&e;&e;&e;&e;&e;">
 <!ENTITY g "&f;&f;&f;&f;&f;&f;&f;&f;&f;&f;&f;&f;&f;&f;&f;&f;">
]>
<product><productType>SGF&g;</productType></product>
)";

std::string WithEntity(const std::string &systemId) {
    return "<?xml version=\"1.0\"?>\n<!DOCTYPE product [<!ENTITY x SYSTEM \"" +
           systemId +
           "\">]>\n<product><productType>&x;</productType></product>\n";
}

std::string WithExternalDtd(const std::string &systemId) {
    return "<?xml version=\"1.0\"?>\n<!DOCTYPE product SYSTEM \"" + systemId +
           "\">\n<product><productType>SGF</productType></product>\n";
}

// Elements nested far deeper than the stack can follow.
std::string DeeplyNested() {
    std::string text = "<product><productType>SGF</productType>";
    for (int i = 0; i < 1000000; ++i)
        text += "<a>";
    return text;
}

// Many empty elements, each of which once lowered the depth the parse
// counted, and then elements nested past the limit.
std::string EmptyThenNested(const std::string &root) {
    std::string text = "<" + root + "><productType>SGF</productType>";
    for (int i = 0; i < 1000; ++i)
        text += "<e/>";
    for (int i = 0; i < 150; ++i)
        text += "<a>";
    return text;
}

TEST(HostileXml, hostile_documents_are_refused_naming_the_file) {
    LoopbackListener listener;
    const struct Case {
        const char *what;
        const char *file; // the file of the product that is replaced
        std::string text;
    } cases[] = {
        {"entity expansion", "product.xml", kBillionLaughs},
        {"local external entity", "product.xml",
         WithEntity("file:///etc/passwd")},
        {"remote external entity", "product.xml",
         WithEntity(listener.Url("entity"))},
        {"remote DTD", "product.xml", WithExternalDtd(listener.Url("dtd"))},
        {"look-up table entity", "lutSigma.xml",
         WithEntity("file:///etc/passwd")},
        {"deep nesting", "product.xml", DeeplyNested()},
        {"deep nesting after empty elements", "product.xml",
         EmptyThenNested("product")},
        {"deep nesting after empty elements in a table", "lutSigma.xml",
         EmptyThenNested("lut")},
    };
    for (const Case &c : cases) {
        ProductFolder folder;
        const std::string path = folder.Write(c.file, c.text);
        const int platform = ORV_XMLUtil::InitializeCount();
        const std::string failure = LoadFailure(folder, "sigma");
        EXPECT_TRUE(Contains(failure, "Refused " + path))
            << c.what << ": " << failure;
        EXPECT_EQ(ORV_XMLUtil::InitializeCount(), platform) << c.what;
    }
    EXPECT_FALSE(listener.Contacted());
}

TEST(HostileXml, opening_a_hostile_product_fails_with_the_reason) {
    ProductFolder folder;
    const std::string path = folder.Write("product.xml", kBillionLaughs);
    try {
        host::OpenRaster(path);
        ADD_FAILURE() << "opened";
    } catch (const host::Error &error) {
        EXPECT_TRUE(Contains(error.what(), "Refused " + path)) << error.what();
        EXPECT_TRUE(Contains(error.what(), "document type")) << error.what();
    }
}

TEST(HostileXml, references_of_ordinary_text_are_not_limited) {
    ProductFolder folder;
    // Far more predefined-entity and character references than the
    // expansion limit allows entities, in an element of its own.
    std::string references;
    for (int i = 0; i < 2000; ++i)
        references += "&amp;&lt;&#233;";
    std::string text = folder.Read("product.xml");
    const std::size_t root = text.find('>', text.find("<product"));
    ASSERT_NE(root, std::string::npos);
    text.insert(root + 1, "<note>" + references + "</note>");
    folder.Write("product.xml", text);
    EXPECT_EQ(LoadFailure(folder, "sigma"), "");
}

// Files far larger than any real one are refused without being read, so a
// sparse file of a few GiB costs neither the memory nor the time of its
// size.
TEST(HostileXml, files_past_their_size_limit_are_refused_unread) {
    constexpr std::uintmax_t kSparseSize = 3ull << 30;
    const struct Case {
        const char *file;
        const char *failure; // of the load; "" when it loads
        const char *warning; // a warning the load gives; "" for none
        const char *calibration;
    } cases[] = {
        {"product.xml", ": it holds more than 48 MiB", "", ""},
        {"lutSigma.xml", "", " holds more than 64 MiB", "None"},
        {"ProductDescription.self", "", " holds more than 16 MiB",
         "Sigma Nought"},
    };
    for (const Case &c : cases) {
        ProductFolder folder;
        const std::string path = folder.Write(c.file, "<lut/>");
        std::filesystem::resize_file(path, kSparseSize);
        host::ClearWarnings();
        ProductReader reader;
        try {
            std::unique_ptr<ZirOdi2CalibImage> model(LoadProduct(
                reader, folder.product.productXml.c_str(), "sigma"));
            ASSERT_NE(model, nullptr) << c.file;
            EXPECT_STREQ(c.failure, "") << c.file;
            EXPECT_STREQ(model->GetCalibrationType(), c.calibration);
        } catch (const host::ReportedError &report) {
            EXPECT_TRUE(Contains(report.what(), "Refused " + path + c.failure))
                << report.what();
        }
        const std::vector<std::string> warnings = host::Warnings();
        const bool warned =
            std::any_of(warnings.begin(), warnings.end(), [&](const auto &w) {
                return Contains(w, path + c.warning);
            });
        EXPECT_EQ(warned, *c.warning != '\0') << c.file;
    }
}

} // namespace
