#include "tools/rs2/PartFile.hpp"

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <signal.h>
#include <stdexcept>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace {

// The path of the unfinished output, for the signal handler: an interrupted
// program removes it as a failed one does. Written only while no handler can
// read it (armed is 0).
char interruptedPath[PATH_MAX];
volatile std::sig_atomic_t armed = 0;

// Every signal whose default action ends the process and that a handler can
// catch. The faults are among them: the handler only unlinks, which is safe
// whatever state the program was in, and the fault then takes its course.
constexpr int kFixedSignals[] = {
    SIGHUP,    SIGINT,  SIGQUIT,   SIGILL,  SIGTRAP, SIGABRT, SIGBUS,
    SIGFPE,    SIGUSR1, SIGSEGV,   SIGUSR2, SIGPIPE, SIGALRM, SIGTERM,
    SIGXCPU,   SIGXFSZ, SIGVTALRM, SIGPROF, SIGIO,   SIGSYS,
#ifdef SIGSTKFLT
    SIGSTKFLT,
#endif
#ifdef SIGPWR
    SIGPWR,
#endif
};
struct sigaction previousActions[NSIG];

template <typename Visit> void ForEachCleanedSignal(Visit visit) {
    for (int signalNumber : kFixedSignals)
        visit(signalNumber);
    // Real-time signals end the process too when nobody handles them.
    for (int signalNumber = SIGRTMIN; signalNumber <= SIGRTMAX; ++signalNumber)
        visit(signalNumber);
}

// Faults the processor raises recur when their handler returns.
bool IsFault(int signalNumber) {
    return signalNumber == SIGSEGV || signalNumber == SIGBUS ||
           signalNumber == SIGFPE || signalNumber == SIGILL;
}

// Removes the part, then lets the signal take the course it would have
// taken without us: the previous action is restored and meets the signal
// again, as the recurring fault or raised anew (SA_NODEFER lets it through
// at once). A fault sent by kill() does not recur, so it is raised too.
extern "C" void RemovePartAndDie(int signalNumber, siginfo_t *info, void *) {
    if (armed)
        ::unlink(interruptedPath);
    ::sigaction(signalNumber, &previousActions[signalNumber], nullptr);
    if (IsFault(signalNumber) && info != nullptr && info->si_code > 0)
        return;
    ::raise(signalNumber);
}

// Signals the user ignores (SIGHUP under nohup, SIGPIPE under some shells)
// stay ignored.
void ArmSignalCleanup() {
    armed = 1;
    ForEachCleanedSignal([](int signalNumber) {
        struct sigaction &previous = previousActions[signalNumber];
        ::sigaction(signalNumber, nullptr, &previous);
        if (previous.sa_handler == SIG_IGN)
            return;
        struct sigaction action {};
        action.sa_sigaction = RemovePartAndDie;
        action.sa_flags = SA_SIGINFO | SA_NODEFER;
        sigemptyset(&action.sa_mask);
        ::sigaction(signalNumber, &action, nullptr);
    });
}

void DisarmSignalCleanup() {
    ForEachCleanedSignal([](int signalNumber) {
        ::sigaction(signalNumber, &previousActions[signalNumber], nullptr);
    });
    armed = 0;
}

} // namespace

PartFile::PartFile(const std::string &targetIn,
                   std::vector<DatasetFile> datasetFilesIn)
    : target(targetIn), datasetFiles(std::move(datasetFilesIn)) {
    RequireReplaceableTarget(target, datasetFiles);
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
    // The target may have changed while the output was written.
    RequireReplaceableTarget(target, datasetFiles);
    if (::rename(path.c_str(), target.c_str()) != 0)
        throw std::runtime_error("cannot write " + target + ": " +
                                 std::strerror(errno));
    committed = true;
    DisarmSignalCleanup();
}
