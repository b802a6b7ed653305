#include "tools/generator/TextFile.hpp"

#include <cerrno>
#include <cstring>
#include <fstream>
#include <stdexcept>

namespace rs2gen {

void WriteTextFile(const std::string &path,
                   const std::function<void(std::ostream &)> &write) {
    errno = 0;
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    if (out)
        write(out);
    out.close();
    if (!out) {
        // The streams leave errno set by the system call that failed, if any.
        const int cause = errno;
        throw std::runtime_error("cannot write " + path +
                                 (cause != 0
                                      ? std::string(": ") + std::strerror(cause)
                                      : std::string()));
    }
}

} // namespace rs2gen
