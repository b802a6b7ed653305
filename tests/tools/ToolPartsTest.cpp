#include "tests/support/CommandRun.hpp"
#include "tests/support/TempDir.hpp"
#include "tools/rs2/DatasetPaths.hpp"
#include "tools/rs2/JsonText.hpp"
#include "tools/rs2/PartFile.hpp"

#include <gtest/gtest.h>

#include <csignal>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

namespace {

// How a child that made a part file of OUT in folder and then met signal
// ended, and whether it left the part behind. ignored: the child ignores
// the signal before it makes the part.
struct ChildEnd {
    int status = 0;
    bool partLeft = false;
};

ChildEnd RunChildMeeting(int signalNumber, bool ignored) {
    rs2test::TempDir folder;
    const pid_t child = ::fork();
    if (child == 0) {
        if (ignored)
            ::signal(signalNumber, SIG_IGN);
        PartFile part(folder.File("out.tif"), {});
        ::raise(signalNumber);
        ::_exit(0);
    }
    ChildEnd end;
    ::waitpid(child, &end.status, 0);
    end.partLeft = !rs2test::FolderEntries(folder.Path()).empty();
    return end;
}

} // namespace

TEST(PartFile, every_terminating_signal_removes_the_part_and_still_ends) {
    for (int signalNumber :
         {SIGHUP, SIGINT, SIGQUIT, SIGTERM, SIGUSR1, SIGUSR2, SIGALRM, SIGPIPE,
          SIGXFSZ, SIGXCPU, SIGVTALRM, SIGPROF, SIGABRT, SIGRTMIN}) {
        const ChildEnd end = RunChildMeeting(signalNumber, false);
        EXPECT_FALSE(end.partLeft) << strsignal(signalNumber);
        EXPECT_TRUE(WIFSIGNALED(end.status) &&
                    WTERMSIG(end.status) == signalNumber)
            << strsignal(signalNumber);
    }
    // Faults end the process too, by the signal or, under a sanitizer that
    // handles them, by its report.
    for (int signalNumber : {SIGSEGV, SIGBUS, SIGFPE}) {
        const ChildEnd end = RunChildMeeting(signalNumber, false);
        EXPECT_FALSE(end.partLeft) << strsignal(signalNumber);
        EXPECT_FALSE(WIFEXITED(end.status) && WEXITSTATUS(end.status) == 0)
            << strsignal(signalNumber);
    }
}

TEST(PartFile, an_ignored_signal_stays_ignored) {
    for (int signalNumber : {SIGHUP, SIGPIPE, SIGUSR1}) {
        const ChildEnd end = RunChildMeeting(signalNumber, true);
        EXPECT_TRUE(WIFEXITED(end.status) && WEXITSTATUS(end.status) == 0)
            << strsignal(signalNumber);
    }
}

TEST(JsonText, bytes_outside_utf8_become_their_latin1_characters) {
    const struct {
        std::string text, expected;
    } cases[] = {
        {"Montr\xE9"
         "al",
         "Montr\xC3\xA9"
         "al"},
        {"caf\xC3\xA9 \xE2\x82\xAC \xF0\x9F\x93\xA1", // valid: unchanged
         "caf\xC3\xA9 \xE2\x82\xAC \xF0\x9F\x93\xA1"},
        {"\xC0\xAF", "\xC3\x80\xC2\xAF"},             // overlong '/'
        {"\xED\xA0\x80", "\xC3\xAD\xC2\xA0\xC2\x80"}, // surrogate
        {"\xE2\x82", "\xC3\xA2\xC2\x82"},             // cut short
        {"\xFF", "\xC3\xBF"},
    };
    for (const auto &c : cases) {
        EXPECT_EQ(ValidUtf8(c.text), c.expected) << c.text;
        EXPECT_EQ(JsonText(nlohmann::json{{"v", {c.text}}}),
                  "{\"v\":[\"" + c.expected + "\"]}");
    }
}

TEST(DatasetPaths, the_file_part_of_a_name_leaves_out_the_choice) {
    const std::pair<std::string, std::string> cases[] = {
        {"dir/product.xml", "dir/product.xml"},
        {"dir/product.xml?c=sigma", "dir/product.xml"},
        {"dir/product.xml:Calibration Type:Sigma Nought", "dir/product.xml"},
        {"d:x/product.xml:calibration type:None", "d:x/product.xml"},
        {"dir/a:b.xml", "dir/a:b.xml"},
        {"file:///abs/my%20dir/product.xml?c=beta", "/abs/my dir/product.xml"},
        {"file://localhost/abs/product.xml", "/abs/product.xml"},
        {"http://host/product.xml", ""},
    };
    for (const auto &[name, path] : cases)
        EXPECT_EQ(FilePartOf(name), path) << name;
    EXPECT_EQ(TidyPath("dir///./imagery.tif"), "dir/imagery.tif");
    EXPECT_EQ(TidyPath("./a/../b"), "./a/../b");
}
