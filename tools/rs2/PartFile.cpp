#include "tools/rs2/PartFile.hpp"

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <signal.h>
#include <stdexcept>
#include <sys/stat.h>
#include <unistd.h>

namespace {

// The path of the unfinished output, for the signal handler: an interrupted
// program removes it as a failed one does. Written only while no handler can
// read it (armed is 0).
char interruptedPath[PATH_MAX];
volatile std::sig_atomic_t armed = 0;
constexpr int kCleanedSignals[] = {SIGINT, SIGTERM, SIGHUP};
struct sigaction previousActions[std::size(kCleanedSignals)];

extern "C" void RemovePartAndDie(int signalNumber) {
    if (armed)
        ::unlink(interruptedPath);
    struct sigaction fallback {};
    fallback.sa_handler = SIG_DFL;
    ::sigaction(signalNumber, &fallback, nullptr);
    ::raise(signalNumber);
}

// Signals the user ignores (SIGHUP under nohup) stay ignored.
void ArmSignalCleanup() {
    armed = 1;
    for (size_t i = 0; i < std::size(kCleanedSignals); ++i) {
        ::sigaction(kCleanedSignals[i], nullptr, &previousActions[i]);
        if (previousActions[i].sa_handler == SIG_IGN)
            continue;
        struct sigaction action {};
        action.sa_handler = RemovePartAndDie;
        sigemptyset(&action.sa_mask);
        ::sigaction(kCleanedSignals[i], &action, nullptr);
    }
}

void DisarmSignalCleanup() {
    for (size_t i = 0; i < std::size(kCleanedSignals); ++i)
        ::sigaction(kCleanedSignals[i], &previousActions[i], nullptr);
    armed = 0;
}

} // namespace

PartFile::PartFile(const std::string &targetIn) : target(targetIn) {
    std::string pattern = target + ".part-XXXXXX";
    if (pattern.size() >= sizeof interruptedPath)
        throw std::runtime_error(target + ": the path is too long");
    const int descriptor = ::mkstemp(pattern.data());
    if (descriptor < 0)
        throw std::runtime_error("cannot write " + target + ": " +
                                 std::strerror(errno));
    path = pattern;
    // mkstemp makes the file private; the result gets the permissions of any
    // new file.
    const mode_t mask = ::umask(0);
    ::umask(mask);
    ::fchmod(descriptor, 0666 & ~mask);
    ::close(descriptor);
    std::memcpy(interruptedPath, path.c_str(), path.size() + 1);
    ArmSignalCleanup();
}

PartFile::~PartFile() {
    if (!committed) {
        ::unlink(path.c_str());
        DisarmSignalCleanup();
    }
}

void PartFile::Commit() {
    if (::rename(path.c_str(), target.c_str()) != 0)
        throw std::runtime_error("cannot write " + target + ": " +
                                 std::strerror(errno));
    committed = true;
    DisarmSignalCleanup();
}
