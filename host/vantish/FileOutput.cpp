#include "host/vantish/FileOutput.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <stdexcept>
#include <string>

namespace vantish {

void writeWhole(const std::filesystem::path& path, std::string_view content)
{
    namespace fs = std::filesystem;
    const fs::path folder = path.has_parent_path() ? path.parent_path() : fs::path(".");
    const fs::path temporary = folder / ("." + path.filename().string() + ".tmp-" + std::to_string(getpid()));
    auto fail = [&](int error) {
        ::unlink(temporary.c_str());
        throw std::runtime_error(path.string() + ": cannot write (" + std::strerror(error) + ")");
    };
    const int fd = ::open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    if (fd < 0)
        throw std::runtime_error(path.string() + ": cannot write (" + std::strerror(errno) + ")");
    for (size_t done = 0; done < content.size();) {
        const ssize_t n = ::write(fd, content.data() + done, content.size() - done);
        if (n < 0 && errno == EINTR)
            continue;
        if (n <= 0) {
            const int error = n < 0 ? errno : EIO;
            ::close(fd);
            fail(error);
        }
        done += size_t(n);
    }
    if (::close(fd) != 0)
        fail(errno);
    if (::rename(temporary.c_str(), path.c_str()) != 0)
        fail(errno);
}

} // namespace vantish
