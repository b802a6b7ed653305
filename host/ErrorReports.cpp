#include "host/ErrorReports.hpp"

#include "host/TextServices.hpp"

#include <cstdarg>
#include <mutex>

namespace host {

ReportedError::ReportedError(int32_t codeIn, int32_t reportClassIn,
                             const std::string &message)
    : std::runtime_error(message), code(codeIn), reportClass(reportClassIn) {}

// Defined here so that the type information of the class lives in the host
// library and an exception thrown there is caught by type in any module.
ReportedError::~ReportedError() = default;

namespace {

// Warnings may be reported from any thread the host user drives.
struct WarningLog {
    std::mutex mutex;
    std::vector<std::string> texts;
};

WarningLog &TheWarningLog() {
    static WarningLog log;
    return log;
}

void AppendWarning(const std::string &message) {
    WarningLog &log = TheWarningLog();
    std::lock_guard<std::mutex> lock(log.mutex);
    log.texts.push_back(message);
}

// Every class other than a warning ends the request, so that a report with
// an unexpected class never lets the reporting code carry on.
void Report(int32_t code, int32_t reportClass, const std::string &message) {
    if (reportClass == kWarning) {
        AppendWarning(message);
        return;
    }
    throw ReportedError(code, reportClass, message);
}

} // namespace

std::vector<std::string> Warnings() {
    WarningLog &log = TheWarningLog();
    std::lock_guard<std::mutex> lock(log.mutex);
    return log.texts;
}

void ClearWarnings() {
    WarningLog &log = TheWarningLog();
    std::lock_guard<std::mutex> lock(log.mutex);
    log.texts.clear();
}

} // namespace host

void IMPError(int32_t code, int32_t reportClass, const char *format, ...) {
    std::va_list args;
    va_start(args, format);
    std::string message = FormatTextV(format, args);
    va_end(args);
    host::Report(code, reportClass, message);
}

void IMPErrChar(int32_t code, int32_t reportClass, const char *text,
                const char *argument) {
    std::string message = text != nullptr ? text : "";
    message += ": ";
    message += argument != nullptr ? argument : "(null)";
    host::Report(code, reportClass, message);
}
