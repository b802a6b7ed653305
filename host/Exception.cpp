#include "host/Exception.hpp"

namespace orv {

Exception::Exception(const std::string &messageIn, const std::string &detailIn,
                     const std::string &contextIn, int numberIn)
    : message(messageIn), detail(detailIn), context(contextIn),
      number(numberIn) {}

// The destructors are the key functions of both classes: defining them here
// puts their type information in the host library, so that the driver module
// and the programs catch the same types.
Exception::~Exception() = default;

const char *Exception::what() const noexcept { return message.c_str(); }

DataException::~DataException() = default;

} // namespace orv
