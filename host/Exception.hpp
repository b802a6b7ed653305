#pragma once

#include "host/Visibility.hpp"

#include <exception>
#include <string>

namespace orv {

/// The exception of the host framework that drivers throw to reach the host
/// user. The message is what what() returns.
class VXB_API Exception : public std::exception {
  public:
    Exception(const std::string &messageIn, const std::string &detailIn,
              const std::string &contextIn, int numberIn);
    ~Exception() override;
    const char *what() const noexcept override;
    const std::string &Message() const { return message; }
    int Number() const { return number; }

  private:
    std::string message;
    std::string detail;
    std::string context;
    int number;
};

/// Raised when data handed to a host service is missing or malformed.
class VXB_API DataException : public Exception {
  public:
    using Exception::Exception;
    ~DataException() override;
};

} // namespace orv
