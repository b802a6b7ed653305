#pragma once

#include "host/Visibility.hpp"

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

// Error reports of the host. A report of class 0 (error) or 1 (severe) ends
// the request: it is thrown as host::ReportedError, which the host API turns
// into a host::Error for its caller. Class 2 is a warning: it is written to
// the process's warning log and the call returns.

namespace host {

enum ReportClass : int32_t { kError = 0, kSevere = 1, kWarning = 2 };

/// An error report travelling from the point of report back to the host API.
class VXB_API ReportedError : public std::runtime_error {
  public:
    ReportedError(int32_t codeIn, int32_t reportClassIn,
                  const std::string &message);
    ~ReportedError() override;
    int32_t code;
    int32_t reportClass;
};

/// The warnings reported since the last ClearWarnings, oldest first.
std::vector<std::string> Warnings();
void ClearWarnings();

} // namespace host

/// Reports a printf-formatted message (see the classes above). Any class
/// other than kWarning is thrown like an error.
void IMPError(int32_t code, int32_t reportClass, const char *format, ...)
    __attribute__((format(printf, 3, 4)));
/// Reports text with one text argument: the message is "text: argument";
/// a null argument reads "(null)" and a null text "".
void IMPErrChar(int32_t code, int32_t reportClass, const char *text,
                const char *argument);
